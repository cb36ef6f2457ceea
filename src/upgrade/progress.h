// How far a job has come: the overall bar.
#pragma once

#include <cstdint>

namespace upgrade {

/// Sets the bytes that the job will bring, 0 when unknown. Called before the upgrade thread starts
/// and outlives the job, because an outside caller of the thread never sets it.
void SetExpectedBytes(std::uint32_t bytes) noexcept;

/// Forgets what an earlier job received.
void ResetReceivedBytes() noexcept;

/// Counts a file that arrived and moves the overall bar. Upgrade thread.
void AddReceivedBytes(std::uint32_t bytes) noexcept;

/// The overall bar's place: received of expected, at least 5 and at most 100 percent; 100 when the
/// expected number is unknown.
[[nodiscard]] constexpr int OverallPercent(std::uint32_t received,
                                           std::uint32_t expected) noexcept {
  if (expected == 0) return 100;
  const std::uint64_t percent = static_cast<std::uint64_t>(received) * 100U / expected;
  if (percent < 5) return 5;
  return percent > 100 ? 100 : static_cast<int>(percent);
}
static_assert(OverallPercent(1, 2) == 50 && OverallPercent(0, 1000) == 5);
static_assert(OverallPercent(3, 2) == 100 && OverallPercent(1, 0) == 100);
static_assert(OverallPercent(0xFFFFFFFFU, 0xFFFFFFFFU) == 100, "the product needs 39 bits");

}  // namespace upgrade
