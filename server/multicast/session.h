// One file of a multicast run: announced, sent, proved.
#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mcftp/wire/frames.h"
#include "server/multicast/announcer.h"
#include "server/multicast/outbox.h"
#include "server/multicast/session_plan.h"
#include "server/multicast/session_store.h"
#include "server/multicast/transfer.h"
#include "server/multicast_figures.h"
#include "server/multicast_options.h"

namespace server {

/// Announces the file, keeps the table of those who ask for it, has it sent by a Transfer, and
/// answers late requests for a while. Everything the run hands on has passed its header's checks.
class MulticastSession final : private TransferDesk {
 public:
  MulticastSession(const MulticastOptions& options, SessionPlan plan, MulticastFigures& run,
                   FileFigures& figures, Outbox& outbox, const MulticastListener& listener);
  ~MulticastSession() override;

  void Begin(Micros now);
  /// Goes on where another server has stopped.
  void Resume(const FileMemory& memory, Micros now);
  /// @param frame  deciphered
  /// @return false for what no client of this file would send
  [[nodiscard]] bool OnFrame(const Peer& from, const mcftp::Header& header,
                             const std::uint8_t* frame, std::size_t length, Micros now);
  void OnTime(Micros now);
  void StartNow(Micros now);
  void OnRate(Micros now);
  /// Ends without waiting for anybody.
  void Stop(Micros now);

  /// Whether a block could go out now.
  [[nodiscard]] bool HasBlock(Micros now);
  /// The next block's frame; null when its bytes could not be read, which ends the session.
  [[nodiscard]] const Outgoing* NextBlock(Micros now);
  [[nodiscard]] std::optional<Micros> deadline(Micros now);
  [[nodiscard]] bool finished() const { return figures_.phase == FilePhase::kFinished; }
  /// Changes with everything that a restarted server has to know.
  [[nodiscard]] std::uint64_t changes() const { return changes_; }
  /// What a restarted server has to know, with every device.
  [[nodiscard]] FileMemory Remember() const;
  /// ... with the devices that have changed since the last call.
  [[nodiscard]] FileMemory TakeChanges();

 private:
  [[nodiscard]] const MulticastOptions& options() const override { return options_; }
  [[nodiscard]] std::uint32_t block_count() const override { return plan_.blocks.block_count; }
  [[nodiscard]] std::uint16_t block_size() const override { return plan_.blocks.block_size; }
  [[nodiscard]] std::deque<Device>& devices() override { return devices_; }
  [[nodiscard]] FileFigures& figures() override { return figures_; }
  void GiveRole(Device& device, mcftp::Role role, Micros now) override;
  void SetProven(Device& device, Micros now) override;
  void SetDead(Device& device, const std::string& why, Micros now) override;
  void SetReleased(Device& device, const std::string& why, Micros now) override;
  void SetPhase(FilePhase phase, Micros now) override;
  void TellMaster(const Device& device, Micros now) override;
  void Changed(Device& device) override;

  void CheckAnnounced(Micros now);
  void BeginTransfer(Micros now);
  void MakeTransfer(Micros now);
  Device& AddDevice(const Peer& peer, Micros now);
  void EndTransfer(Micros now);
  void CheckProgress(Micros now);
  void KeepAlive(Micros now);
  void Recall(const DeviceMemory& known, FilePhase phase);
  void RecallBlocks(const FileMemory& memory);
  [[nodiscard]] FileMemory Progress() const;

  [[nodiscard]] bool OnRequest(const Peer& from, const mcftp::ReadRequest& request, Micros now);
  void Join(const Peer& from, Micros now);
  void OnRequestOfKnown(Device& device, Micros now);
  void Rejoin(Device& device, Micros now);
  void OnAck(Device& device, const mcftp::AckFrame& ack, Micros now);
  void OnNak(Device& device, std::uint16_t block, Micros now);
  void OnError(Device& device, const mcftp::ErrorFrame& error, Micros now);
  void Heard(Device& device, std::string what, Micros now);
  void Quiet(Device& device, Micros now);
  void Settle(Device& device, DeviceState state, const std::string& why, Micros now);
  void Tell(MulticastEventKind kind, const Device* device, std::string detail, Micros now);
  [[nodiscard]] Device* Find(const Peer& peer);
  [[nodiscard]] bool takes_devices(Micros now) const;
  void TurnAway(const Peer& from, Micros now);
  [[nodiscard]] Peer private_group() const;

  const MulticastOptions& options_;
  const SessionPlan plan_;
  MulticastFigures& run_;
  FileFigures& figures_;
  Outbox& outbox_;
  const MulticastListener& listener_;
  Announcer announcer_;

  std::deque<Device> devices_;
  std::map<Peer, Device*> table_;
  std::unique_ptr<Transfer> transfer_;
  std::vector<bool> sent_;  ///< by block
  std::uint32_t first_unsent_ = 1;
  std::uint32_t highest_sent_ = 0;

  Micros lingers_until_{0};
  bool farewell_ = false;   ///< the last block goes out once more
  Micros heard_by_all_{0};  ///< the latest block: it keeps everybody waiting on
  Micros keepalive_at_{0};
  std::uint64_t changes_ = 0;
  std::vector<Device*> changed_;  ///< since they were last stored
  Micros turning_since_{0};
  std::uint32_t turned_away_ = 0;  ///< since then
};

}  // namespace server
