#include "mcftp/wire/frames.h"

#include "base/byte_reader.h"
#include "base/byte_writer.h"
#include "base/text.h"

namespace mcftp {
namespace {

bool IsFileName(std::string_view name) noexcept {
  return !name.empty() && name.size() <= kMaxFileName;
}

bool HasZero(std::string_view text) noexcept {
  return text.find('\0') != std::string_view::npos;
}

/// What both ends ask of an announcement.
bool CanBeReceived(const Announcement& announcement) noexcept {
  return announcement.block_size != 0 && announcement.BlockCount() <= kMaxBlocks &&
         IsFileName(announcement.file_name);
}

Header HeaderOf(Opcode opcode) noexcept {
  Header header;
  header.opcode = static_cast<std::uint8_t>(opcode);
  return header;
}

Header HeaderOf(Opcode opcode, bool last_file) noexcept {
  Header header = HeaderOf(opcode);
  header.last_file = last_file;
  return header;
}

/// The six bytes that most frames begin with.
void WriteHead(base::ByteWriter& out, const Header& header, std::uint16_t second,
               std::uint16_t third) noexcept {
  out.U16(PackHeader(header));
  out.U16(second);
  out.U16(third);
}

std::size_t EncodeHead(const Header& header, std::uint16_t third, std::uint8_t* to,
                       std::size_t capacity) noexcept {
  base::ByteWriter out(to, capacity);
  WriteHead(out, header, 0, third);
  return out.length();
}

}  // namespace

bool DecodeHeader(const std::uint8_t* frame, std::size_t length, Header& header) noexcept {
  base::ByteReader in(frame, length);
  header = UnpackHeader(in.U16());
  return in.ok() && header.reserved == 0;
}

std::size_t MinimumLength(std::uint8_t opcode) noexcept {
  switch (static_cast<Opcode>(opcode)) {
    case Opcode::kReadRequest: return kFileNameOffset + 1;
    case Opcode::kAnnouncement: return kFileNameOffset + 2;
    case Opcode::kData: return kDataOffset;
    case Opcode::kAck: return kAckLength;
    case Opcode::kNak: return kNakLength;
    case Opcode::kError: return kErrorMessageOffset;
    case Opcode::kOptionAck: return kOptionAckLength;
  }
  return kHeaderLength;
}

bool DecodeAnnouncement(const std::uint8_t* frame, std::size_t length,
                        Announcement& announcement) noexcept {
  base::ByteReader in(frame, length);
  announcement.last_file = UnpackHeader(in.U16()).last_file;                // offset  0
  announcement.reserved_word = in.U16();                                    // offset  2
  announcement.block_size = in.U16();                                       // offset  4
  announcement.file_size = in.U32();                                        // offset  6
  announcement.oack_wait_ms = in.U32();                                     // offset 10
  announcement.attributes = in.U32();                                       // offset 14
  announcement.transfer_id = in.U32();                                      // offset 18
  base::CopyText(announcement.time_stamp, in.PaddedText(kTimeStampWidth));  // offset 22
  announcement.server_port = in.U16();                                      // offset 42
  announcement.server_address = in.U32();                                   // offset 44
  announcement.step_percent = in.U8();                                      // offset 48
  announcement.step_kib = in.U16();                                         // offset 49
  announcement.file_name = in.Text();                                       // offset 51
  announcement.masks = in.Text();
  return in.ok() && CanBeReceived(announcement);
}

bool DecodeReadRequest(const std::uint8_t* frame, std::size_t length,
                       ReadRequest& request) noexcept {
  base::ByteReader in(frame, length);
  request.last_file = UnpackHeader(in.U16()).last_file;
  in.Skip(kTransferIdOffset - kHeaderLength);
  request.transfer_id = in.U32();
  in.Skip(kFileNameOffset - kTransferIdOffset - 4);
  request.file_name = in.Text();
  return in.ok() && IsFileName(request.file_name);
}

bool DecodeData(const std::uint8_t* frame, std::size_t length, DataFrame& data) noexcept {
  base::ByteReader in(frame, length);
  in.Skip(kHeaderLength);
  data.length = in.U16();
  data.block = in.U16();
  data.data = in.Bytes(data.length);
  return in.ok();
}

bool DecodeAck(const std::uint8_t* frame, std::size_t length, AckFrame& ack) noexcept {
  base::ByteReader in(frame, length);
  ack.duplicate = UnpackHeader(in.U16()).duplicate;
  in.Skip(2);
  ack.block = in.U16();
  return in.ok();
}

bool DecodeNak(const std::uint8_t* frame, std::size_t length, NakFrame& nak) noexcept {
  base::ByteReader in(frame, length);
  in.Skip(4);
  nak.block = in.U16();
  return in.ok();
}

bool DecodeError(const std::uint8_t* frame, std::size_t length, ErrorFrame& error) noexcept {
  base::ByteReader in(frame, length);
  in.Skip(4);
  error.code = in.U16();
  error.message = in.RestAsText();
  return in.ok();
}

bool DecodeOptionAck(const std::uint8_t* frame, std::size_t length, OptionAck& oack) noexcept {
  base::ByteReader in(frame, length);
  oack.role = RoleOf(UnpackHeader(in.U16()));
  in.Skip(2);
  oack.port = in.U16();
  oack.address = in.U32();
  return in.ok();
}

std::size_t EncodeAnnouncement(const Announcement& announcement, std::uint8_t* out,
                               std::size_t capacity) noexcept {
  if (!CanBeReceived(announcement) || HasZero(announcement.file_name) ||
      HasZero(announcement.masks)) {
    return 0;
  }
  base::ByteWriter to(out, capacity < kMaxFrame ? capacity : kMaxFrame);
  to.U16(PackHeader(HeaderOf(Opcode::kAnnouncement, announcement.last_file)));
  to.U16(announcement.reserved_word);
  to.U16(announcement.block_size);
  to.U32(announcement.file_size);
  to.U32(announcement.oack_wait_ms);
  to.U32(announcement.attributes);
  to.U32(announcement.transfer_id);
  to.PaddedText(base::FieldView(announcement.time_stamp), kTimeStampWidth);
  to.U16(announcement.server_port);
  to.U32(announcement.server_address);
  to.U8(announcement.step_percent);
  to.U16(announcement.step_kib);
  to.Text(announcement.file_name);
  to.Text(announcement.masks);
  return to.length();
}

std::size_t EncodeReadRequest(const ReadRequest& request, std::uint8_t* out,
                              std::size_t capacity) noexcept {
  if (!IsFileName(request.file_name) || HasZero(request.file_name)) return 0;
  base::ByteWriter to(out, capacity);
  to.U16(PackHeader(HeaderOf(Opcode::kReadRequest, request.last_file)));
  to.Zeros(kTransferIdOffset - kHeaderLength);
  to.U32(request.transfer_id);
  to.Zeros(kFileNameOffset - kTransferIdOffset - 4);
  to.Text(request.file_name);
  return to.length();
}

std::size_t EncodeData(const DataFrame& data, std::uint8_t* out, std::size_t capacity) noexcept {
  base::ByteWriter to(out, capacity < kMaxFrame ? capacity : kMaxFrame);
  WriteHead(to, HeaderOf(Opcode::kData), data.length, data.block);
  to.Bytes(data.data, data.length);
  return to.length();
}

std::size_t EncodeAck(const AckFrame& ack, std::uint8_t* out, std::size_t capacity) noexcept {
  Header header = HeaderOf(Opcode::kAck);
  header.duplicate = ack.duplicate;
  return EncodeHead(header, ack.block, out, capacity);
}

std::size_t EncodeNak(const NakFrame& nak, std::uint8_t* out, std::size_t capacity) noexcept {
  return EncodeHead(HeaderOf(Opcode::kNak), nak.block, out, capacity);
}

std::size_t EncodeError(const ErrorFrame& error, std::uint8_t* out, std::size_t capacity) noexcept {
  base::ByteWriter to(out, capacity < kMaxFrame ? capacity : kMaxFrame);
  WriteHead(to, HeaderOf(Opcode::kError), 0, error.code);
  to.Text(base::Part(error.message, 0, error.message.find('\0')));
  return to.length();
}

std::size_t EncodeOptionAck(const OptionAck& oack, std::uint8_t* out,
                            std::size_t capacity) noexcept {
  Header header = HeaderOf(Opcode::kOptionAck);
  header.role_bits = oack.role ? static_cast<std::uint8_t>(*oack.role) : 3;
  base::ByteWriter to(out, capacity);
  WriteHead(to, header, 0, oack.port);
  to.U32(oack.address);
  return to.length();
}

void SetEncryptedFlag(std::uint8_t* frame, bool encrypted) noexcept {
  constexpr unsigned kFlag = kEncryptedBit >> 8;
  constexpr unsigned kKept = 0xFFU & ~(kFlag | kReservedBits >> 8);
  frame[0] = static_cast<std::uint8_t>((frame[0] & kKept) | (encrypted ? kFlag : 0U));
}

void SetResendFlag(std::uint8_t* frame) noexcept {
  frame[1] = static_cast<std::uint8_t>(frame[1] | kResendBit);
}

}  // namespace mcftp
