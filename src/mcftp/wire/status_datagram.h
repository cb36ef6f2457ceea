// The datagram in which the multicast client tells a user interface how far a file has come.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace mcftp {

/// Progress of one file. On the wire, integers in network order: 1, 0, percent (2 bytes), total
/// bytes (4), file size (4), the name and its terminating zero.
struct StatusDatagram {
  std::uint16_t percent = 0;      ///< of the current file; 0 when it is being opened
  std::uint32_t total_bytes = 0;  ///< received in this run, all files
  std::uint32_t file_size = 0;    ///< of the current file
  std::string_view file_name;     ///< as announced
};

inline constexpr std::size_t kStatusNameOffset = 12;
/// Characters of a name that are read; more are cut off.
inline constexpr std::size_t kMaxStatusName = 259;

/// Writes the datagram.
/// @return its length, 13 bytes and the name; 0 when it does not fit.
std::size_t EncodeStatus(const StatusDatagram& status, std::uint8_t* out,
                         std::size_t capacity) noexcept;

/// Reads a datagram from anyone. The name, which points into `bytes`, ends at its first zero, at
/// the end of the datagram or after kMaxStatusName characters. The first two bytes mean nothing to
/// the reader.
/// @return false for a datagram too short to hold the fields in front of the name.
[[nodiscard]] bool DecodeStatus(const std::uint8_t* bytes, std::size_t length,
                                StatusDatagram& status) noexcept;

}  // namespace mcftp
