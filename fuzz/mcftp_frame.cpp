// Input: one datagram, from anyone, to a client or a server of MCFTP. Checks what both rely on once
// a frame is not dropped.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <vector>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/frames.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

void Require(bool holds) {
  if (!holds) std::abort();
}

bool Same(const mcftp::Announcement& a, const mcftp::Announcement& b) {
  return a.last_file == b.last_file && a.reserved_word == b.reserved_word &&
         a.block_size == b.block_size && a.file_size == b.file_size &&
         a.oack_wait_ms == b.oack_wait_ms && a.attributes == b.attributes &&
         a.transfer_id == b.transfer_id && std::strcmp(a.time_stamp, b.time_stamp) == 0 &&
         a.server_port == b.server_port && a.server_address == b.server_address &&
         a.step_percent == b.step_percent && a.step_kib == b.step_kib &&
         a.file_name == b.file_name && a.masks == b.masks;
}
bool Same(const mcftp::ReadRequest& a, const mcftp::ReadRequest& b) {
  return a.last_file == b.last_file && a.transfer_id == b.transfer_id && a.file_name == b.file_name;
}
bool Same(const mcftp::DataFrame& a, const mcftp::DataFrame& b) {
  return a.block == b.block && a.length == b.length &&
         (a.length == 0 || std::memcmp(a.data, b.data, a.length) == 0);
}
bool Same(const mcftp::AckFrame& a, const mcftp::AckFrame& b) {
  return a.block == b.block && a.duplicate == b.duplicate;
}
bool Same(const mcftp::NakFrame& a, const mcftp::NakFrame& b) {
  return a.block == b.block;
}
bool Same(const mcftp::ErrorFrame& a, const mcftp::ErrorFrame& b) {
  return a.code == b.code && a.message == b.message;
}
bool Same(const mcftp::OptionAck& a, const mcftp::OptionAck& b) {
  return a.role == b.role && a.port == b.port && a.address == b.address;
}

void CheckInside(std::string_view text, const Bytes& frame) {
  const auto* begin = reinterpret_cast<const char*>(frame.data());
  Require(text.empty() ||
          (text.data() >= begin && text.data() + text.size() <= begin + frame.size()));
}

// What later code relies on, frame by frame.
void CheckContent(const mcftp::Announcement& announcement, const Bytes& frame) {
  CheckInside(announcement.file_name, frame);
  CheckInside(announcement.masks, frame);
  Require(!announcement.file_name.empty() && announcement.file_name.size() <= mcftp::kMaxFileName);
  const std::uint64_t blocks = announcement.BlockCount();
  Require(blocks <= mcftp::kMaxBlocks);
  const std::uint64_t room = blocks * announcement.block_size;
  Require(room >= announcement.file_size);                           // every byte has a block
  Require(room - announcement.file_size < announcement.block_size);  // none is left over
}
void CheckContent(const mcftp::ReadRequest& request, const Bytes& frame) {
  CheckInside(request.file_name, frame);
  Require(!request.file_name.empty() && request.file_name.size() <= mcftp::kMaxFileName);
}
void CheckContent(const mcftp::DataFrame& data, const Bytes& frame) {
  CheckInside({reinterpret_cast<const char*>(data.data), data.length}, frame);
}
void CheckContent(const mcftp::ErrorFrame& error, const Bytes& frame) {
  CheckInside(error.message, frame);
}
template <typename Frame>
void CheckContent(const Frame& /*frame*/, const Bytes& /*bytes*/) {}

/// A frame that is taken can be written again, means the same, and is then written the same way.
template <typename Frame>
void Check(const Bytes& bytes, std::size_t least,
           bool (*decode)(const std::uint8_t*, std::size_t, Frame&) noexcept,
           std::size_t (*encode)(const Frame&, std::uint8_t*, std::size_t) noexcept) {
  Frame frame;
  if (!decode(bytes.data(), bytes.size(), frame)) return;
  Require(bytes.size() >= least);
  CheckContent(frame, bytes);
  if (bytes.size() >= mcftp::kMaxFrame) return;  // longer than any datagram

  Bytes written(bytes.size() + 1);  // an ERROR may gain the zero that it came without
  written.resize(encode(frame, written.data(), written.size()));
  Require(!written.empty());
  Frame again;
  Require(decode(written.data(), written.size(), again));
  Require(Same(frame, again));
  Bytes twice(written.size());
  Require(encode(again, twice.data(), twice.size()) == written.size() && twice == written);
}

void CheckFrame(const Bytes& bytes) {
  mcftp::Header header;
  if (!mcftp::DecodeHeader(bytes.data(), bytes.size(), header)) return;
  const std::size_t least = mcftp::MinimumLength(header.opcode);
  switch (static_cast<mcftp::Opcode>(header.opcode)) {
    case mcftp::Opcode::kReadRequest:
      return Check(bytes, least, mcftp::DecodeReadRequest, mcftp::EncodeReadRequest);
    case mcftp::Opcode::kAnnouncement:
      return Check(bytes, least, mcftp::DecodeAnnouncement, mcftp::EncodeAnnouncement);
    case mcftp::Opcode::kData: return Check(bytes, least, mcftp::DecodeData, mcftp::EncodeData);
    case mcftp::Opcode::kAck: return Check(bytes, least, mcftp::DecodeAck, mcftp::EncodeAck);
    case mcftp::Opcode::kNak: return Check(bytes, least, mcftp::DecodeNak, mcftp::EncodeNak);
    case mcftp::Opcode::kError: return Check(bytes, least, mcftp::DecodeError, mcftp::EncodeError);
    case mcftp::Opcode::kOptionAck:
      return Check(bytes, least, mcftp::DecodeOptionAck, mcftp::EncodeOptionAck);
  }
}

/// What is sealed opens to what it was, and the other way round.
void CheckCipher(const Bytes& datagram, Bytes opened) {
  static const mcftp::FixedKey key;
  static const mcftp::Blowfish cipher(key.bytes, mcftp::FixedKey::kLength);
  if (!mcftp::OpenFrame(cipher, opened.data(), opened.size())) return;
  CheckFrame(opened);
  const bool encrypted = (datagram[0] & 0x80) != 0;
  Require(encrypted || opened == datagram);
  if (!encrypted) return;
  Require(mcftp::SealFrame(cipher, opened.data(), opened.size(), opened.size()) == opened.size());
  Require(std::equal(opened.begin() + 2, opened.end(), datagram.begin() + 2));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Bytes datagram(data, data + size);
  CheckFrame(datagram);
  CheckCipher(datagram, datagram);
  return 0;
}
