// The time stamp that an announcement gives a file.
#pragma once

#include <cstdint>
#include <string_view>

namespace mcftp {

struct TimeStamp {
  std::uint16_t year = 0;
  std::uint16_t month = 0;  ///< from 1
  std::uint16_t day = 0;    ///< from 1
  std::uint16_t hour = 0;
  std::uint16_t minute = 0;
  std::uint16_t second = 0;
};

/// Reads "2006-03-01 14:05:09": six decimal numbers with "-", "-", a blank, ":" and ":" between
/// them. From the first thing that is not so on everything is 0, which is no date. Whether the
/// numbers make a date is for the platform to say.
[[nodiscard]] TimeStamp ParseTimeStamp(std::string_view text) noexcept;

}  // namespace mcftp
