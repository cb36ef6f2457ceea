// Which devices a file is for. Three formats name devices by patterns, and no two of them agree on
// what a pattern means: this file holds the two that belong to lists of files.
#pragma once

#include <string_view>

namespace upgrade {

/// One pattern of a list file against a device's manufacturer string. '?' stands for any one
/// character and '*' ends the comparison with success; otherwise both must agree until one of them
/// ends, at a line feed, a carriage return or its end, so that either may be the longer one. Letter
/// case counts. A pattern that begins with a carriage return matches every device.
[[nodiscard]] bool ListPatternMatches(std::string_view pattern, std::string_view device) noexcept;

/// Any of several patterns, separated by blanks and semicolons; no pattern matches no device.
[[nodiscard]] bool AnyListPatternMatches(std::string_view patterns,
                                         std::string_view device) noexcept;

/// The pattern of an INF entry. Here '*' stands for one character, '?' for itself, and the pattern
/// must reach to the end of the device's string; what it holds beyond does not matter.
[[nodiscard]] bool InfPatternMatches(std::string_view pattern, std::string_view device) noexcept;

}  // namespace upgrade
