// Numbers of file formats whose low byte comes first.
#pragma once

#include <cstdint>

namespace base {

/// @param bytes  at least 2
[[nodiscard]] constexpr std::uint16_t Little16(const std::uint8_t* bytes) noexcept {
  return static_cast<std::uint16_t>(bytes[0] | bytes[1] << 8);
}

/// @param bytes  at least 4
[[nodiscard]] constexpr std::uint32_t Little32(const std::uint8_t* bytes) noexcept {
  return Little16(bytes) | static_cast<std::uint32_t>(Little16(bytes + 2)) << 16;
}

}  // namespace base
