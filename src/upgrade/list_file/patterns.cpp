#include "upgrade/list_file/patterns.h"

#include <cstddef>

#include "base/text.h"

namespace upgrade {
namespace {

/// The device's string up to the line end that some devices store behind it.
std::string_view FirstLine(std::string_view text) noexcept {
  return base::Part(text, 0, text.find_first_of(std::string_view("\r\n\0", 3)));
}

}  // namespace

bool ListPatternMatches(std::string_view pattern, std::string_view device) noexcept {
  const std::string_view wanted = FirstLine(pattern);
  const std::string_view text = FirstLine(device);
  for (std::size_t at = 0; at < wanted.size() && at < text.size(); ++at) {
    if (wanted[at] == '*') return true;
    if (wanted[at] != '?' && wanted[at] != text[at]) return false;
  }
  return true;
}

bool AnyListPatternMatches(std::string_view patterns, std::string_view device) noexcept {
  constexpr std::string_view kSeparators = " ;";
  for (std::size_t from = patterns.find_first_not_of(kSeparators);
       from != std::string_view::npos;) {
    const std::string_view rest = base::Part(patterns, from);
    const std::string_view pattern = base::Part(rest, 0, rest.find_first_of(kSeparators));
    if (ListPatternMatches(pattern, device)) return true;
    from = patterns.find_first_not_of(kSeparators, from + pattern.size());
  }
  return false;
}

bool InfPatternMatches(std::string_view pattern, std::string_view device) noexcept {
  const std::string_view text = FirstLine(device);
  if (pattern.size() < text.size()) return false;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (pattern[at] != '*' && pattern[at] != text[at]) return false;
  }
  return true;
}

}  // namespace upgrade
