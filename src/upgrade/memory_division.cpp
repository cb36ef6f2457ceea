#include "upgrade/memory_division.h"

#include <coredll.h>

namespace upgrade {

bool SetMemoryDivision(double fraction) noexcept {
  MemoryFigures figures;
  if (!device::GetMemoryDivision(&figures)) return false;
  MEMORYSTATUS memory = {};
  memory.dwLength = sizeof memory;
  GlobalMemoryStatus(&memory);
  figures.physical_total = static_cast<std::uint32_t>(memory.dwTotalPhys);
  figures.physical_free = static_cast<std::uint32_t>(memory.dwAvailPhys);
  return SetSystemMemoryDivision(StorePagesFor(figures, fraction)) == SYSMEM_CHANGED;
}

}  // namespace upgrade
