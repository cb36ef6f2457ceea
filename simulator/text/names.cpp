#include "text/names.h"

#include <cstddef>
#include <cstdint>

namespace sim {
namespace {

constexpr bool IsHigh(std::uint32_t unit) noexcept {
  return unit >= 0xD800 && unit <= 0xDBFF;
}
constexpr bool IsLow(std::uint32_t unit) noexcept {
  return unit >= 0xDC00 && unit <= 0xDFFF;
}

void AppendCode(std::string& out, std::uint32_t code) {
  const auto byte = [&out](std::uint32_t value) { out.push_back(static_cast<char>(value)); };
  if (code < 0x80) {
    byte(code);
  } else if (code < 0x800) {
    byte(0xC0U | code >> 6U);
    byte(0x80U | (code & 0x3FU));
  } else if (code < 0x10000) {
    byte(0xE0U | code >> 12U);
    byte(0x80U | (code >> 6U & 0x3FU));
    byte(0x80U | (code & 0x3FU));
  } else {
    byte(0xF0U | code >> 18U);
    byte(0x80U | (code >> 12U & 0x3FU));
    byte(0x80U | (code >> 6U & 0x3FU));
    byte(0x80U | (code & 0x3FU));
  }
}

struct Lead {
  std::size_t length;
  std::uint32_t bits;
  std::uint32_t least;  // a smaller code in this many bytes is an overlong form
};

constexpr Lead DecodeLead(std::uint8_t byte) noexcept {
  if (byte < 0x80) return {1, byte, 0};
  if (byte >= 0xC0 && byte < 0xE0) return {2, byte & 0x1FU, 0x80};
  if (byte >= 0xE0 && byte < 0xF0) return {3, byte & 0x0FU, 0x800};
  if (byte >= 0xF0 && byte < 0xF8) return {4, byte & 0x07U, 0x10000};
  return {0, 0, 0};
}

/// @return the length of the code at the front of `bytes`, 0 when there is none.
std::size_t DecodeCode(std::string_view bytes, std::uint32_t& code) noexcept {
  const Lead lead = DecodeLead(static_cast<std::uint8_t>(bytes[0]));
  if (lead.length == 0 || lead.length > bytes.size()) return 0;
  code = lead.bits;
  for (std::size_t i = 1; i < lead.length; ++i) {
    const auto byte = static_cast<std::uint8_t>(bytes[i]);
    if ((byte & 0xC0U) != 0x80U) return 0;
    code = code << 6U | (byte & 0x3FU);
  }
  return code < lead.least || code > 0x10FFFF ? 0 : lead.length;
}

void AppendUnits(std::u16string& text, std::uint32_t code) {
  if (code < 0x10000) {
    text.push_back(static_cast<char16_t>(code));
    return;
  }
  text.push_back(static_cast<char16_t>(0xD800U + ((code - 0x10000U) >> 10U)));
  text.push_back(static_cast<char16_t>(0xDC00U + ((code - 0x10000U) & 0x3FFU)));
}

}  // namespace

std::string ToHostText(std::u16string_view text) {
  std::string out;
  out.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    std::uint32_t code = text[i];
    if (IsHigh(code) && i + 1 < text.size() && IsLow(text[i + 1])) {
      code = 0x10000U + ((code - 0xD800U) << 10U) + (text[++i] - 0xDC00U);
    }
    AppendCode(out, code);
  }
  return out;
}

bool FromHostText(std::string_view bytes, std::u16string& text) {
  text.clear();
  text.reserve(bytes.size());
  while (!bytes.empty()) {
    std::uint32_t code = 0;
    const std::size_t length = DecodeCode(bytes, code);
    if (length == 0) return false;
    if (length == 3 && IsLow(code) && !text.empty() && IsHigh(text.back())) return false;
    AppendUnits(text, code);
    bytes.remove_prefix(length);
  }
  return true;
}

char16_t FoldCase(char16_t letter) noexcept {
  const auto lower = [letter](unsigned distance) {
    return static_cast<char16_t>(letter + distance);
  };
  if (letter < 0x80) return letter >= u'A' && letter <= u'Z' ? lower(0x20) : letter;
  if (letter >= 0xC0 && letter <= 0xDE && letter != 0xD7) return lower(0x20);
  // Pairs of neighbours. The dotted and dotless i and the letters without a partner stay alone.
  const bool even_first =
      (letter >= 0x100 && letter <= 0x12F) || (letter >= 0x132 && letter <= 0x137) ||
      (letter >= 0x14A && letter <= 0x177) || (letter >= 0x460 && letter <= 0x481) ||
      (letter >= 0x48A && letter <= 0x4BF);
  if (even_first) return static_cast<char16_t>(letter | 1U);
  const bool odd_first =
      (letter >= 0x139 && letter <= 0x148) || (letter >= 0x179 && letter <= 0x17E);
  if (odd_first) return static_cast<char16_t>(letter + (letter & 1U));
  if (letter == 0x178) return 0xFF;
  if (letter >= 0x391 && letter <= 0x3A9 && letter != 0x3A2) return lower(0x20);
  if (letter >= 0x410 && letter <= 0x42F) return lower(0x20);
  if (letter >= 0x400 && letter <= 0x40F) return lower(0x50);
  return letter;
}

std::u16string FoldCase(std::u16string_view text) {
  std::u16string folded(text);
  for (char16_t& letter : folded) letter = FoldCase(letter);
  return folded;
}

bool SameName(std::u16string_view a, std::u16string_view b) noexcept {
  if (a.size() != b.size()) return false;
  for (std::size_t i = 0; i < a.size(); ++i) {
    if (FoldCase(a[i]) != FoldCase(b[i])) return false;
  }
  return true;
}

std::u16string_view BoundedView(const char16_t* text, std::size_t most) noexcept {
  std::size_t length = 0;
  while (text != nullptr && length < most && text[length] != 0) ++length;
  return {text, length};
}

}  // namespace sim
