#include "tools/multicast_watch.h"

#include <algorithm>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"

namespace tools {
namespace {

constexpr std::size_t kParts = 16;
constexpr std::size_t kMostEvents = 10000;

/// One character for the blocks of [from, to).
char PartOf(const std::vector<bool>& has, std::size_t from, std::size_t to) {
  const auto at = [&has](std::size_t i) { return has.begin() + static_cast<std::ptrdiff_t>(i); };
  const auto held = static_cast<std::size_t>(std::count(at(from), at(to), true));
  if (held == to - from) return '#';
  if (held == 0) return '.';
  return 2 * held < to - from ? '-' : '+';
}

std::string MapOf(const std::vector<bool>& has) {
  const std::size_t parts = std::min(kParts, has.size());
  std::string map;
  for (std::size_t i = 0; i < parts; ++i) {
    map += PartOf(has, i * has.size() / parts, (i + 1) * has.size() / parts);
  }
  return map;
}

}  // namespace

MulticastWatch::MulticastWatch() : cipher_(mcftp::FixedKey().bytes, mcftp::FixedKey::kLength) {}

void MulticastWatch::See(const sim::SeenDatagram& datagram) {
  const std::lock_guard<std::mutex> hold(mutex_);
  frame_.assign(datagram.bytes.begin(), datagram.bytes.end());
  mcftp::Header header;
  if (!mcftp::DecodeHeader(frame_.data(), frame_.size(), header) ||
      !mcftp::OpenFrame(cipher_, frame_.data(), frame_.size())) {
    return;
  }
  if (datagram.sent) {
    Sent(header);
  } else {
    Received(header);
  }
}

void MulticastWatch::Sent(const mcftp::Header& header) {
  mcftp::AckFrame ack;
  mcftp::NakFrame nak;
  mcftp::ErrorFrame error;
  if (header.Is(mcftp::Opcode::kReadRequest)) {
    OnRequest();
  } else if (header.Is(mcftp::Opcode::kAck) &&
             mcftp::DecodeAck(frame_.data(), frame_.size(), ack)) {
    OnWhole(ack.block);
  } else if (header.Is(mcftp::Opcode::kNak) &&
             mcftp::DecodeNak(frame_.data(), frame_.size(), nak)) {
    OnWhole(nak.block);
  } else if (header.Is(mcftp::Opcode::kError) &&
             mcftp::DecodeError(frame_.data(), frame_.size(), error)) {
    Note(ReceptionStep::kRefused,
         "error " + std::to_string(error.code) + " " + std::string(error.message));
  }
}

void MulticastWatch::Received(const mcftp::Header& header) {
  if (header.Is(mcftp::Opcode::kAnnouncement)) OnAnnouncement();
  if (header.Is(mcftp::Opcode::kOptionAck)) OnRole(header);
  if (header.Is(mcftp::Opcode::kData)) OnBlock();
}

void MulticastWatch::OnAnnouncement() {
  mcftp::Announcement announcement;
  if (!mcftp::DecodeAnnouncement(frame_.data(), frame_.size(), announcement)) return;
  if (announcement.file_name == offered_.file) return;
  offered_ = {};
  offered_.file = announcement.file_name;
  offered_.masks = announcement.masks;
  offered_.size = announcement.file_size;
  offered_.blocks = announcement.BlockCount();
  offered_block_size_ = announcement.block_size;
  if (events_.size() < kMostEvents) events_.push_back({ReceptionStep::kAnnounced, offered_, {}});
}

void MulticastWatch::OnRequest() {
  mcftp::ReadRequest request;
  if (!mcftp::DecodeReadRequest(frame_.data(), frame_.size(), request)) return;
  if (request.file_name != offered_.file) return;
  if (state_.under_way && request.file_name == state_.file) return;  // asked again
  const mcftp::Role role = state_.role;                              // it lasts from file to file
  state_ = offered_;
  state_.role = role;
  block_size_ = offered_block_size_;
  has_.assign(state_.blocks, false);
  state_.under_way = true;
  Note(ReceptionStep::kRequested);
}

void MulticastWatch::OnRole(const mcftp::Header& header) {
  mcftp::OptionAck oack;
  if (!mcftp::DecodeOptionAck(frame_.data(), frame_.size(), oack)) return;
  const auto role = mcftp::RoleOf(header);
  if (!role || *role == state_.role) return;
  state_.role = *role;
  Note(ReceptionStep::kRole);
}

void MulticastWatch::OnBlock() {
  mcftp::DataFrame data;
  if (!state_.under_way || !mcftp::DecodeData(frame_.data(), frame_.size(), data)) return;
  if (!mcftp::FitsSession(data, block_size_, state_.blocks)) return;
  const std::size_t block = data.block - std::size_t{1};
  if (has_[block]) {
    ++state_.twice;
  } else {
    has_[block] = true;
    ++state_.held;
  }
}

/// An answer that names the last block says that the file is complete.
void MulticastWatch::OnWhole(std::uint32_t block) {
  if (!state_.under_way || block == 0 || block != state_.blocks) return;
  state_.under_way = false;
  ++totals_.files;
  totals_.blocks += state_.held;
  totals_.twice += state_.twice;
  Note(ReceptionStep::kReceived);
}

void MulticastWatch::Note(ReceptionStep step, std::string detail) {
  if (events_.size() < kMostEvents) events_.push_back({step, Now(), std::move(detail)});
}

Reception MulticastWatch::Now() const {
  Reception state = state_;
  state.map = MapOf(has_);
  return state;
}

std::vector<ReceptionEvent> MulticastWatch::TakeEvents() {
  const std::lock_guard<std::mutex> hold(mutex_);
  return std::exchange(events_, {});
}

Reception MulticastWatch::reception() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return Now();
}

