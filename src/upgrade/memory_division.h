// Giving the object store its share of the memory before a phase that needs it.
#pragma once

#include <cstdint>

#include "device/memory.h"

namespace upgrade {

/// What the platform tells about its memory; bytes unless it says pages.
struct MemoryFigures : device::MemoryDivision {
  std::uint32_t physical_total = 0;
  std::uint32_t physical_free = 0;
};

/// The size of the store in pages that gives it `fraction` of what neither half uses, one page set
/// aside. Everything but the fraction is modulo 2^32, as on the device, so figures that contradict
/// each other give a number and not an error.
[[nodiscard]] constexpr std::uint32_t StorePagesFor(const MemoryFigures& memory,
                                                    double fraction) noexcept {
  const std::uint32_t page = memory.page_size;
  const std::uint32_t used_store = memory.store_size / page - memory.store_free / page;
  const std::uint32_t used_ram = memory.physical_total / page - memory.physical_free / page;
  const std::uint32_t free = memory.store_pages + memory.ram_pages - 1 - used_store - used_ram;
  return used_store + static_cast<std::uint32_t>(fraction * free);
}

/// @param fraction  of the unused memory for the store, 0 to 1
/// @return whether the division was changed.
bool SetMemoryDivision(double fraction) noexcept;

}  // namespace upgrade
