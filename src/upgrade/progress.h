// How far a job has come: the overall bar.
#pragma once

#include <cstdint>

namespace upgrade {

/// Announces the bytes that the job handed over next will bring, 0 when unknown. Stays until the
/// next call: an outside caller of the upgrade thread never makes one. Host's thread.
void SetExpectedBytes(std::uint32_t bytes) noexcept;
[[nodiscard]] std::uint32_t AnnouncedBytes() noexcept;

/// Begins a job's way: nothing has come yet of `expected` bytes. A number of its own, because the
/// host may announce the next job while this one runs. Upgrade thread.
void BeginReceiving(std::uint32_t expected) noexcept;

/// Counts a file that arrived and moves the overall bar. Upgrade thread, and the one that listens
/// to the multicast client.
void AddReceivedBytes(std::uint32_t bytes) noexcept;

/// The overall bar's place: received of expected, at least 5 and at most 100 percent; 100 when the
/// expected number is unknown.
[[nodiscard]] constexpr int OverallPercent(std::uint64_t received,
                                           std::uint32_t expected) noexcept {
  if (received >= expected) return 100;
  const auto percent = static_cast<int>(received * 100U / expected);
  return percent < 5 ? 5 : percent;
}
static_assert(OverallPercent(1, 2) == 50 && OverallPercent(0, 1000) == 5);
static_assert(OverallPercent(3, 2) == 100 && OverallPercent(1, 0) == 100);
static_assert(OverallPercent(0xFFFFFFFFU, 0xFFFFFFFFU) == 100, "the product needs 39 bits");
static_assert(OverallPercent(UINT64_MAX, 0xFFFFFFFFU) == 100, "files may be counted repeatedly");

}  // namespace upgrade
