#include "targets/judge/compare.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <string_view>

namespace targets {
namespace {

constexpr std::size_t kShown = 400;  ///< characters of a line

/// As one line of print, whatever it is.
std::string Shown(std::string_view bytes) {
  std::string text;
  for (const char c : bytes.substr(0, kShown)) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= 0x20 && byte < 0x7F) {
      text += c;
      continue;
    }
    char escaped[8];
    std::snprintf(escaped, sizeof escaped, "\\x%02x", byte);
    text += escaped;
  }
  return bytes.size() > kShown ? text + " ..." : text;
}

/// The line that begins at `begin`, its end included.
std::string_view LineAt(std::string_view text, std::size_t begin) {
  const std::size_t end = text.find('\n', begin);
  return text.substr(begin, end == std::string_view::npos ? end : end + 1 - begin);
}

std::string DescribePiece(const std::string& name, std::string_view expected,
                          std::string_view found) {
  const std::size_t common = std::min(expected.size(), found.size());
  const auto at = static_cast<std::size_t>(
      std::mismatch(expected.begin(), expected.begin() + static_cast<std::ptrdiff_t>(common),
                    found.begin())
          .first -
      expected.begin());
  const std::size_t end_of_last = at == 0 ? std::string_view::npos : expected.rfind('\n', at - 1);
  const std::size_t begin = end_of_last == std::string_view::npos ? 0 : end_of_last + 1;
  const auto line =
      std::count(expected.begin(), expected.begin() + static_cast<std::ptrdiff_t>(begin), '\n');
  return name + ", line " + std::to_string(line + 1) + ", byte " + std::to_string(at) + " (" +
         std::to_string(expected.size()) + " and " + std::to_string(found.size()) +
         " bytes)\n  linux: " + Shown(LineAt(expected, begin)) +
         "\n  here:  " + Shown(LineAt(found, begin)) + "\n";
}

}  // namespace

std::string Differences(const Record& expected, const Record& found) {
  std::string text;
  for (const auto& [name, content] : expected) {
    const auto other = found.find(name);
    if (other == found.end()) {
      text += name + " is missing\n";
    } else if (other->second != content) {
      text += DescribePiece(name, content, other->second);
    }
  }
  for (const auto& [name, content] : found) {
    if (expected.count(name) == 0) text += name + " is here only: " + Shown(content) + "\n";
  }
  return text;
}

}  // namespace targets
