/* A host written in C: what the public header promises it must compile, without a warning. */
#include "orvenix/configlet.h"

static int Receive(uintptr_t context, const char* text, int32_t length,
                   const IcfgCallbacks* table) {
  return context != 0 && text != 0 && length > 0 && table != 0;
}

static const IcfgCallbacks callbacks = {{0, 0, 0, 0}, Receive};

uint32_t Walk(void) {
  char text[8];
  uint32_t length = 0;
  uint32_t major = 0;
  uint32_t minor = 0;
  uint32_t result = IcfgInitialize() | IcfgSetCallbacks(1, &callbacks);
  result |= IcfgGetSchemaVersion(0, &major, &minor);
  result |= IcfgBeginGroup("Orvenix", 0, 0);
  result |= IcfgSetField("Address", 0, "127.0.0.2");
  result |= IcfgGetField("Protocol Version", 0, 0, text, &length);
  result |= IcfgEndGroup("Orvenix", 0, 0);
  result |= IcfgGetFirstInstance(0, text);
  result |= IcfgUninitialize();
  if (result == ICFG_UPGRADE_RUNNING || IcfgGetNextInstance() != 1) return ICFG_UNKNOWN_NAME;
  return result | (IcfgGetInterfaceVersion() - 2);
}
