/* The host on a simulated device of Linux: host FOLDER SERVER PORT LIST CRC */
#include <cesim/desk.h>
#include <stdio.h>
#include <time.h>

#include "host.h"

void Pause(void) {
  const struct timespec moment = {0, 50 * 1000 * 1000};
  nanosleep(&moment, NULL);
}

int main(int count, char** arguments) {
  if (count != 6) {
    fprintf(stderr, "usage: %s FOLDER SERVER PORT LIST CRC\n", arguments[0]);
    return 2;
  }
  char reason[200];
  CesimDevice* device = CesimBegin(arguments[1], reason, sizeof reason);
  if (device == NULL) {
    fprintf(stderr, "%s: no device: %s\n", arguments[1], reason);
    return 2;
  }
  const Order order = {arguments[2], arguments[3], arguments[4], arguments[5]};
  const int good = CarryOut(&order);
  CesimEnd(device);
  return good ? 0 : 1;
}
