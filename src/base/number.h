// Numbers out of text.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace base {

/// The number that a text begins with, read as the device's 32-bit `atoi` reads it: white space
/// and one sign are skipped, digits follow, and no digits give 0. A value that does not fit wraps
/// modulo 2^32, so that a CRC above 2147483647 keeps its bits.
template <typename Char>
[[nodiscard]] constexpr std::uint32_t LeadingNumber(std::basic_string_view<Char> text) noexcept {
  std::size_t at = 0;
  while (at < text.size() && (text[at] == Char(' ') || (text[at] >= 9 && text[at] <= 13))) ++at;
  const bool negative = at < text.size() && text[at] == Char('-');
  if (at < text.size() && (text[at] == Char('-') || text[at] == Char('+'))) ++at;
  std::uint32_t value = 0;
  for (; at < text.size() && text[at] >= Char('0') && text[at] <= Char('9'); ++at) {
    value = value * 10U + static_cast<std::uint32_t>(text[at] - Char('0'));
  }
  return negative ? 0U - value : value;
}
[[nodiscard]] constexpr std::uint32_t LeadingNumber(std::string_view text) noexcept {
  return LeadingNumber<char>(text);
}

/// The same as a signed number.
[[nodiscard]] constexpr std::int32_t LeadingInt(std::string_view text) noexcept {
  return static_cast<std::int32_t>(LeadingNumber<char>(text));
}

static_assert(LeadingInt(" \t-42x") == -42 && LeadingInt("x") == 0 && LeadingInt("") == 0);
static_assert(LeadingNumber("3421780262") == 3421780262U);
static_assert(LeadingInt("3421780262") == -873187034, "as the log shows such a CRC");

}  // namespace base
