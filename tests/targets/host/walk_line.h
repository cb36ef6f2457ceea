// One line of a walk: what the host does next, and what must come of it.
//
//   begin "Upgrade" = ok
//   set MCTMask "x"*3000 = ok
//   begin null = unknown
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace host {

struct Word {
  std::string text;
  bool is_null = false;  ///< the bare word null: no text at all

  /// As a function of C wants it.
  [[nodiscard]] const char* c_str() const { return is_null ? nullptr : text.c_str(); }
};

struct WalkLine {
  std::string verb;  ///< empty: an empty line, or a comment
  std::vector<Word> arguments;
  /// What stands behind "="; none: nothing is expected.
  std::optional<std::vector<std::string>> expected;
};

/// Words are divided by blanks; one in quotation marks may have blanks but no quotation mark.
/// `"x"*300` is the text repeated. A "#" where a word would begin makes the rest a comment.
/// @return false when a quotation mark or a count is wrong
bool ReadWalkLine(std::string_view text, WalkLine& line);

}  // namespace host
