#include "server/multicast/session.h"

#include <algorithm>
#include <charconv>
#include <system_error>
#include <utility>

#include "server/multicast/lock_step.h"
#include "server/multicast/pipeline.h"

namespace server {
namespace {

using mcftp::Role;

constexpr std::uint16_t kAccessViolation = 2;
constexpr std::uint16_t kDiskFull = 3;
constexpr std::uint16_t kUnknownTransfer = 5;
constexpr Micros kKeepAliveSweep = std::chrono::seconds(1);
/// A server that is started again may send so many blocks once more.
constexpr std::uint32_t kBlocksBetweenChanges = 256;

std::uint32_t Milliseconds(Micros wait) {
  return static_cast<std::uint32_t>(
      std::chrono::duration_cast<std::chrono::milliseconds>(wait).count());
}

/// What a device says in "Overrun:6750:120".
struct OverrunReport {
  std::uint16_t percent_x100 = 0;
  std::uint16_t block = 0;
};

std::optional<OverrunReport> ParseOverrun(std::string_view message) {
  constexpr std::string_view kPrefix = "Overrun:";
  if (message.substr(0, kPrefix.size()) != kPrefix) return std::nullopt;
  OverrunReport report;
  const char* const end = message.data() + message.size();
  const auto percent = std::from_chars(message.data() + kPrefix.size(), end, report.percent_x100);
  if (percent.ec != std::errc{} || percent.ptr == end || *percent.ptr != ':') return std::nullopt;
  const auto block = std::from_chars(percent.ptr + 1, end, report.block);
  if (block.ec != std::errc{} || block.ptr != end) return std::nullopt;
  return report;
}

/// Text from a device as people may see it.
std::string Printable(std::string_view text) {
  constexpr std::size_t kMost = 60;
  std::string shown(text.substr(0, kMost));
  for (char& c : shown) {
    if (c < ' ' || c > '~') c = '?';
  }
  return shown;
}

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
  Announce(now);
  Tell(MulticastEventKind::kAnnounced, nullptr, "", now);
}

void MulticastSession::Announce(Micros now) {
  const MulticastFile& file = *plan_.file;
  mcftp::Announcement announcement;
  announcement.last_file = plan_.last_file;
  announcement.block_size = plan_.blocks.block_size;
  announcement.file_size = file.content->size();
  announcement.oack_wait_ms = std::max(Milliseconds(options_.oack_wait), 1U);
  announcement.attributes = file.attributes;
  announcement.transfer_id = plan_.transfer_id;
  file.time_stamp.copy(announcement.time_stamp, mcftp::kTimeStampWidth);
  announcement.server_port = plan_.own.port;
  announcement.server_address = plan_.own.address;
  announcement.step_percent = options_.step_percent;
  announcement.step_kib = options_.step_kib;
  announcement.file_name = file.device_path;
  announcement.masks = file.masks;
  outbox_.Announce(options_.public_group, announcement);
  ++figures_.announcements;
  last_copy_ = now;
  copy_at_ = now + options_.announce_interval;
}

bool MulticastSession::AnnouncedEnough(Micros now) const {
  const StartPolicy& start = plan_.start;
  const std::size_t asked = devices_.size();
  const bool copy_is_old = now >= copy_at_;
  const bool minimal = figures_.announcements >= options_.announce_min && copy_is_old;
  if (start_now_) return now >= AnsweredAt();
  if (block_count() == 0) return minimal;
  if (start.longest_wait.count() > 0) {
    if (now >= figures_.began + start.longest_wait) return true;
  } else if (figures_.announcements >= options_.announce_max && copy_is_old) {
    return true;
  }
  if (asked == 0 || asked < start.minimum) return false;
  if (start.expected > 0 && asked >= start.expected) return now >= AnsweredAt();
  const bool quiet = last_join_ <= last_copy_;
  return (start.expected == 0 || plan_.begins_when_quiet) && minimal && quiet;
}

/// When every device that has asked must have its answer: who has not asks again. The first blocks
/// would go past it. A single device says so itself when it is made master.
Micros MulticastSession::AnsweredAt() const {
  if (devices_.size() <= 1) return last_join_;
  return last_request_ + options_.oack_wait + options_.oack_wait / 8;
}

std::optional<Micros> MulticastSession::AnnouncingEnds() const {
  Micros ends = copy_at_;
  if (plan_.start.longest_wait.count() > 0) {
    ends = std::min(ends, figures_.began + plan_.start.longest_wait);
  }
  const std::size_t enough = std::max(plan_.start.expected, plan_.start.minimum);
  const bool all_here = plan_.start.expected > 0 && devices_.size() >= enough;
  if (start_now_ || (block_count() > 0 && all_here)) {
    ends = std::min(ends, AnsweredAt());
  }
  return ends;
}

void MulticastSession::StartNow(Micros now) {
  if (figures_.phase != FilePhase::kAnnounced || devices_.empty()) return;
  start_now_ = true;
  if (AnnouncedEnough(now)) BeginTransfer(now);
}

void MulticastSession::OnRate(Micros now) {
  if (transfer_ != nullptr) transfer_->OnRate(now);
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

void MulticastSession::Resume(const FileMemory& memory, Micros now) {
  keepalive_at_ = now + kKeepAliveSweep;
  figures_.began = now;
  for (const DeviceMemory& known : memory.devices) {
    if (Find(known.peer) != nullptr) continue;
    Device& device = AddDevice(known.peer, Micros(0));
    device.figures.state = known.state;
    device.figures.late = memory.phase != FilePhase::kAnnounced;
    device.recalled = true;
    // While a file is being closed nobody lacks anything else, and nobody may be asked to name it.
    device.whole = known.whole || memory.phase == FilePhase::kClosing;
  }
  first_unsent_ = std::min(memory.first_unsent, block_count() + 1);
  std::fill_n(sent_.begin(), first_unsent_, true);
  sent_[block_count()] = memory.last_sent;
  highest_sent_ = memory.last_sent ? block_count() : first_unsent_ - 1;
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

void MulticastSession::Remember(FileMemory& memory) const {
  memory.transfer_id = plan_.transfer_id;
  memory.phase = figures_.phase;
  memory.first_unsent = first_unsent_;
  memory.last_sent = sent_[block_count()] && block_count() > 0;
  for (const Device& device : devices_) {
    memory.devices.push_back({device.figures.peer, device.figures.state, device.whole});
  }
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
      if (AnnouncedEnough(now)) {
        BeginTransfer(now);
      } else if (now >= copy_at_) {
        Announce(now);
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
    case FilePhase::kAnnounced: return Earlier(AnnouncingEnds(), keepalive_at_);
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

// ---- what devices say ----

bool MulticastSession::OnFrame(const Peer& from, const mcftp::Header& header,
                               const std::uint8_t* frame, std::size_t length, Micros now) {
  if (header.Is(mcftp::Opcode::kReadRequest)) {
    mcftp::ReadRequest request;
    if (!mcftp::DecodeReadRequest(frame, length, request)) return false;
    return OnRequest(from, request, now);
  }
  mcftp::AckFrame ack;
  mcftp::NakFrame nak;
  mcftp::ErrorFrame error;
  const bool is_ack = header.Is(mcftp::Opcode::kAck) && mcftp::DecodeAck(frame, length, ack) &&
                      ack.block <= block_count();
  const bool is_nak = header.Is(mcftp::Opcode::kNak) && mcftp::DecodeNak(frame, length, nak) &&
                      nak.block >= 1 && nak.block <= block_count();
  const bool is_error =
      header.Is(mcftp::Opcode::kError) && mcftp::DecodeError(frame, length, error);
  if (!is_ack && !is_nak && !is_error) return false;
  Device* device = Find(from);
  if (device == nullptr) {
    ++run_.strangers;
    return true;
  }
  if (is_ack) OnAck(*device, ack, now);
  if (is_nak) OnNak(*device, nak.block, now);
  if (is_error) OnError(*device, error, now);
  device->figures.round_trip = device->round_trip.smoothed();
  device->figures.first_gap = device->position;
  CheckProgress(now);
  return true;
}

void MulticastSession::Heard(Device& device, std::string what, Micros now) {
  device.heard_at = now;
  device.figures.last_heard = std::move(what);
  device.figures.last_heard_at = now;
}

bool MulticastSession::OnRequest(const Peer& from, const mcftp::ReadRequest& request, Micros now) {
  Device* known = Find(from);
  if (request.transfer_id != plan_.transfer_id) {
    // A late copy of a request for another file must not end this one on a device.
    if (known == nullptr || known->settled()) TurnAway(from, now);
    return true;
  }
  if (request.file_name != plan_.file->device_path) return false;
  if (known != nullptr) {
    OnRequestOfKnown(*known, now);
  } else if (!takes_devices(now)) {
    TurnAway(from, now);
  } else if (devices_.size() >= options_.max_devices) {
    ++run_.turned_away;
  } else {
    Join(from, now);
  }
  return true;
}

bool MulticastSession::takes_devices(Micros now) const {
  if (figures_.phase == FilePhase::kAnnounced) return true;
  return transfer_ != nullptr && transfer_->takes_devices(now);
}

/// So many of these answers in a second at most: anybody can ask for them in anybody's name.
void MulticastSession::TurnAway(const Peer& from, Micros now) {
  constexpr std::uint32_t kMostPerSecond = 100;
  if (now - turning_since_ >= std::chrono::seconds(1)) {
    turning_since_ = now;
    turned_away_ = 0;
  }
  if (++turned_away_ <= kMostPerSecond) outbox_.SendError(from, kUnknownTransfer);
}

void MulticastSession::OnRequestOfKnown(Device& device, Micros now) {
  ++device.figures.requests;
  if (device.figures.requests == 2) last_request_ = now;
  Heard(device, "RRQ", now);
  const DeviceState state = device.figures.state;
  const bool empty_file = block_count() == 0;
  if (state == DeviceState::kReleased || (state != DeviceState::kJoined && !takes_devices(now))) {
    if (empty_file) return;
    if (state == DeviceState::kProven) device.figures.reason = "has asked for the file again";
    TurnAway(device.figures.peer, now);
  } else if (takes_devices(now)) {
    if (!empty_file) Rejoin(device, now);
  } else {
    GiveRole(device, device.role, now);
    if (transfer_ != nullptr) transfer_->OnJoin(device, now);
  }
}

Device& MulticastSession::AddDevice(const Peer& peer, Micros now) {
  DeviceFigures& figures = figures_.devices.emplace_back();
  figures.peer = peer;
  Device& device = devices_.emplace_back(figures);
  device.joined_at = now;
  device.first_joined_at = now;
  table_[peer] = &device;
  return device;
}

void MulticastSession::Join(const Peer& from, Micros now) {
  Device& device = AddDevice(from, now);
  device.figures.late = transfer_ != nullptr;
  device.figures.requests = 1;
  last_join_ = now;
  last_request_ = now;
  ++changes_;
  Heard(device, "RRQ", now);
  Tell(MulticastEventKind::kJoined, &device, "", now);
  if (block_count() == 0) {
    Settle(device, DeviceState::kProven, "", now);  // it has the file with its request
  } else {
    GiveRole(device, Role::kPassive, now);
    if (transfer_ != nullptr) transfer_->OnJoin(device, now);
  }
  if (figures_.phase == FilePhase::kAnnounced && AnnouncedEnough(now)) BeginTransfer(now);
}

/// It has not heard the answer, or begins again.
void MulticastSession::Rejoin(Device& device, Micros now) {
  const bool was_given_up = device.settled();
  device.figures.state = DeviceState::kJoined;
  device.figures.reason.clear();
  device.figures.late = transfer_ != nullptr;
  device.joined_at = now;
  device.position = 0;
  device.named_at = Micros(0);
  device.whole = false;
  device.ahead = 0;
  device.run = 0;
  if (was_given_up) ++changes_;
  GiveRole(device, was_given_up ? Role::kPassive : device.role, now);
  if (transfer_ != nullptr) transfer_->OnJoin(device, now);
}

/// A role can get lost: who answers blocks though it should not is told once more. What it says may
/// have been on its way when it was told.
void MulticastSession::Quiet(Device& device, Micros now) {
  if (device.settled() || device.role != Role::kPassive) return;
  if (now - device.spoken_to_at >= options_.ack_wait_min) GiveRole(device, Role::kPassive, now);
}

void MulticastSession::OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) {
  ++figures_.acks;
  ++device.figures.acks;
  Heard(device, "ACK " + std::to_string(ack.block), now);
  Quiet(device, now);
  if (transfer_ == nullptr || device.settled()) return;
  transfer_->OnAck(device, ack, now);
}

void MulticastSession::OnNak(Device& device, std::uint16_t block, Micros now) {
  ++figures_.naks;
  ++device.figures.naks;
  Heard(device, "NAK " + std::to_string(block), now);
  Quiet(device, now);
  if (transfer_ == nullptr || device.settled()) return;
  transfer_->OnNak(device, block, now);
}

void MulticastSession::OnError(Device& device, const mcftp::ErrorFrame& error, Micros now) {
  ++figures_.errors;
  const std::string words = Printable(error.message);
  Heard(device, "ERROR " + std::to_string(error.code) + " " + words, now);
  if (transfer_ == nullptr || device.settled()) return;
  if (error.code == kDiskFull) {
    Settle(device, DeviceState::kDead, "could not write a block: " + words, now);
    transfer_->OnGivenUp(device, now);
  } else if (error.code == mcftp::kOverrunCode) {
    const auto report = ParseOverrun(error.message);
    if (!report || report->block == 0 || report->block > highest_sent_ ||
        report->percent_x100 > kWholePercent) {
      return;
    }
    ++device.figures.overruns;
    Tell(MulticastEventKind::kOverrun, &device, words, now);
    transfer_->OnOverrun(device, report->percent_x100, report->block, now);
  }
}

// ---- what the transfer decides ----

void MulticastSession::GiveRole(Device& device, Role role, Micros now) {
  device.role = role;
  device.figures.role = static_cast<std::uint8_t>(role);
  device.spoken_to_at = now;
  outbox_.GiveRole(device.figures.peer, role, private_group());
}

void MulticastSession::SetProven(Device& device, Micros now) {
  device.position = block_count() + 1;
  Settle(device, DeviceState::kProven, "", now);
}

void MulticastSession::SetDead(Device& device, const std::string& why, Micros now) {
  if (device.role != Role::kPassive) GiveRole(device, Role::kPassive, now);
  Settle(device, DeviceState::kDead, why, now);
}

void MulticastSession::SetReleased(Device& device, const std::string& why, Micros now) {
  GiveRole(device, Role::kPassive, now);
  Settle(device, DeviceState::kReleased, why, now);
}

void MulticastSession::Settle(Device& device, DeviceState state, const std::string& why,
                              Micros now) {
  device.figures.state = state;
  device.figures.reason = why;
  device.figures.first_gap = device.position;
  ++changes_;
  const MulticastEventKind kind = state == DeviceState::kProven ? MulticastEventKind::kProven
                                  : state == DeviceState::kDead ? MulticastEventKind::kDead
                                                                : MulticastEventKind::kReleased;
  Tell(kind, &device, why, now);
}

void MulticastSession::SetPhase(FilePhase phase, Micros now) {
  figures_.phase = phase;
  ++changes_;
  if (phase == FilePhase::kRepairing) Tell(MulticastEventKind::kRepairing, nullptr, "", now);
}

void MulticastSession::TellMaster(const Device& device, Micros now) {
  Tell(MulticastEventKind::kMaster, &device, "", now);
}

void MulticastSession::Tell(MulticastEventKind kind, const Device* device, std::string detail,
                            Micros now) {
  if (!listener_) return;
  MulticastEvent event;
  event.kind = kind;
  event.when = now;
  event.file = &figures_;
  event.device = device == nullptr ? nullptr : &device->figures;
  event.detail = std::move(detail);
  listener_(event);
}

}  // namespace server
