// Numbers into file formats whose low byte comes first.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace tools {

inline void Append16(std::string& bytes, std::size_t value) {
  bytes += static_cast<char>(value & 0xFF);
  bytes += static_cast<char>(value >> 8 & 0xFF);
}

inline void Append32(std::string& bytes, std::size_t value) {
  Append16(bytes, value & 0xFFFF);
  Append16(bytes, value >> 16 & 0xFFFF);
}

}  // namespace tools
