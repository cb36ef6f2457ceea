#include "server/multicast/session.h"

#include <algorithm>
#include <utility>

#include "server/multicast/lock_step.h"
#include "server/multicast/pipeline.h"

namespace server {
namespace {

using mcftp::Role;

constexpr std::uint16_t kAccessViolation = 2;
constexpr Micros kKeepAliveSweep = std::chrono::seconds(1);
/// A server that is started again may send so many blocks once more.
constexpr std::uint32_t kBlocksBetweenChanges = 256;

}  // namespace

MulticastSession::MulticastSession(const MulticastOptions& options, SessionPlan plan,
                                   MulticastFigures& run, FileFigures& figures, Outbox& outbox,
                                   const MulticastListener& listener)
    : options_(options),
      plan_(std::move(plan)),
      run_(run),
      figures_(figures),
      outbox_(outbox),
      listener_(listener),
      announcer_(options_, plan_, figures_, outbox_),
      sent_(plan_.blocks.block_count + 1, false) {}

MulticastSession::~MulticastSession() = default;

Peer MulticastSession::private_group() const {
  return {options_.private_group, options_.public_group.port};
}

Device* MulticastSession::Find(const Peer& peer) {
  const auto at = table_.find(peer);
  return at == table_.end() ? nullptr : at->second;
}

// ---- announcing ----

void MulticastSession::Begin(Micros now) {
  figures_.began = now;
  figures_.phase = FilePhase::kAnnounced;
  keepalive_at_ = now + kKeepAliveSweep;
  announcer_.Announce(now);
  Tell(MulticastEventKind::kAnnounced, nullptr, "", now);
}

void MulticastSession::StartNow(Micros now) {
  if (figures_.phase != FilePhase::kAnnounced || devices_.empty()) return;
  announcer_.StartNow();
  CheckAnnounced(now);
}

void MulticastSession::OnRate(Micros now) {
  if (transfer_ != nullptr) transfer_->OnRate(now);
}

void MulticastSession::CheckAnnounced(Micros now) {
  if (announcer_.IsEnough(devices_.size(), now)) BeginTransfer(now);
}

void MulticastSession::BeginTransfer(Micros now) {
  if (devices_.empty() || block_count() == 0) {
    EndTransfer(now);
    return;
  }
  MakeTransfer(now);
  Tell(MulticastEventKind::kStarted, nullptr, std::to_string(devices_.size()) + " devices", now);
  transfer_->Begin(now);
  CheckProgress(now);
}

void MulticastSession::MakeTransfer(Micros now) {
  figures_.data_began = now;
  heard_by_all_ = now;
  TransferDesk& desk = *this;
  if (options_.window <= 1) {
    transfer_ = std::make_unique<LockStep>(desk);
  } else {
    transfer_ = std::make_unique<Pipeline>(desk);
  }
}

// ---- what another server has left, and leaves ----

void MulticastSession::Resume(const FileMemory& memory, Micros now) {
  keepalive_at_ = now + kKeepAliveSweep;
  figures_.began = now;
  for (const DeviceMemory& known : memory.devices) {
    if (devices_.size() >= options_.max_devices) break;
    if (Find(known.peer) == nullptr) Recall(known, memory.phase);
  }
  RecallBlocks(memory);
  if (memory.phase == FilePhase::kAnnounced) {
    Begin(now);
  } else if (memory.phase >= FilePhase::kLingering || devices_.empty() || block_count() == 0) {
    EndTransfer(now);
  } else {
    MakeTransfer(now);
    Tell(MulticastEventKind::kStarted, nullptr,
         std::to_string(devices_.size()) + " devices, from block " + std::to_string(first_unsent_),
         now);
    transfer_->Resume(first_unsent_, memory.last_sent, now);
    CheckProgress(now);
  }
}

void MulticastSession::Recall(const DeviceMemory& known, FilePhase phase) {
  Device& device = AddDevice(known.peer, Micros(0));
  device.figures.state = known.state;
  device.figures.late = known.late;
  device.figures.reason = known.reason;
  device.figures.last_heard = known.last_heard;
  device.recalled = true;
  // While a file is being closed nobody lacks anything else, and nobody may be asked to name it.
  device.whole = known.whole || phase == FilePhase::kClosing;
}

/// Blocks that the other server may have sent count as sent again when they go out.
void MulticastSession::RecallBlocks(const FileMemory& memory) {
  first_unsent_ = std::min(memory.first_unsent, block_count() + 1);
  std::fill_n(sent_.begin(), first_unsent_, true);
  sent_[block_count()] = memory.last_sent;
  highest_sent_ = memory.last_sent ? block_count() : first_unsent_ - 1;
  static_cast<SentFrames&>(figures_) = memory.sent;
  run_.frames_sent += memory.sent.frames;
  run_.wire_bytes += memory.sent.wire_bytes;
  if (memory.phase >= FilePhase::kLingering) return;
  const auto known = static_cast<std::uint64_t>(std::count(sent_.begin() + 1, sent_.end(), true));
  const std::uint64_t again =
      figures_.first_pass_frames - std::min(known, figures_.first_pass_frames);
  figures_.first_pass_frames -= again;
  figures_.repair_frames += again;
}

/// Without its devices.
FileMemory MulticastSession::Progress() const {
  FileMemory memory;
  memory.index = static_cast<std::uint32_t>(figures_.index);
  memory.transfer_id = plan_.transfer_id;
  memory.phase = figures_.phase;
  memory.sent = figures_;
  memory.first_unsent = first_unsent_;
  memory.last_sent = sent_[block_count()] && block_count() > 0;
  return memory;
}

FileMemory MulticastSession::Remember() const {
  FileMemory memory = Progress();
  for (const Device& device : devices_) memory.devices.push_back(RememberDevice(device));
  return memory;
}

FileMemory MulticastSession::TakeChanges() {
  FileMemory memory = Progress();
  for (Device* device : changed_) {
    device->changed = false;
    memory.devices.push_back(RememberDevice(*device));
  }
  changed_.clear();
  return memory;
}

void MulticastSession::Changed(Device& device) {
  ++changes_;
  if (!std::exchange(device.changed, true)) changed_.push_back(&device);
}

void MulticastSession::EndTransfer(Micros now) {
  // A block ends every dally at once, and the next announcement finds devices that listen. After
  // the last file nobody listens any more.
  farewell_ = options_.window > 1 && !plan_.last_file && transfer_ != nullptr &&
              figures_.Count(DeviceState::kProven) > 0;
  transfer_.reset();
  figures_.ended = now;
  figures_.phase = FilePhase::kLingering;
  lingers_until_ = now + options_.linger;
  ++changes_;
}

void MulticastSession::Stop(Micros now) {
  if (finished()) return;
  transfer_.reset();
  farewell_ = false;
  figures_.ended = now;
  figures_.phase = FilePhase::kFinished;
  ++changes_;
}

// ---- time ----

void MulticastSession::OnTime(Micros now) {
  switch (figures_.phase) {
    case FilePhase::kAnnounced:
      CheckAnnounced(now);
      if (figures_.phase == FilePhase::kAnnounced && announcer_.IsCopyDue(now)) {
        announcer_.Announce(now);
      }
      break;
    case FilePhase::kLingering:
      if (now >= lingers_until_ && !farewell_) {
        figures_.phase = FilePhase::kFinished;
        ++changes_;
        Tell(MulticastEventKind::kFileEnded, nullptr, "", now);
      }
      return;
    default:
      if (transfer_ != nullptr) transfer_->OnTime(now);
      CheckProgress(now);
      break;
  }
  KeepAlive(now);
}

void MulticastSession::CheckProgress(Micros now) {
  if (transfer_ != nullptr && transfer_->done()) EndTransfer(now);
}

/// Devices that have asked and hear nothing give up; a role they have already changes nothing.
void MulticastSession::KeepAlive(Micros now) {
  if (now < keepalive_at_) return;
  keepalive_at_ = now + kKeepAliveSweep;
  if (now - heard_by_all_ < options_.keepalive) return;
  for (Device& device : devices_) {
    if (device.settled() || now - device.spoken_to_at < options_.keepalive) continue;
    GiveRole(device, device.role, now);
  }
}

std::optional<Micros> MulticastSession::deadline(Micros now) {
  switch (figures_.phase) {
    case FilePhase::kAnnounced: return Earlier(announcer_.deadline(devices_.size()), keepalive_at_);
    case FilePhase::kLingering: return farewell_ ? std::nullopt : std::optional(lingers_until_);
    case FilePhase::kFinished: return std::nullopt;
    default:
      return Earlier(transfer_ != nullptr ? transfer_->deadline(now) : std::nullopt, keepalive_at_);
  }
}

// ---- blocks ----

bool MulticastSession::HasBlock(Micros now) {
  return farewell_ || (transfer_ != nullptr && transfer_->HasBlock(now));
}

const Outgoing* MulticastSession::NextBlock(Micros now) {
  const std::uint32_t block = farewell_ ? block_count() : transfer_->TakeBlock(now);
  const bool goodbye = std::exchange(farewell_, false);
  const std::uint32_t offset = (block - 1) * block_size();
  const std::uint32_t length =
      std::min<std::uint32_t>(block_size(), plan_.file->content->size() - offset);
  if (!plan_.file->content->Read(offset, length, outbox_.data_place())) {
    for (Device& device : devices_) {
      if (device.settled()) continue;
      outbox_.SendError(device.figures.peer, kAccessViolation);
      Settle(device, DeviceState::kDead, "the file cannot be read any more", now);
    }
    EndTransfer(now);
    farewell_ = false;
    return nullptr;
  }
  heard_by_all_ = now;
  if (goodbye) {
    ++figures_.farewell_frames;
  } else {
    ++(sent_[block] ? figures_.repair_frames : figures_.first_pass_frames);
  }
  highest_sent_ = std::max(highest_sent_, block);
  sent_[block] = true;
  while (first_unsent_ <= block_count() && sent_[first_unsent_]) {
    if (++first_unsent_ % kBlocksBetweenChanges == 0) ++changes_;
  }
  if (!goodbye) CheckProgress(now);
  return outbox_.MakeData(private_group(), static_cast<std::uint16_t>(block),
                          static_cast<std::uint16_t>(length));
}

}  // namespace server
