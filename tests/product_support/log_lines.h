// The transfer log of the test's device.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace test {

/// All of it; empty when there is none.
std::string ReadLog();

/// Its lines, without line ends.
std::vector<std::string> LogLines();

/// Those that hold `part`.
std::vector<std::string> LogLinesWith(std::string_view part);

}  // namespace test
