// Where two records differ.
#pragma once

#include <string>

#include "targets/judge/run.h"

namespace targets {

/// @return which pieces differ, and of each the first place with both sides; empty when none does
[[nodiscard]] std::string Differences(const Record& expected, const Record& found);

}  // namespace targets
