// When a passive client tells the server that it cannot keep up.
#pragma once

#include <cstdint>
#include <optional>

namespace mcftp {

/// The share of a file that should have come and has.
struct OverrunReport {
  float percent;
  std::uint16_t block;  ///< the block in hand
};

/// The check as arithmetic, in the device's single precision; sends nothing and logs nothing.
class OverrunWatch {
 public:
  /// @param grace_blocks       blocks before checking starts, and between repeated reports
  /// @param threshold_percent  below it a report is due
  OverrunWatch(std::uint32_t grace_blocks, std::uint32_t threshold_percent) noexcept
      : grace_blocks_(grace_blocks),
        threshold_(static_cast<float>(threshold_percent)),
        window_start_(grace_blocks) {}

  /// For a new file.
  void Reset() noexcept;

  /// @param block           number of the DATA block in hand, from 1
  /// @param data_length     its data bytes; 0 is not checked
  /// @param received_bytes  bytes of the file written before it
  /// @return what is to be reported, usually nothing.
  [[nodiscard]] std::optional<OverrunReport> OnBlock(std::uint16_t block, std::uint16_t data_length,
                                                     std::uint32_t received_bytes) noexcept;

  /// The block that was reported last and has not been caught up with, 0 for none.
  [[nodiscard]] std::uint16_t recorded_block() const noexcept { return recorded_block_; }
  void ForgetRecordedBlock() noexcept { recorded_block_ = 0; }
  /// Whether the block checked last was short of its full share. Nothing depends on it.
  [[nodiscard]] bool is_short() const noexcept { return short_; }

 private:
  std::uint32_t grace_blocks_;
  float threshold_;
  std::uint64_t window_start_;
  std::uint16_t recorded_block_ = 0;
  bool short_ = false;
};

/// What a report shows and sends of its percentage: 67.5 is 67.50 and 6750.
struct OverrunTexts {
  char line[48];     ///< "<< OVERRUN ERROR: 67.50 at 120"
  char message[32];  ///< "Overrun:6750:120"
};
[[nodiscard]] OverrunTexts TextsOf(const OverrunReport& report) noexcept;

}  // namespace mcftp
