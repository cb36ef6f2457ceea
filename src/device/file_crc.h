// The CRC-32 of a file on the device.
#pragma once

#include <cstdint>

namespace device {

/// Computes the CRC-32 (the one of IEEE 802.3, zlib's crc32) of a whole file in blocks of 4,096
/// bytes.
///
/// @param path  on the device; a RAM file ("RAM:") is not a file of the file system
/// @param crc   receives the value, 0 when it could not be computed
/// @return 0, or the error that opening or reading gave (never 0 then).
std::uint32_t FILECRC32(const char* path, std::uint32_t* crc) noexcept;

}  // namespace device
