// The seven frames of MCFTP, to the byte: what the client and the server both write and read.
//
// Every frame is one UDP datagram, integers in network order. Bytes become plain records in host
// order here and nowhere else. A frame is read after it has been deciphered and written before it
// is enciphered (mcftp/cipher/frame_cipher.h does both).
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace mcftp {

enum class Opcode : std::uint8_t {
  kReadRequest = 1,
  kAnnouncement = 2,  ///< takes the place of a write request: the server offers the file
  kData = 3,
  kAck = 4,
  kNak = 5,
  kError = 6,
  kOptionAck = 7,
};

/// How a client answers the blocks of a file.
enum class Role : std::uint8_t {
  kPassive = 0,    ///< not at all
  kAckMaster = 1,  ///< each block with its number
  kNakMaster = 2,  ///< each block with the number of the first one missing
};

// The first word of every frame, as it arrives:
//
//        byte 0 (high)                        byte 1 (low)
//   7     6 5 4     3 2 1    0             7 6 5 4   3 2    1        0
//  enc   reserved   unused  duplicate      opcode    role  resend  last file
inline constexpr std::uint16_t kEncryptedBit = 0x8000;
inline constexpr std::uint16_t kReservedBits = 0x7000;
inline constexpr unsigned kReservedShift = 12;
inline constexpr std::uint16_t kDuplicateBit = 0x0100;
inline constexpr unsigned kOpcodeShift = 4;
inline constexpr unsigned kRoleShift = 2;
inline constexpr std::uint16_t kResendBit = 0x0002;
inline constexpr std::uint16_t kLastFileBit = 0x0001;

inline constexpr std::size_t kHeaderLength = 2;

// Frames of a fixed length
inline constexpr std::size_t kAckLength = 6;
inline constexpr std::size_t kNakLength = 6;
inline constexpr std::size_t kOptionAckLength = 10;

// Where the fields of the others stand
inline constexpr std::size_t kTransferIdOffset = 18;  ///< announcement and read request
inline constexpr std::size_t kTimeStampOffset = 22;   ///< announcement
inline constexpr std::size_t kTimeStampWidth = 20;
inline constexpr std::size_t kFileNameOffset = 51;     ///< announcement and read request
inline constexpr std::size_t kDataOffset = 6;          ///< DATA
inline constexpr std::size_t kErrorMessageOffset = 6;  ///< ERROR

/// Characters of the longest file name that is taken; the empty one is not.
inline constexpr std::size_t kMaxFileName = 259;
/// Blocks are numbered from 1 in 16 bits.
inline constexpr std::uint32_t kMaxBlocks = 65535;
/// Bytes of the largest UDP payload over IPv4, and so of the largest frame.
inline constexpr std::size_t kMaxFrame = 65507;
/// Room for a read request, the longest frame that a client builds apart from an ERROR's own text.
inline constexpr std::size_t kMaxReadRequest = kFileNameOffset + kMaxFileName + 1;
/// The error code with which a passive client reports that it cannot keep up; its message is its
/// own.
inline constexpr std::uint16_t kOverrunCode = 64;

/// The first word of a frame, taken apart.
struct Header {
  std::uint8_t opcode = 0;  ///< any 4-bit number, not only those of Opcode
  bool last_file = false;   ///< announcement and read request
  bool resend = false;
  std::uint8_t role_bits = 0;  ///< OACK only; 3 names no role
  bool duplicate = false;      ///< ACK only: the block had been received before
  std::uint8_t reserved = 0;   ///< 3 bits, always sent as 0
  bool encrypted = false;      ///< the bytes behind the header are enciphered

  [[nodiscard]] constexpr bool Is(Opcode wanted) const noexcept {
    return opcode == static_cast<std::uint8_t>(wanted);
  }
};

/// @param word  in host order
[[nodiscard]] constexpr Header UnpackHeader(std::uint16_t word) noexcept {
  Header header;
  header.opcode = static_cast<std::uint8_t>((word >> kOpcodeShift) & 0xF);
  header.last_file = (word & kLastFileBit) != 0;
  header.resend = (word & kResendBit) != 0;
  header.role_bits = static_cast<std::uint8_t>((word >> kRoleShift) & 0x3);
  header.duplicate = (word & kDuplicateBit) != 0;
  header.reserved = static_cast<std::uint8_t>((word & kReservedBits) >> kReservedShift);
  header.encrypted = (word & kEncryptedBit) != 0;
  return header;
}

/// The inverse, in host order; reserved and unused bits are 0 whatever `header` says.
[[nodiscard]] constexpr std::uint16_t PackHeader(const Header& header) noexcept {
  const unsigned fields = (header.opcode & 0xFU) << kOpcodeShift | (header.role_bits & 0x3U)
                                                                       << kRoleShift;
  const unsigned flags =
      (header.last_file ? kLastFileBit : 0U) | (header.resend ? kResendBit : 0U) |
      (header.duplicate ? kDuplicateBit : 0U) | (header.encrypted ? kEncryptedBit : 0U);
  return static_cast<std::uint16_t>(fields | flags);
}

static_assert(UnpackHeader(0x1040).reserved == 1, "a high byte of 0x10 is dropped, never parsed");
static_assert(UnpackHeader(0x8130).Is(Opcode::kData) && UnpackHeader(0x8130).encrypted);
static_assert(PackHeader(UnpackHeader(0x8178)) == 0x8178);
static_assert(PackHeader(UnpackHeader(0xFFFF)) == 0x81FF);

/// Reads the first word of a datagram, enciphered or not.
/// @return false when the datagram is to be dropped unread: it is shorter than the header, or a
///   reserved bit is set. `header` is then unspecified.
[[nodiscard]] bool DecodeHeader(const std::uint8_t* frame, std::size_t length,
                                Header& header) noexcept;

/// The role that an OACK gives, or nothing for bits that name none: the client then keeps its own.
[[nodiscard]] constexpr std::optional<Role> RoleOf(const Header& header) noexcept {
  if (header.role_bits > static_cast<std::uint8_t>(Role::kNakMaster)) return std::nullopt;
  return static_cast<Role>(header.role_bits);
}

/// The fixed part of a frame, in bytes. A shorter frame is dropped by those whom it is meant for; a
/// client takes frames that only servers receive at any length. A number that is no opcode has the
/// header alone.
[[nodiscard]] std::size_t MinimumLength(std::uint8_t opcode) noexcept;

/// What a server says about a file before it sends it.
struct Announcement {
  bool last_file = false;
  std::uint16_t reserved_word = 0;  ///< travels, and nobody acts on it; servers here send 0
  std::uint16_t block_size = 0;     ///< bytes; never 0 once decoded
  std::uint32_t file_size = 0;      ///< bytes
  std::uint32_t oack_wait_ms = 0;   ///< how long a client waits for an OACK; 0 is for ever
  std::uint32_t attributes = 0;     ///< FILE_ATTRIBUTE_* bits
  std::uint32_t transfer_id = 0;    ///< echoed in the read request
  char time_stamp[kTimeStampWidth + 1] = {};  ///< "2006-03-01 14:05:09", empty for none
  std::uint16_t server_port = 0;              ///< 0 here or in the address: no endpoint is named
  std::uint32_t server_address = 0;           ///< 10.0.0.2 is 0x0A000002
  std::uint8_t step_percent = 0;  ///< percentage points between reports of progress, 0 = off
  std::uint16_t step_kib = 0;     ///< KiB between reports of progress, 0 = off
  std::string_view file_name;     ///< "RAM:" in front, in any case, names the RAM store
  std::string_view masks;         ///< separated by blanks or ';'; may be empty

  /// Data blocks in the file: 10,241 bytes in blocks of 512 make 21. 0 when there is no block size.
  [[nodiscard]] constexpr std::uint32_t BlockCount() const noexcept {
    if (block_size == 0) return 0;
    return file_size / block_size + (file_size % block_size != 0 ? 1U : 0U);
  }
};

/// A client asks for the announced file.
struct ReadRequest {
  bool last_file = false;
  std::uint32_t transfer_id = 0;
  std::string_view file_name;
};

/// One block of the file.
struct DataFrame {
  std::uint16_t length = 0;            ///< bytes at `data`; 0 is valid
  std::uint16_t block = 0;             ///< from 1
  const std::uint8_t* data = nullptr;  ///< within the frame once decoded
};

struct AckFrame {
  std::uint16_t block = 0;  ///< 0 accepts the mastership
  bool duplicate = false;
};

struct NakFrame {
  std::uint16_t block = 0;  ///< the first one missing, at most the block count
};

struct ErrorFrame {
  std::uint16_t code = 0;
  std::string_view message;
};

/// The server's answer to a read request, and later its way to give a client another role.
struct OptionAck {
  std::optional<Role> role = Role::kPassive;  ///< nothing: role bits that name none
  std::uint16_t port = 0;                     ///< of the file's private group
  std::uint32_t address = 0;                  ///< of the private group; 239.1.1.2 is 0xEF010102
};

// Decoders. Each takes a whole deciphered frame whose header says this opcode, and returns false
// when the frame is to be dropped; the record is then unspecified. Texts and data point into the
// frame. Bytes behind the last field are padding of the cipher and are ignored.

/// Refused: no terminator behind the name or the masks, a name of 0 or more than kMaxFileName
/// characters, block size 0, more than kMaxBlocks blocks (such a file could never be completed).
[[nodiscard]] bool DecodeAnnouncement(const std::uint8_t* frame, std::size_t length,
                                      Announcement& announcement) noexcept;
/// Refused: names as above.
[[nodiscard]] bool DecodeReadRequest(const std::uint8_t* frame, std::size_t length,
                                     ReadRequest& request) noexcept;
/// Refused: more data claimed than present. FitsSession says whether the block belongs to the file.
[[nodiscard]] bool DecodeData(const std::uint8_t* frame, std::size_t length,
                              DataFrame& data) noexcept;
[[nodiscard]] bool DecodeAck(const std::uint8_t* frame, std::size_t length, AckFrame& ack) noexcept;
[[nodiscard]] bool DecodeNak(const std::uint8_t* frame, std::size_t length, NakFrame& nak) noexcept;
/// A message without a terminator ends with the frame.
[[nodiscard]] bool DecodeError(const std::uint8_t* frame, std::size_t length,
                               ErrorFrame& error) noexcept;
[[nodiscard]] bool DecodeOptionAck(const std::uint8_t* frame, std::size_t length,
                                   OptionAck& oack) noexcept;

/// Whether a block can belong to a file of `block_count` blocks of `block_size` bytes. One that
/// does not is dropped before bitmap and file are touched.
[[nodiscard]] constexpr bool FitsSession(const DataFrame& data, std::uint16_t block_size,
                                         std::uint32_t block_count) noexcept {
  return data.block != 0 && data.block <= block_count && data.length <= block_size;
}

// Encoders. Each writes a whole frame in the clear and returns its length; 0, with nothing that
// matters written, when it does not fit `capacity` or no decoder would take it.

std::size_t EncodeAnnouncement(const Announcement& announcement, std::uint8_t* out,
                               std::size_t capacity) noexcept;
std::size_t EncodeReadRequest(const ReadRequest& request, std::uint8_t* out,
                              std::size_t capacity) noexcept;
/// `data.data` may stand at its place in `out` already (out + kDataOffset).
std::size_t EncodeData(const DataFrame& data, std::uint8_t* out, std::size_t capacity) noexcept;
std::size_t EncodeAck(const AckFrame& ack, std::uint8_t* out, std::size_t capacity) noexcept;
std::size_t EncodeNak(const NakFrame& nak, std::uint8_t* out, std::size_t capacity) noexcept;
/// A message with a zero inside ends there.
std::size_t EncodeError(const ErrorFrame& error, std::uint8_t* out, std::size_t capacity) noexcept;
std::size_t EncodeOptionAck(const OptionAck& oack, std::uint8_t* out,
                            std::size_t capacity) noexcept;

/// Sets or clears the encrypted flag of a frame in wire form, and clears the reserved bits.
void SetEncryptedFlag(std::uint8_t* frame, bool encrypted) noexcept;
/// Sets the resend flag of a frame in wire form, enciphered or not: its header is always clear.
void SetResendFlag(std::uint8_t* frame) noexcept;

}  // namespace mcftp
