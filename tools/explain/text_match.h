// Finding the text of the catalogue that a line of a log was written with.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/explain/catalogue.h"

namespace tools {

struct TextMatch {
  const TextRow* row = nullptr;         ///< null: a text from elsewhere
  std::optional<std::uint32_t> number;  ///< the last number of the text
  std::string_view rest;  ///< behind a text that ends no line; the next one stands there
};

/// Compares lines with all texts of the log, or of the screen. Costs the line's length for each
/// text that begins like it, whatever the bytes.
class TextMatcher {
 public:
  explicit TextMatcher(bool on_screen = false, TextRows rows = Texts());

  /// @param line  without its line end
  [[nodiscard]] TextMatch Find(std::string_view line) const;

 private:
  /// What stands between two "%s": letters, and numbers marked by a zero.
  using Segment = std::string;
  struct Pattern {
    const TextRow* row = nullptr;
    std::vector<Segment> segments;
    bool ends_line = false;
  };

  static Pattern Compile(const TextRow& row);
  static bool Matches(const Pattern& pattern, std::string_view line, TextMatch& match);

  /// By the first letter, behind the program's name if there is one.
  std::array<std::vector<Pattern>, 512> patterns_;
};

/// A date and time in front of a message: "2006-03-01 14:05:09 " or "2006/03/01:14:05:09".
struct StampedLine {
  std::string_view time;  ///< empty: there is none
  std::string_view message;
};
[[nodiscard]] StampedLine SplitStamp(std::string_view line);

}  // namespace tools
