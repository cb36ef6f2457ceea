#include "device/memory.h"

#include <coredll.h>

namespace device {
namespace {

/// The platform tells these in bytes; desktop builds of the same calls use wider types.
std::uint32_t Pages(std::uint64_t bytes, std::uint32_t page_size) noexcept {
  return static_cast<std::uint32_t>(bytes / page_size);
}

}  // namespace

std::uint32_t GetRamPagesInUse(std::uint32_t page_size) noexcept {
  if (page_size == 0) return 0;
  MEMORYSTATUS status = {};
  status.dwLength = sizeof status;
  GlobalMemoryStatus(&status);
  return Pages(status.dwTotalPhys, page_size) - Pages(status.dwAvailPhys, page_size) + 1;
}

bool GetMemoryDivision(MemoryDivision* division) noexcept {
  DWORD store_pages = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;
  STORE_INFORMATION store = {};
  if (GetSystemMemoryDivision(&store_pages, &ram_pages, &page_size) == 0 || page_size == 0 ||
      GetStoreInformation(&store) == 0) {
    return false;
  }
  division->store_pages = static_cast<std::uint32_t>(store_pages);
  division->ram_pages = static_cast<std::uint32_t>(ram_pages);
  division->page_size = static_cast<std::uint32_t>(page_size);
  division->store_size = static_cast<std::uint32_t>(store.dwStoreSize);
  division->store_free = static_cast<std::uint32_t>(store.dwFreeSize);
  return true;
}

bool GetMemoryPages(MemoryPages* pages) noexcept {
  *pages = MemoryPages{};
  MemoryDivision division;
  if (!GetMemoryDivision(&division)) return false;
  const std::uint32_t page = division.page_size;
  pages->total = division.store_pages + division.ram_pages;
  pages->store_in_use = division.store_size / page - division.store_free / page;
  pages->programs_in_use = GetRamPagesInUse(page);
  pages->store = division.store_pages;
  return true;
}

void RebalanceMemory() noexcept {
  MemoryPages pages;
  if (GetMemoryPages(&pages)) SetSystemMemoryDivision(BalancedStorePages(pages));
}

}  // namespace device
