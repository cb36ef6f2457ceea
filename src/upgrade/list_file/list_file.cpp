#include "upgrade/list_file/list_file.h"

#include <cstddef>

#include "base/text.h"

namespace upgrade {
namespace {

constexpr std::string_view kSeparators = ",\r\n";

// The fields of a job's record of a file, less one for the terminating zero.
constexpr std::size_t kLongestPath = 259;
constexpr std::size_t kLongestMasks = 2007;
constexpr std::size_t kLongestNumber = 31;

bool Fits(const ListRecord& record) noexcept {
  return record.source.size() <= kLongestPath && record.destination.size() <= kLongestPath &&
         record.masks.size() <= kLongestMasks && record.crc.size() <= kLongestNumber &&
         record.size.size() <= kLongestNumber;
}

}  // namespace

ListFileReader::ListFileReader(std::string_view bytes) noexcept
    : rest_(base::Part(bytes, 0, bytes.find('\0'))) {}

std::string_view ListFileReader::NextField() noexcept {
  const std::size_t from = rest_.find_first_not_of(kSeparators);
  if (from == std::string_view::npos) {
    rest_ = {};
    return {};
  }
  rest_.remove_prefix(from);
  const std::string_view field = base::Part(rest_, 0, rest_.find_first_of(kSeparators));
  rest_.remove_prefix(field.size());
  return field;
}

bool ListFileReader::Next(ListRecord* record) noexcept {
  for (;;) {
    record->source = NextField();
    record->destination = NextField();
    record->masks = NextField();
    record->crc = NextField();
    record->size = NextField();
    if (record->size.empty()) return false;
    if (Fits(*record)) return true;
  }
}

}  // namespace upgrade
