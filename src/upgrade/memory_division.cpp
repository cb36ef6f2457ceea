#include "upgrade/memory_division.h"

#include <coredll.h>

namespace upgrade {

bool SetMemoryDivision(double fraction) noexcept {
  DWORD store_pages = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;
  STORE_INFORMATION store = {};
  if (GetSystemMemoryDivision(&store_pages, &ram_pages, &page_size) == 0 || page_size == 0 ||
      GetStoreInformation(&store) == 0) {
    return false;
  }
  MEMORYSTATUS memory = {};
  memory.dwLength = sizeof memory;
  GlobalMemoryStatus(&memory);
  MemoryFigures figures;
  figures.store_pages = store_pages;
  figures.ram_pages = ram_pages;
  figures.page_size = page_size;
  figures.store_size = store.dwStoreSize;
  figures.store_free = store.dwFreeSize;
  figures.physical_total = static_cast<std::uint32_t>(memory.dwTotalPhys);
  figures.physical_free = static_cast<std::uint32_t>(memory.dwAvailPhys);
  return SetSystemMemoryDivision(StorePagesFor(figures, fraction)) == SYSMEM_CHANGED;
}

}  // namespace upgrade
