// How the device's one pool of memory is divided between the object store, where files of the root
// volume live, and programs.
#pragma once

#include <cstdint>

namespace device {

/// What the platform tells of the division; bytes unless it says pages.
struct MemoryDivision {
  std::uint32_t store_pages = 0;
  std::uint32_t ram_pages = 0;
  std::uint32_t page_size = 1;
  std::uint32_t store_size = 0;
  std::uint32_t store_free = 0;
};

/// @return false, with `division` as it was, when the platform does not tell, or names pages
/// without
///   a size.
bool GetMemoryDivision(MemoryDivision* division) noexcept;

/// The pages of both halves. All arithmetic is modulo 2^32, as on the device.
struct MemoryPages {
  std::uint32_t total = 0;            ///< store and program pages together
  std::uint32_t store_in_use = 0;     ///< pages of the store that hold files
  std::uint32_t programs_in_use = 0;  ///< pages that programs use
  std::uint32_t store = 0;            ///< pages that the store has now
};

/// @param page_size  in bytes; 0, which no device reports, gives 0
/// @return pages of program memory in use, counted one too high on purpose: the division never
///   takes the last page.
std::uint32_t GetRamPagesInUse(std::uint32_t page_size) noexcept;

/// @return false, with zeros, when the platform does not tell the division.
bool GetMemoryPages(MemoryPages* pages) noexcept;

/// The size in pages that gives the store half of the unused ones.
[[nodiscard]] constexpr std::uint32_t BalancedStorePages(const MemoryPages& pages) noexcept {
  const std::uint32_t unused = pages.total - pages.store_in_use - pages.programs_in_use;
  return pages.store_in_use + (unused >> 1);
}
static_assert(BalancedStorePages({2501, 1000, 500, 0}) == 1500, "1,001 unused, halved to 500");

/// Moves the division so that store and programs share the unused pages equally. Does nothing when
/// the platform does not tell the division; whether the move was granted is not looked at.
void RebalanceMemory() noexcept;

}  // namespace device
