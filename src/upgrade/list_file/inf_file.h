// The INF file: which further files a device fetches, one a line.
#pragma once

#include <cstddef>
#include <string_view>

namespace upgrade {

/// One entry. The texts point into the file's bytes.
struct InfEntry {
  std::string_view pattern;      ///< which devices it is for
  std::string_view source;       ///< on the server; only the file name counts
  std::string_view destination;  ///< on the device
};

/// Reads the entries of an INF file: lines that begin, behind blanks and tabs, with a double quote
/// and hold three quoted texts. What stands between and behind the texts does not matter; all other
/// lines are passed over, and so are entries whose texts are incomplete, longer than a path may be
/// or hold a zero byte.
///
/// Any bytes are a valid file; they need no terminator. Owns nothing.
class InfFileReader {
 public:
  /// Longest text of an entry, in characters.
  static constexpr std::size_t kLongestText = 259;

  explicit InfFileReader(std::string_view bytes) noexcept : rest_(bytes) {}

  /// @return false, with `entry` unspecified, when there is none left.
  [[nodiscard]] bool Next(InfEntry* entry) noexcept;

 private:
  std::string_view rest_;
};

}  // namespace upgrade
