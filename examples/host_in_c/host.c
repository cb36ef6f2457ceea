/* Plain C of 1990, so that any device's compiler takes it. */
#include "host.h"

#include <stdio.h>
#include <string.h>

#include "orvenix/configlet.h"

/* Written by the upgrade's threads inside the callback, while the host waits. */
typedef struct Watch {
  volatile int over;
  volatile int good;
} Watch;

/* A status's state is 4 when the upgrade begins and 1 when it is over. */
static int Receive(uintptr_t context, const char* text, int32_t length,
                   const IcfgCallbacks* table) {
  Watch* watch = (Watch*)context;
  (void)length;
  (void)table;
  printf("%s\n", text);
  if (strstr(text, "<Field Name=\"State\">1</Field>") != NULL) {
    watch->good = strstr(text, "Upgrade Failed") == NULL;
    watch->over = 1;
  }
  return 0;
}

/* The first result that is not ICFG_OK ends the walk: the steps behind it are not taken. */
static void Begin(uint32_t* result, const char* group) {
  if (*result == ICFG_OK) *result = IcfgBeginGroup(group, 0, 0);
}

static void Set(uint32_t* result, const char* field, const char* value) {
  if (*result == ICFG_OK) *result = IcfgSetField(field, 0, value);
}

static void End(uint32_t* result, const char* group) {
  if (*result == ICFG_OK) *result = IcfgEndGroup(group, 0, 0);
}

/* The upgrade starts at the end of "Upgrade", so that comes last. */
static uint32_t Walk(const Order* order) {
  uint32_t result = ICFG_OK;
  char url[64];
  sprintf(url, "http://%.40s", order->server);
  Begin(&result, "Orvenix");
  Begin(&result, "Upgrade");
  Begin(&result, "HTTPServer");
  Set(&result, "IPAddress", order->server);
  Set(&result, "HTTPPort", order->port);
  Set(&result, "BaseURL", url);
  End(&result, "HTTPServer");
  Begin(&result, "StorageRequirements");
  Begin(&result, "Store");
  Set(&result, "Name", "\\");
  Set(&result, "RequiredSpace", "1");
  End(&result, "Store");
  End(&result, "StorageRequirements");
  Begin(&result, "FileList");
  Set(&result, "Source", order->list);
  Set(&result, "Dest", "\\Orvenix\\files.lst");
  Set(&result, "CRC", order->crc);
  Set(&result, "MCTMask", "*");
  End(&result, "FileList");
  End(&result, "Upgrade");
  End(&result, "Orvenix");
  return result;
}

int CarryOut(const Order* order) {
  static const IcfgCallbacks callbacks = {{NULL, NULL, NULL, NULL}, Receive};
  static Watch watch; /* the upgrade may outlive this call */
  uint32_t result;
  watch.over = 0;
  watch.good = 0;
  IcfgInitialize();
  IcfgSetCallbacks((uintptr_t)&watch, &callbacks);
  result = Walk(order);
  if (result != ICFG_OK) {
    printf("refused: 0x%08x\n", (unsigned)result);
  } else {
    while (!watch.over) Pause();
  }
  IcfgUninitialize();
  return watch.good;
}
