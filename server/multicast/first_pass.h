// The first sending of a file's blocks, at the pace of one device.
#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <set>
#include <vector>

#include "server/multicast/block_log.h"
#include "server/multicast/send_window.h"
#include "server/multicast/transfer.h"

namespace server {

/// Sends all blocks but those held back. One device, the master, acknowledges each; as many are in
/// flight towards it as its window allows. What it does not acknowledge is sent again at once only
/// when it is alone: an acknowledgement that got lost looks like a lost block, and with several
/// devices the repair that follows knows better which blocks are worth a frame.
class FirstPass {
 public:
  FirstPass(TransferDesk& desk, BlockLog& log);

  void Begin(Micros now);
  /// Goes on with this block.
  void Resume(std::uint32_t next, Micros now);
  void OnAck(Device& device, const mcftp::AckFrame& ack, Micros now);
  void OnNak(Device& device, Micros now);
  void OnOverrun(Device& device, std::uint16_t percent_x100, Micros now);
  void OnGivenUp(Device& device, Micros now);
  void OnJoin(Device& device, Micros now);
  void OnRate(Micros now);
  void OnTime(Micros now);
  [[nodiscard]] bool HasBlock() const;
  std::uint32_t TakeBlock(Micros now);
  [[nodiscard]] std::optional<Micros> deadline() const;
  [[nodiscard]] bool done() const { return done_; }
  [[nodiscard]] const SendWindow& window() const { return window_; }

 private:
  struct InFlight {
    std::uint32_t block;
    Micros sent_at;
    bool again;               ///< not its first sending
    std::uint32_t overtaken;  /// acknowledgements of blocks sent after it
  };

  void Elect(Device& candidate, Micros now);
  void ElectNext(Micros now);
  void BeginElection(Micros now);
  void Ask(Micros now);
  void Replace(Device& by, Micros now);
  void GiveUpMaster(Micros now);
  void CheckDeaf(Micros now);
  void EndWave(const Device* winner, Micros now);
  void ElectionTimeout(Micros now);
  [[nodiscard]] bool IsAsked(const Device& device) const;
  [[nodiscard]] bool AnyUnasked() const;
  void BecomeMaster(Device& device, Micros now);
  void Acknowledged(std::uint32_t block, bool duplicate, Micros now);
  void Lost(const InFlight& gone);
  void CheckEnd(Micros now);
  void Finish(Micros now);
  void Measure(Micros now);
  void MeasureAnew(Micros now);
  [[nodiscard]] double MeasuredRate(Micros now) const;
  [[nodiscard]] bool MayRepeat() const;
  [[nodiscard]] Micros Patience() const;

  TransferDesk& desk_;
  BlockLog& log_;
  SendWindow window_;
  const std::uint32_t end_;  ///< the first block that is held back

  Device* master_ = nullptr;  ///< the latest one, while electing_
  bool electing_ = false;
  std::vector<Device*> wave_;  ///< who is offered the mastership; the first to take it has it
  std::size_t wave_size_ = 1;
  std::uint32_t election_ = 0;
  Micros election_began_{0};
  Micros asked_at_{0};
  std::uint32_t tries_ = 0;
  bool from_start_ = true;  ///< the master has been master since block 1

  // Whether the master hears blocks at all:
  std::uint32_t vain_elections_ = 0;  ///< since it acknowledged a block
  std::uint32_t vain_blocks_ = 0;
  Micros progress_at_{0};

  std::uint32_t next_ = 1;
  std::deque<InFlight> flight_;
  std::set<std::uint32_t> lacking_;  ///< not acknowledged by the master
  std::uint32_t lost_ = 0;           ///< sendings that the master did not acknowledge
  std::set<std::uint32_t> again_;    ///< blocks sent again whose fate is not known
  std::uint32_t wasted_ = 0;         ///< blocks sent again that the master had
  unsigned backoff_ = 0;             ///< doublings of the patience

  // Whether a slow master is worth waiting for:
  Micros measure_began_{0};
  std::uint32_t measured_acks_ = 0;
  double best_rate_ = 0;  ///< blocks per second that any master has acknowledged
  std::uint32_t slow_measures_ = 0;
  bool done_ = false;
};

}  // namespace server
