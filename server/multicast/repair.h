// Finding out what each device lacks, and sending it once for all.
#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <vector>

#include "server/multicast/block_log.h"
#include "server/multicast/transfer.h"

namespace server {

/// Puts a group of devices into NAK mode at one time. Each block that goes out makes all of them
/// say again which one they miss first, so one frame repairs many devices and brings the news of
/// all. A block goes out only when a device is known to lack it: it has named the block at a time
/// when the latest sending must have reached it. Who has all but the blocks held back is made
/// passive, and the next device takes its place in the group.
class Repair {
 public:
  Repair(TransferDesk& desk, BlockLog& log) : desk_(desk), log_(log) {}

  /// @param window  blocks that may be on their way within one round trip
  void Begin(std::uint32_t window, Micros now);
  void OnJoin(Micros now);
  void OnAck(Device& device, std::uint32_t block, Micros now);
  void OnNak(Device& device, std::uint32_t block, Micros now);
  void OnGivenUp(Device& device, Micros now);
  void OnTime(Micros now);
  [[nodiscard]] bool HasBlock(Micros now);
  std::uint32_t TakeBlock(Micros now);
  [[nodiscard]] std::optional<Micros> deadline(Micros now);
  [[nodiscard]] bool done() const { return done_; }
  /// When anybody was last asked to name what it lacks; nothing when nobody was.
  [[nodiscard]] std::optional<Micros> last_question_at() const { return last_question_at_; }

 private:
  void Fill(Micros now);
  void Ask(Device& device, Micros now);
  void Remove(Device& device, Micros now);
  [[nodiscard]] bool IsSilent(const Device& device, Micros now) const;
  void Advance(Device& device, std::uint32_t block, Micros now);
  void CheckUnreached(std::uint32_t block, Micros now);
  void CheckHopeless(Device& device, Micros now);
  [[nodiscard]] std::uint32_t Choose(Micros now);
  [[nodiscard]] std::uint32_t ChooseAhead(Device& device) const;
  [[nodiscard]] bool IsLacking(const Device& device) const;
  [[nodiscard]] Micros Bound(const Device& device) const;
  [[nodiscard]] Micros AskAt(const Device& device) const;
  void Forget(Micros now);

  TransferDesk& desk_;
  BlockLog& log_;
  std::vector<Device*> group_;
  std::size_t turn_ = 0;      ///< whose wish is looked at first
  std::uint32_t chosen_ = 0;  ///< the block HasBlock has found
  std::uint32_t window_ = 1;  ///< grows as devices get what they lack
  std::uint32_t window_limit_ = 1;
  std::deque<Micros> on_way_;  ///< when the blocks that may be on their way will have arrived
  Micros alone_since_{0};
  std::optional<Micros> last_question_at_;
  bool done_ = false;
};

}  // namespace server
