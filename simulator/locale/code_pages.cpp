#include "locale/code_pages.h"

#include <array>
#include <cstdint>

namespace sim {
namespace {

/// What the bytes 0x80 to 0x9F stand for; all others stand for themselves.
constexpr std::array<char16_t, 32> kHighControls = {
    0x20AC, 0x0081, 0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021, 0x02C6, 0x2030, 0x0160,
    0x2039, 0x0152, 0x008D, 0x017D, 0x008F, 0x0090, 0x2018, 0x2019, 0x201C, 0x201D, 0x2022,
    0x2013, 0x2014, 0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x009D, 0x017E, 0x0178};

constexpr char16_t kReplacement = 0xFFFD;

std::optional<char> AnsiOf(char16_t unit) {
  if (unit < 0x80 || (unit >= 0xA0 && unit <= 0xFF)) return static_cast<char>(unit);
  for (std::size_t i = 0; i < kHighControls.size(); ++i) {
    if (kHighControls[i] == unit) return static_cast<char>(0x80 + i);
  }
  return std::nullopt;
}

bool IsHighSurrogate(char32_t unit) {
  return unit >= 0xD800 && unit <= 0xDBFF;
}
bool IsLowSurrogate(char32_t unit) {
  return unit >= 0xDC00 && unit <= 0xDFFF;
}

void AppendUtf16(std::u16string& out, char32_t point) {
  if (point < 0x10000) {
    out += static_cast<char16_t>(point);
    return;
  }
  out += static_cast<char16_t>(0xD800 + ((point - 0x10000) >> 10));
  out += static_cast<char16_t>(0xDC00 + ((point - 0x10000) & 0x3FF));
}

void AppendUtf8(std::string& out, char32_t point) {
  const auto put = [&out](char32_t byte) { out += static_cast<char>(byte); };
  if (point < 0x80) {
    put(point);
  } else if (point < 0x800) {
    put(0xC0 | (point >> 6));
    put(0x80 | (point & 0x3F));
  } else if (point < 0x10000) {
    put(0xE0 | (point >> 12));
    put(0x80 | ((point >> 6) & 0x3F));
    put(0x80 | (point & 0x3F));
  } else {
    put(0xF0 | (point >> 18));
    put(0x80 | ((point >> 12) & 0x3F));
    put(0x80 | ((point >> 6) & 0x3F));
    put(0x80 | (point & 0x3F));
  }
}

/// Reads the character at `at` and moves behind it, or behind one byte when it is malformed.
std::optional<char32_t> NextUtf8(std::string_view text, std::size_t& at) {
  const auto byte = [text](std::size_t i) {
    return i < text.size() ? static_cast<std::uint8_t>(text[i]) : 0U;
  };
  const char32_t first = byte(at++);
  if (first < 0x80) return first;
  const std::size_t following = first >= 0xF0 ? 3 : first >= 0xE0 ? 2 : 1;
  if (first < 0xC2 || first > 0xF4) return std::nullopt;
  char32_t point = first & (0x3FU >> following);
  for (std::size_t i = 0; i < following; ++i) {
    const char32_t next = byte(at + i);
    if ((next & 0xC0) != 0x80) return std::nullopt;
    point = (point << 6) | (next & 0x3F);
  }
  constexpr char32_t kSmallest[] = {0, 0x80, 0x800, 0x10000};
  if (point < kSmallest[following] || point > 0x10FFFF) return std::nullopt;
  if (point >= 0xD800 && point <= 0xDFFF) return std::nullopt;
  at += following;
  return point;
}

}  // namespace

std::u16string FromAnsi(std::string_view text) {
  std::u16string wide;
  wide.reserve(text.size());
  for (const char c : text) {
    const auto byte = static_cast<std::uint8_t>(c);
    wide += byte >= 0x80 && byte <= 0x9F ? kHighControls[byte - 0x80U] : char16_t{byte};
  }
  return wide;
}

std::string ToAnsi(std::u16string_view text, char substitute, bool& substituted) {
  substituted = false;
  std::string narrow;
  narrow.reserve(text.size());
  for (const char16_t unit : text) {
    const std::optional<char> known = AnsiOf(unit);
    substituted = substituted || !known;
    narrow += known.value_or(substitute);
  }
  return narrow;
}

std::u16string FromUtf8(std::string_view text, bool& malformed) {
  malformed = false;
  std::u16string wide;
  for (std::size_t at = 0; at < text.size();) {
    const std::optional<char32_t> point = NextUtf8(text, at);
    malformed = malformed || !point;
    AppendUtf16(wide, point.value_or(kReplacement));
  }
  return wide;
}

std::string ToUtf8(std::u16string_view text) {
  std::string narrow;
  for (std::size_t at = 0; at < text.size(); ++at) {
    char32_t point = text[at];
    if (IsHighSurrogate(point) && at + 1 < text.size() && IsLowSurrogate(text[at + 1])) {
      point = 0x10000 + ((point - 0xD800) << 10) + (text[++at] - 0xDC00U);
    } else if (IsHighSurrogate(point) || IsLowSurrogate(point)) {
      point = kReplacement;
    }
    AppendUtf8(narrow, point);
  }
  return narrow;
}

}  // namespace sim
