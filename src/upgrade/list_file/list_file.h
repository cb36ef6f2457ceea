// The list of files that a multicast transfer brings along.
#pragma once

#include <string_view>

namespace upgrade {

/// One record, as it stands in the file. The texts point into the file's bytes.
struct ListRecord {
  std::string_view source;
  std::string_view destination;
  std::string_view masks;  ///< device patterns
  std::string_view crc;    ///< decimal
  std::string_view size;   ///< decimal, bytes
};

/// Reads the records of a list file: five fields each, separated by commas and line ends.
///
/// KEPT ODDITY: any run of separators counts as one, so there are no empty fields; one that was
/// meant to be empty moves all that follow it, over line ends too.
///
/// Any bytes are a valid file. A zero byte ends it, and so does an incomplete last record. Records
/// with a field that no job could hold are passed over. Owns nothing.
class ListFileReader {
 public:
  explicit ListFileReader(std::string_view bytes) noexcept;

  /// @return false, with `record` unspecified, when there is none left.
  [[nodiscard]] bool Next(ListRecord* record) noexcept;

 private:
  std::string_view NextField() noexcept;

  std::string_view rest_;
};

}  // namespace upgrade
