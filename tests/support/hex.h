// Bytes as they are written down by hand.
#pragma once

#include <cstddef>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace test {

using Bytes = std::vector<std::uint8_t>;

/// "00 40 0005": pairs of hexadecimal digits, blanks and line feeds anywhere between them.
inline Bytes Hex(std::string_view text) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  Bytes bytes;
  int high = -1;
  for (const char letter : text) {
    if (letter == ' ' || letter == '\n') continue;
    const std::size_t digit = kDigits.find(letter);
    if (digit == std::string_view::npos) throw std::invalid_argument("no hexadecimal digit");
    if (high < 0) {
      high = static_cast<int>(digit);
    } else {
      bytes.push_back(static_cast<std::uint8_t>(high * 16 + static_cast<int>(digit)));
      high = -1;
    }
  }
  if (high >= 0) throw std::invalid_argument("half a byte");
  return bytes;
}

inline std::string ToHex(const std::uint8_t* bytes, std::size_t size) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (std::size_t i = 0; i < size; ++i) {
    if (i > 0) text += ' ';
    text += kDigits[bytes[i] >> 4];
    text += kDigits[bytes[i] & 15];
  }
  return text;
}
inline std::string ToHex(const Bytes& bytes) {
  return ToHex(bytes.data(), bytes.size());
}

}  // namespace test
