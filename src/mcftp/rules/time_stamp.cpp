#include "mcftp/rules/time_stamp.h"

#include <cstddef>

namespace mcftp {
namespace {

/// Behind each number but the last.
constexpr std::string_view kSeparators = "-- ::";

constexpr bool IsDigit(char c) noexcept {
  return c >= '0' && c <= '9';
}

}  // namespace

TimeStamp ParseTimeStamp(std::string_view text) noexcept {
  TimeStamp stamp;
  std::uint16_t* const fields[] = {&stamp.year, &stamp.month,  &stamp.day,
                                   &stamp.hour, &stamp.minute, &stamp.second};
  std::size_t at = 0;
  for (std::size_t field = 0; field < sizeof fields / sizeof *fields; ++field) {
    if (at == text.size() || !IsDigit(text[at])) break;
    std::uint32_t number = 0;
    for (; at < text.size() && IsDigit(text[at]) && number <= UINT16_MAX; ++at) {
      number = number * 10 + static_cast<std::uint32_t>(text[at] - '0');
    }
    if (number > UINT16_MAX) break;
    *fields[field] = static_cast<std::uint16_t>(number);
    if (field == kSeparators.size() || at == text.size() || text[at] != kSeparators[field]) break;
    ++at;
  }
  return stamp;
}

}  // namespace mcftp
