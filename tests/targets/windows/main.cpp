// The management client as a program of desktop Windows. The root of the drive that it is started
// on is its device.
#include "targets/host/host.h"

int main() {
  return static_cast<int>(host::RunHost());
}
