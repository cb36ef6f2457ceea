// The client on a simulated device: client FOLDER SERVER PORT SOURCE DESTINATION CRC
// Ends with 0 when the upgrade was carried out; what came of it stands in the device's log.
#include <cesim/desk.h>

#include <iostream>

#include "client.h"

int main(int count, char** arguments) {
  if (count != 7) {
    std::cerr << "usage: " << arguments[0] << " FOLDER SERVER PORT SOURCE DESTINATION CRC\n";
    return 2;
  }
  char reason[200];
  CesimDevice* const device = CesimBegin(arguments[1], reason, sizeof reason);
  if (device == nullptr) {
    std::cerr << arguments[1] << ": no device: " << reason << '\n';
    return 2;
  }
  const bool started =
      Fetch({arguments[2], arguments[3], arguments[4], arguments[5], arguments[6]});
  CesimEnd(device);
  return started ? 0 : 1;
}
