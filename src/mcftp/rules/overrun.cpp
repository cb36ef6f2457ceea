#include "mcftp/rules/overrun.h"

#include "base/format.h"

namespace mcftp {
namespace {

constexpr float kAll = 100.0F;

/// KEPT ODDITY: each step is rounded to single precision, so a share just short of a whole one can
/// come out as exactly 100. Pinned by OverrunWatchTest.RoundsEachStepToSinglePrecision.
float Share(std::uint16_t block, std::uint16_t data_length, std::uint32_t received) noexcept {
  const auto have = static_cast<float>(data_length + received);
  const auto due = static_cast<float>(std::uint32_t{data_length} * block);
  const float ratio = have / due;
  return ratio * kAll;
}

}  // namespace

void OverrunWatch::Reset() noexcept {
  window_start_ = grace_blocks_;
  recorded_block_ = 0;
  short_ = false;
}

std::optional<OverrunReport> OverrunWatch::OnBlock(std::uint16_t block, std::uint16_t data_length,
                                                   std::uint32_t received_bytes) noexcept {
  if (block <= window_start_ || data_length == 0) return std::nullopt;
  const float percent = Share(block, data_length, received_bytes);
  short_ = percent != kAll;
  if (!short_) return std::nullopt;
  const bool below = percent < threshold_;
  if (recorded_block_ == 0) {
    if (!below) return std::nullopt;
  } else if (percent > threshold_) {
    window_start_ = std::uint64_t{grace_blocks_} + recorded_block_;
    recorded_block_ = 0;
    return std::nullopt;
  } else if (block <= std::uint64_t{grace_blocks_} + recorded_block_) {
    return std::nullopt;
  }
  recorded_block_ = block;
  return OverrunReport{percent, block};
}

OverrunTexts TextsOf(const OverrunReport& report) noexcept {
  OverrunTexts texts;
  // To the nearest hundredth, and exactly: a single has too few digits for the product not to fit.
  const double exact = static_cast<double>(report.percent) * 100;
  auto hundredths = static_cast<std::uint64_t>(exact);
  if (exact - static_cast<double>(hundredths) >= 0.5) ++hundredths;
  const auto whole = static_cast<std::uint32_t>(hundredths / 100);
  const auto rest = static_cast<std::uint32_t>(hundredths % 100);
  base::Format(texts.line, sizeof texts.line, "<< OVERRUN ERROR: %u.%02u at %u", whole, rest,
               static_cast<unsigned>(report.block));
  const float hundredfold = report.percent * kAll;
  const auto sent = static_cast<std::uint16_t>(static_cast<std::uint64_t>(hundredfold));
  base::Format(texts.message, sizeof texts.message, "Overrun:%u:%u", static_cast<unsigned>(sent),
               static_cast<unsigned>(report.block));
  return texts;
}

}  // namespace mcftp
