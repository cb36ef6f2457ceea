#include "simulator/world/device_code_body.h"

DWORD test::WaitWithoutExceptions(void* steps) noexcept {
  return WaitForEver(steps);
}
