// Which devices a firmware package of the configuration file is for.
#pragma once

#include <string_view>

namespace orvenix {

/// One pattern against a device's manufacturer string. '?' stands for any one character; '*', or
/// the end of either of the two, ends the comparison with success. So each may be the beginning of
/// the other, and a device that does not tell what it is gets everything. Both end at a line end
/// and after 63 characters. Letter case counts.
[[nodiscard]] bool CompareCfgStr(std::string_view pattern, std::string_view device) noexcept;

/// Any of several patterns, separated by commas; blanks belong to their pattern. No pattern selects
/// no device.
[[nodiscard]] bool SelectsDevice(std::string_view patterns, std::string_view device) noexcept;

}  // namespace orvenix
