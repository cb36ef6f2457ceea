/* The host on desktop Windows, or with a device's C run time: host SERVER PORT LIST CRC */
#include <stdio.h>
#include <windows.h>

#include "host.h"

void Pause(void) {
  Sleep(50);
}

int main(int count, char** arguments) {
  Order order;
  if (count != 5) {
    fprintf(stderr, "usage: %s SERVER PORT LIST CRC\n", arguments[0]);
    return 2;
  }
  order.server = arguments[1];
  order.port = arguments[2];
  order.list = arguments[3];
  order.crc = arguments[4];
  return CarryOut(&order) ? 0 : 1;
}
