#include "server/multicast/pace.h"

#include <algorithm>

namespace server {
namespace {

constexpr std::int64_t kMillionthsPerByte = 8'000'000;

}  // namespace

Pace::Pace(std::uint64_t bits_per_second, std::uint64_t largest_frame)
    : rate_(bits_per_second),
      frame_(static_cast<std::int64_t>(largest_frame) * kMillionthsPerByte),
      tokens_(frame_ * kBurstFrames) {}

void Pace::SetRate(std::uint64_t bits_per_second, Micros now) {
  tokens_ = Tokens(now);
  filled_at_ = now;
  rate_ = bits_per_second;
}

std::int64_t Pace::Tokens(Micros now) const {
  const std::int64_t full = frame_ * kBurstFrames;
  const std::int64_t since = std::max<std::int64_t>((now - filled_at_).count(), 0);
  const auto rate = static_cast<std::int64_t>(rate_);
  // A long pause fills the bucket whatever the rate: no product that could overflow.
  if (rate > 0 && since > (full - tokens_) / rate) return full;
  return tokens_ + since * rate;
}

Micros Pace::ReadyAt(Micros now) const {
  if (Ready(now)) return now;
  const auto rate = static_cast<std::int64_t>(rate_);
  return now + Micros((frame_ - Tokens(now) + rate - 1) / rate);
}

void Pace::Take(std::uint64_t bytes, Micros now) {
  tokens_ = rate_ == 0
                ? frame_ * kBurstFrames
                : std::max(Tokens(now) - static_cast<std::int64_t>(bytes) * kMillionthsPerByte,
                           -frame_ * kBurstFrames);
  filled_at_ = now;
}

}  // namespace server
