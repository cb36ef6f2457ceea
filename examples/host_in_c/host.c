#include "host.h"

#include <stdatomic.h>
#include <stdio.h>
#include <string.h>

#include "orvenix/configlet.h"

/* The callback is called by the upgrade's threads while this one waits. */
typedef struct Watch {
  atomic_int over;
  atomic_int good;
} Watch;

/* A status's state is 4 when the upgrade begins and 1 when it is over. */
static int Receive(uintptr_t context, const char* text, int32_t length,
                   const IcfgCallbacks* table) {
  Watch* watch = (Watch*)context;
  (void)table;
  printf("%.*s\n", (int)(length - 1), text);
  if (strstr(text, "<Field Name=\"State\">1</Field>") != NULL) {
    atomic_store(&watch->good, strstr(text, "Upgrade Failed") == NULL);
    atomic_store(&watch->over, 1);
  }
  return 0;
}

typedef struct Field {
  const char* name;
  const char* value;
} Field;

/* A group of fields without inner groups. */
static uint32_t SetGroup(const char* group, const Field* fields) {
  uint32_t result = IcfgBeginGroup(group, 0, 0);
  for (; result == ICFG_OK && fields->name != NULL; ++fields) {
    result = IcfgSetField(fields->name, 0, fields->value);
  }
  return result == ICFG_OK ? IcfgEndGroup(group, 0, 0) : result;
}

/* The upgrade starts at the end of "Upgrade", so that comes last. */
static uint32_t Walk(const Order* order) {
  char url[64];
  snprintf(url, sizeof url, "http://%s", order->server);
  const Field server[] = {
      {"IPAddress", order->server}, {"HTTPPort", order->port}, {"BaseURL", url}, {NULL, NULL}};
  const Field store[] = {{"Name", "\\"}, {"RequiredSpace", "1"}, {NULL, NULL}};
  const Field list[] = {{"Source", order->list},
                        {"Dest", "\\Orvenix\\files.lst"},
                        {"CRC", order->crc},
                        {"MCTMask", "*"},
                        {NULL, NULL}};
  uint32_t result = IcfgBeginGroup("Orvenix", 0, 0);
  if (result == ICFG_OK) result = IcfgBeginGroup("Upgrade", 0, 0);
  if (result == ICFG_OK) result = SetGroup("HTTPServer", server);
  if (result == ICFG_OK) result = IcfgBeginGroup("StorageRequirements", 0, 0);
  if (result == ICFG_OK) result = SetGroup("Store", store);
  if (result == ICFG_OK) result = IcfgEndGroup("StorageRequirements", 0, 0);
  if (result == ICFG_OK) result = SetGroup("FileList", list);
  if (result == ICFG_OK) result = IcfgEndGroup("Upgrade", 0, 0);
  if (result == ICFG_OK) result = IcfgEndGroup("Orvenix", 0, 0);
  return result;
}

int CarryOut(const Order* order) {
  static const IcfgCallbacks callbacks = {{NULL, NULL, NULL, NULL}, Receive};
  Watch watch;
  atomic_init(&watch.over, 0);
  atomic_init(&watch.good, 0);
  IcfgInitialize();
  IcfgSetCallbacks((uintptr_t)&watch, &callbacks);
  const uint32_t result = Walk(order);
  if (result != ICFG_OK) {
    printf("refused: 0x%08x\n", (unsigned)result);
  } else {
    while (!atomic_load(&watch.over)) Pause();
  }
  IcfgSetCallbacks(0, NULL); /* the watch ends here */
  IcfgUninitialize();
  return atomic_load(&watch.good);
}
