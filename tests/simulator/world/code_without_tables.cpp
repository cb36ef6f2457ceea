#include "simulator/world/device_code_body.h"

DWORD test::WaitWithoutTables(void* steps) noexcept {
  return WaitForEver(steps);
}