ReceptionTotals MulticastWatch::totals() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return totals_;
}

// ---- for people and scripts ----

const char* NameOf(mcftp::Role role) {
  switch (role) {
    case mcftp::Role::kPassive: return "passive";
    case mcftp::Role::kAckMaster: return "ack master";
    case mcftp::Role::kNakMaster: return "nak master";
  }
  return "";
}

const char* NameOf(ReceptionStep step) {
  switch (step) {
    case ReceptionStep::kAnnounced: return "announced";
    case ReceptionStep::kRequested: return "requested";
    case ReceptionStep::kRole: return "role";
    case ReceptionStep::kReceived: return "received";
    case ReceptionStep::kRefused: return "refused";
  }
  return "";
}

nlohmann::ordered_json ToJson(const ReceptionEvent& event) {
  const Reception& state = event.reception;
  nlohmann::ordered_json json{
      {"event", "multicast"}, {"step", NameOf(event.step)}, {"file", state.file}};
  if (event.step == ReceptionStep::kAnnounced) {
    json["masks"] = state.masks;
    json["size"] = state.size;
    json["blocks"] = state.blocks;
    return json;
  }
  json["role"] = NameOf(state.role);
  json["held"] = state.held;
  json["blocks"] = state.blocks;
  json["twice"] = state.twice;
  json["map"] = state.map;
  if (!event.detail.empty()) json["detail"] = event.detail;
  return json;
}

std::string ToLine(const ReceptionEvent& event) {
  const Reception& state = event.reception;
  const std::string head = "multicast: ";
  switch (event.step) {
    case ReceptionStep::kAnnounced:
      return head + state.file + " is announced for " +
             (state.masks.empty() ? "all devices" : state.masks) + ", " +
             std::to_string(state.blocks) + " blocks";
    case ReceptionStep::kRequested: return head + "asked for " + state.file;
    case ReceptionStep::kRole: return head + "now " + FormatBlocks(state);
    case ReceptionStep::kReceived:
      return head + "received " + state.file + " as " + FormatBlocks(state) + ", " +
             std::to_string(state.twice) + " twice";
    case ReceptionStep::kRefused: return head + "reported " + event.detail;
  }
  return head;
}

std::string FormatBlocks(const Reception& state) {
  return std::string(NameOf(state.role)) + " [" + state.map + "] " + std::to_string(state.held) +
         "/" + std::to_string(state.blocks);
}

}  // namespace tools
