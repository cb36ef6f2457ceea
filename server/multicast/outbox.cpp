#include "server/multicast/outbox.h"

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/texts.h"

namespace server {
namespace {

/// An announcement with the longest name and the longest masks fits.
constexpr std::size_t kLongestControl = 2048;

std::unique_ptr<const mcftp::Blowfish> MakeCipher() {
  const mcftp::FixedKey key;
  return std::make_unique<const mcftp::Blowfish>(key.bytes, mcftp::FixedKey::kLength);
}

}  // namespace

Outbox::Outbox(bool encrypt)
    : cipher_(MakeCipher()),
      encrypt_(encrypt),
      data_(mcftp::kMaxFrame + mcftp::Blowfish::kBlock),
      control_(kLongestControl) {}

std::size_t Outbox::Seal(std::vector<std::uint8_t>& frame, std::size_t length) const {
  if (!encrypt_ || length == 0) return length;
  return mcftp::SealFrame(*cipher_, frame.data(), length, frame.size());
}

bool Outbox::Open(std::uint8_t* frame, std::size_t length) const {
  return mcftp::OpenFrame(*cipher_, frame, length);
}

void Outbox::Queue(const Peer& to, Kind kind, std::size_t length) {
  const std::size_t sealed = Seal(control_, length);
  if (sealed == 0 || queue_.size() >= kMaxQueued) return;
  queue_.push_back({to, kind, std::string(reinterpret_cast<const char*>(control_.data()), sealed)});
}

void Outbox::Announce(const Peer& to, const mcftp::Announcement& announcement) {
  Queue(to, Kind::kAnnouncement,
        mcftp::EncodeAnnouncement(announcement, control_.data(), control_.size()));
}

void Outbox::GiveRole(const Peer& to, mcftp::Role role, const Peer& private_group) {
  mcftp::OptionAck oack;
  oack.role = role;
  oack.port = private_group.port;
  oack.address = private_group.address;
  Queue(to, Kind::kControl, mcftp::EncodeOptionAck(oack, control_.data(), control_.size()));
}

void Outbox::SendError(const Peer& to, std::uint16_t code) {
  mcftp::ErrorFrame error;
  error.code = code;
  error.message = mcftp::ErrorText(code);
  Queue(to, Kind::kControl, mcftp::EncodeError(error, control_.data(), control_.size()));
}

const Outgoing* Outbox::Next() {
  if (queue_.empty()) return nullptr;
  kind_ = queue_.front().kind;
  handed_out_ = std::move(queue_.front().bytes);
  outgoing_ = {queue_.front().to, handed_out_};
  queue_.pop_front();
  return &outgoing_;
}

const Outgoing* Outbox::MakeData(const Peer& to, std::uint16_t block, std::uint16_t data_length) {
  mcftp::DataFrame data;
  data.length = data_length;
  data.block = block;
  data.data = data_place();
  const std::size_t length = Seal(data_, mcftp::EncodeData(data, data_.data(), mcftp::kMaxFrame));
  kind_ = Kind::kData;
  outgoing_ = {to, {reinterpret_cast<const char*>(data_.data()), length}};
  return &outgoing_;
}

}  // namespace server
