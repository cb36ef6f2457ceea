#include "upgrade/flash_step.h"

#include <coredll.h>

#include "device/flash/flash_driver.h"
#include "device/flash/ram_file.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/memory_division.h"

namespace upgrade {

void FlashOsImage() noexcept {
  constexpr DWORD kPauseMs = 3000;
  report::ShowStatus("Starting EFlash...");
  report::ShowStatus("This may take several minutes...");
  SetMemoryDivision(0.5);
  Sleep(kPauseMs);
  report::Log("Starting Eflash...");
  if (device::HasRAMStore()) device::EFL_Helper_Start_EFLASH();
  report::Log("After Eflash...");
}

}  // namespace upgrade
