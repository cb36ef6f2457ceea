// What devices say to a session, and what its transfer makes of them.
#include <charconv>
#include <system_error>
#include <utility>

#include "server/multicast/session.h"
#include "server/request.h"

namespace server {
namespace {

using mcftp::Role;

constexpr std::uint16_t kDiskFull = 3;
constexpr std::uint16_t kUnknownTransfer = 5;
constexpr std::size_t kMostShown = 60;  ///< of a text from a device

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

}  // namespace

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
  if (device.figures.requests == 2) announcer_.OnSecondRequest(now);
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
  announcer_.OnJoin(now);
  Changed(device);
  Heard(device, "RRQ", now);
  Tell(MulticastEventKind::kJoined, &device, "", now);
  if (block_count() == 0) {
    Settle(device, DeviceState::kProven, "", now);  // it has the file with its request
  } else {
    GiveRole(device, Role::kPassive, now);
    if (transfer_ != nullptr) transfer_->OnJoin(device, now);
  }
  if (figures_.phase == FilePhase::kAnnounced) CheckAnnounced(now);
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
  if (was_given_up) Changed(device);
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
  const std::string words = Printable(error.message, kMostShown);
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
  Changed(device);
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
