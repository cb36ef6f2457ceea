// Reads the head of an upgrade server's answer.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace http {

/// The numbers are those of "bad ret N" in the transfer log.
enum class HeadError : std::uint8_t {
  kNone = 0,
  kNotOk = 5,
  kNoLength = 6,
  kNoCrc = 7,
  kBlockTooLarge = 8,
  kNoEnd = 9,  ///< no empty line ends the head; has no log line of its own
};

/// Longest time stamp that is kept, in characters.
inline constexpr std::size_t kMaxTimeStamp = 255;

/// An optional field is absent, not 0 or empty: the client logs the difference.
struct ResponseHead {
  std::uint32_t content_length = 0;              ///< bytes
  std::optional<std::uint32_t> attributes;       ///< FILE_ATTRIBUTE_* bits
  std::optional<std::string_view> time_stamp;    ///< leading blank included; points into the block
  std::optional<std::uint32_t> crc32;            ///< CRC-32 of the body
  std::optional<std::uint32_t> checkpoint_size;  ///< bytes per checkpoint block
  std::size_t body_offset = 0;                   ///< first byte of the body within the block
};

/// Reads the head of an answer out of the first received block.
///
/// Every field is found by a plain search, which respects letter case, anywhere in that block, the
/// body included, and only in that block. Both rules are deliberate: servers in the field count on
/// them, and a head that continues in a second segment lacks what stands there.
///
/// Numbers are decimal and may stand behind white space. A length without digits or above 32 bits
/// counts as missing; in the other fields no digits are 0 and too many are the largest number.
///
/// @param block         what was received first; need not be terminated
/// @param crc_required  whether an answer without a CRC is refused
/// @param buffer_size   the receive buffer's size in bytes, limit of the checkpoint size
/// @return the first rule that the block breaks, in the order of HeadError; `head` then holds the
///   fields that come before that rule, whose log lines are still due.
[[nodiscard]] HeadError ParseResponseHead(std::string_view block, bool crc_required,
                                          std::uint32_t buffer_size, ResponseHead& head) noexcept;

}  // namespace http
