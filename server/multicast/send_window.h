// How many blocks may be in flight towards the device that sets the pace.
#pragma once

#include <cstdint>

#include "server/moment.h"
#include "server/multicast/round_trip.h"

namespace server {

/// Grows while answers come as fast as on an empty way, and stops when blocks begin to queue up
/// before the device: a handheld buffers some twenty datagrams, so queueing is watched in blocks
/// and kept well below that. Single losses, which are everyday life on a radio, do not shrink it;
/// losses behind a queue, losses of half a round and silence do. Where nobody else listens, it
/// tries how much more the device bears.
class SendWindow {
 public:
  /// @param limit  blocks, at least 1
  SendWindow(std::uint32_t limit, std::uint16_t block_size);

  [[nodiscard]] std::uint32_t size() const { return static_cast<std::uint32_t>(size_); }
  [[nodiscard]] const RoundTrip& round_trip() const { return round_trip_; }
  /// Others hear what is sent too, and say nothing when it is too much for them.
  void SetAlone(bool alone) { alone_ = alone; }

  /// @param sent_at  when the block that is acknowledged went out; it was sent once
  void OnAck(Micros sent_at, Micros now);
  void OnLoss() { ++lost_; }
  /// Nothing has come back for longer than the round trip's bound.
  void OnSilence();
  /// The device says, or shows, that it cannot follow.
  void Reduce();

 private:
  void EndRound();

  double limit_;
  double queue_;          ///< blocks that any device can hold
  double queue_allowed_;  ///< blocks that may wait before this one; below half of it: grow
  double queue_most_;     ///< what has turned out to be too much, less a good part
  bool alone_ = false;
  double size_;
  bool starting_ = true;  ///< doubles with every round

  RoundTrip round_trip_;
  Micros round_began_{0};
  Micros round_least_{0};  ///< shortest round trip in it, 0: none yet
  std::uint32_t acked_ = 0;
  std::uint32_t lost_ = 0;
};

}  // namespace server
