// How fast frames may go out.
#pragma once

#include <cstdint>
#include <optional>

#include "server/moment.h"

namespace server {

/// A token bucket for bits per second on the wire. Never lets more than four frames out at once, so
/// that a device's receive buffer and a switch's queue see a stream and no bursts.
class Pace {
 public:
  static constexpr std::uint32_t kBurstFrames = 4;

  /// @param largest_frame  bytes on the wire of the largest frame: the measure of a burst
  Pace(std::uint64_t bits_per_second, std::uint64_t largest_frame);

  /// May be changed at any time; 0 lifts the limit.
  void SetRate(std::uint64_t bits_per_second, Micros now);
  [[nodiscard]] std::uint64_t rate() const { return rate_; }

  /// Whether a frame may go out now.
  [[nodiscard]] bool Ready(Micros now) const { return rate_ == 0 || Tokens(now) >= frame_; }
  /// When Ready will hold if nothing else is sent.
  [[nodiscard]] Micros ReadyAt(Micros now) const;
  /// A frame of `bytes` on the wire goes out. Frames that cannot wait may overdraw the bucket, by
  /// its own size at most: the next ones wait the longer, and not for ever.
  void Take(std::uint64_t bytes, Micros now);

 private:
  /// In millionths of a bit, so that nothing is lost between two calls a microsecond apart.
  [[nodiscard]] std::int64_t Tokens(Micros now) const;

  std::uint64_t rate_;
  std::int64_t frame_;  ///< millionths of a bit
  std::int64_t tokens_;
  Micros filled_at_{0};
};

}  // namespace server
