// One block, its acknowledgement, the next block.
#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <optional>
#include <string>

#include "server/multicast/transfer.h"

namespace server {

/// The plainest way to send a file: one device is master and acknowledges each block before the
/// next one goes out; when it is through, the others are asked one after the other what they lack.
///
/// What follows from how a client behaves:
/// - a client that completes in NAK mode says the block count whether or not it has the last block,
///   so the last block goes out twice before anybody is asked;
/// - a client that has completed leaves its dally at the next block without a word, so a missing
///   acknowledgement of the last block is asked for by a role, not by the block again;
/// - a device that was passive for a while may have gaps and would complete with them by
///   acknowledging the last block: such a master paces all blocks but the last.
class LockStep final : public Transfer {
 public:
  explicit LockStep(TransferDesk& desk) : desk_(desk) {}

  void Begin(Micros now) override;
  void Resume(std::uint32_t first_unsent, bool last_sent, Micros now) override;
  void OnJoin(Device& device, Micros now) override;
  void OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) override;
  void OnNak(Device& device, std::uint16_t block, Micros now) override;
  void OnOverrun(Device& device, std::uint16_t percent_x100, std::uint16_t block,
                 Micros now) override;
  void OnGivenUp(Device& device, Micros now) override;
  void OnTime(Micros now) override;
  [[nodiscard]] bool HasBlock(Micros now) override;
  std::uint32_t TakeBlock(Micros now) override;
  [[nodiscard]] bool takes_devices(Micros now) const override;
  [[nodiscard]] std::optional<Micros> deadline(Micros now) override;
  [[nodiscard]] bool done() const override { return phase_ == Phase::kDone; }

 private:
  enum class Phase : std::uint8_t {
    kElect,   ///< subject_ is offered the mastership
    kStream,  ///< subject_ is master
    kRepair,  ///< subject_ has reported an overrun and names what it lacks
    kDrain,   ///< the last block goes out twice, then subject_ names what it lacks
    kDone,
  };
  /// What a device has reported last.
  struct Overrun {
    std::uint16_t percent_x100;
    std::uint16_t block;
  };

  void Elect(Device& candidate, Micros now);
  void ElectNext(Micros now);
  void BecomeMaster(Micros now);
  void GoOn(Micros now);
  void Repair(Micros now);
  void Drain(Micros now);
  void DrainNext(Micros now);
  void Ask(mcftp::Role role, Micros now);
  void Send(std::uint32_t block);
  void OnMasterAck(std::uint32_t block, Micros now);
  void EndRepair(Micros now);
  [[nodiscard]] bool NamesInVain(Device& device, std::uint16_t block, Micros now);
  void AskAgain(Micros now);
  void Finish();

  void ElectTimeout(Micros now);
  void StreamTimeout(Micros now);
  void NakTimeout(Micros now);
  [[nodiscard]] Micros AckWait() const;

  TransferDesk& desk_;
  Phase phase_ = Phase::kElect;
  Device* subject_ = nullptr;
  Device* old_master_ = nullptr;  ///< during a repair
  std::uint32_t next_ = 1;        ///< the block the master is to acknowledge next
  std::uint32_t first_unsent_ = 1;
  bool has_gaps_ = false;     ///< the master may lack blocks below next_
  bool asking_last_ = false;  ///< the master was asked whether it has the last block

  std::deque<std::uint32_t> to_send_;
  std::uint32_t tries_ = 0;
  Micros drain_began_{0};
  std::optional<Micros> timer_;
  bool timer_at_send_ = false;  ///< the wait begins when the block has gone out
  Micros sent_at_{0};
  bool sent_once_ = false;
  Micros last_went_out_{-1};  ///< the last block, since draining began

  std::map<Device*, Overrun> overruns_;
};

}  // namespace server
