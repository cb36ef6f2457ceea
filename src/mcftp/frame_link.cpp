#include "mcftp/frame_link.h"

#include "device/deadline.h"
#include "mcftp/cipher/frame_cipher.h"

namespace mcftp {
namespace {

/// Reads the record that the header's opcode names. Frames that only servers receive have none, and
/// may be of any length.
/// @return false for a frame that is to be dropped.
bool DecodeBody(const Datagram& datagram, Frame& frame) noexcept {
  if (frame.header.Is(Opcode::kAnnouncement)) {
    return DecodeAnnouncement(datagram.bytes, datagram.length, frame.announcement);
  }
  if (frame.header.Is(Opcode::kData)) {
    return DecodeData(datagram.bytes, datagram.length, frame.data);
  }
  if (frame.header.Is(Opcode::kOptionAck)) {
    return DecodeOptionAck(datagram.bytes, datagram.length, frame.oack);
  }
  return !frame.header.Is(Opcode::kError) ||
         DecodeError(datagram.bytes, datagram.length, frame.error);
}

}  // namespace

// ---- set-up ----

bool FrameLink::MakeCipher() noexcept {
  cipher_.Reset(new KeyedCipher);
  return static_cast<bool>(cipher_);
}

bool FrameLink::JoinPublicGroup(const char* group) noexcept {
  if (!public_.JoinGroup(group)) return false;
  public_group_ = ParseAddress(group);
  return true;
}

void FrameLink::Close() noexcept {
  private_.Close();
  public_.Close();
  private_joined_ = false;
}

// ---- private group ----

bool FrameLink::JoinPrivateGroup(std::uint32_t address, std::uint16_t port) noexcept {
  const std::uint32_t group = htonl(address);
  if (private_joined_ && group == private_group_ && port == private_port_) return true;
  LeavePrivateGroup();
  private_group_ = group;
  private_port_ = port;
  private_is_public_ = port == public_.port() && group == public_group_;
  if (private_is_public_) {
    private_joined_ = true;  // a member already, and for good
  } else if (port != public_.port()) {
    private_joined_ = JoinOnOwnSocket();
  } else {
    private_joined_ = public_.JoinGroup(private_group_text().c_str());
  }
  return private_joined_;
}

bool FrameLink::JoinOnOwnSocket() noexcept {
  const bool joined = private_port_ != 0 && private_.Create() && private_.AllowAddressReuse() &&
                      private_.Bind(private_port_) &&
                      private_.JoinGroup(private_group_text().c_str());
  if (!joined) private_.Close();
  return joined;
}

AddressText FrameLink::private_group_text() const noexcept {
  return ToText(private_group_);
}

void FrameLink::LeavePrivateGroup() noexcept {
  const bool drops = private_joined_ && !private_is_public_;
  if (drops) (private_.is_open() ? private_ : public_).LeaveGroup();
  private_.Close();
  private_joined_ = false;
}

// ---- sending ----

bool FrameLink::Send(std::size_t length) noexcept {
  sent_length_ = length;
  if (enciphering_) sent_length_ = SealFrame(cipher_->cipher(), send_buffer_, length, kSendBuffer);
  return SendBuffer();
}

bool FrameLink::Resend() noexcept {
  SetResendFlag(send_buffer_);
  return SendBuffer();
}

bool FrameLink::SendBuffer() noexcept {
  return sent_length_ != 0 &&
         public_.SendTo(server_, send_buffer_, static_cast<std::uint16_t>(sent_length_));
}

// ---- receiving ----

bool FrameLink::Receive(std::uint32_t timeout_ms, const FileInHand& file, Frame& frame) noexcept {
  device::Deadline deadline(timeout_ms);
  while (true) {
    const Datagram datagram = network_.Receive(public_, &private_, deadline);
    if (!datagram) return false;
    if (Take(datagram, file, frame)) return true;
  }
}

/// KEPT ODDITY: a frame that is dropped further down has already decided whether the next one goes
/// out enciphered.
bool FrameLink::Take(const Datagram& datagram, const FileInHand& file, Frame& frame) noexcept {
  if (!DecodeHeader(datagram.bytes, datagram.length, frame.header)) return false;
  enciphering_ = frame.header.encrypted;
  if (!OpenFrame(cipher_->cipher(), datagram.bytes, datagram.length)) return false;
  return DecodeBody(datagram, frame) && IsForUs(datagram, file, frame);
}

bool FrameLink::IsForUs(const Datagram& datagram, const FileInHand& file,
                        const Frame& frame) noexcept {
  if (frame.header.Is(Opcode::kData)) {
    return datagram.sender.sin_addr.s_addr == server_.address().sin_addr.s_addr &&
           FitsSession(frame.data, file.block_size, file.block_count);
  }
  const bool repeated = frame.header.Is(Opcode::kAnnouncement) && !file.name.empty() &&
                        frame.announcement.file_name == file.name;
  if (repeated) return false;
  server_.SetAddress(datagram.sender);
  return true;
}

}  // namespace mcftp
