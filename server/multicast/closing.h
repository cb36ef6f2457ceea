// The blocks that complete a file on a device.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "server/multicast/block_log.h"
#include "server/multicast/transfer.h"

namespace server {

/// Devices that have everything else get the blocks that were held back, in ACK mode: an
/// acknowledgement of the last block, from a device that has acknowledged the one before, is proof
/// that cannot be mistaken. A group at a time:
///
/// 1. each takes the role (it acknowledges block 0);
/// 2. the guard goes out until all have acknowledged it;
/// 3. the last block goes out. Who does not acknowledge it is asked by its role, because a device
///    that has completed leaves at the next block without a word: block 0 says that the block was
///    lost, the last block's number that the file is closed on the device. Nobody gets the last
///    block again before everybody's state is known.
/// 4. A device that has closed the file and did not say so in answer to the last block is asked
///    once more, as one that names what it lacks: in its dally it acknowledges the last block
///    again, which is proof; having left the file before, it names a block, which is none.
class Closing {
 public:
  Closing(TransferDesk& desk, BlockLog& log) : desk_(desk), log_(log) {}

  /// @param last_question_at  when a device was last asked to name what it lacks. Should that reach
  ///   it late, it would take back the role that it is given here, and complete without the last
  ///   block: so roles are given when nothing can be so late any more.
  void Begin(std::optional<Micros> last_question_at, Micros now);
  void OnAck(Device& device, std::uint32_t block, Micros now);
  void OnNak(Device& device, std::uint32_t block, Micros now);
  /// A device that is being closed asks for the file again.
  void OnJoin(Device& device, Micros now);
  void OnGivenUp(Device& device, Micros now);
  void OnTime(Micros now);
  [[nodiscard]] bool HasBlock(Micros now) const { return to_send_ != 0 && now >= quiet_until_; }
  std::uint32_t TakeBlock(Micros now);
  [[nodiscard]] std::optional<Micros> deadline(Micros now) const;
  [[nodiscard]] bool done() const { return done_; }

 private:
  enum class Stage : std::uint8_t { kAsking, kGuard, kLast };

  void NextGroup(Micros now);
  void Fill(Micros now);
  [[nodiscard]] bool InGroup(const Device& device) const;
  [[nodiscard]] bool AllHaveAnswered();
  void Ask(Device& device, Micros now);
  void Answered(Device& device, Device::Closing state, Micros now);
  void Go(Micros now);
  void AskClosed(Device& device, Micros now);
  void CheckUnreached(Micros now);
  void Bury(Device& device, const char* why, Micros now);
  [[nodiscard]] std::size_t Count(Device::Closing state) const;
  [[nodiscard]] std::optional<Micros> DueAt(const Device& device) const;
  [[nodiscard]] Micros Wait(const Device& device) const;
  [[nodiscard]] bool IsSilent(const Device& device, Micros now) const;

  TransferDesk& desk_;
  BlockLog& log_;
  Stage stage_ = Stage::kAsking;
  std::vector<Device*> group_;  ///< those that are not settled
  std::uint32_t to_send_ = 0;
  Micros sent_at_{0};
  Micros quiet_until_{0};
  std::uint32_t sendings_ = 0;  ///< of the guard, in this group
  bool begun_ = false;
  bool done_ = false;
};

}  // namespace server
