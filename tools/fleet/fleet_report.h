// A fleet's outcome for people and for scripts.
#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>

#include "tools/fleet/fleet.h"

namespace fleet {

/// Several lines.
[[nodiscard]] std::string TextReport(const Plan& plan, const Outcome& outcome);

/// Holds nothing that two runs of one plan could differ in.
[[nodiscard]] nlohmann::ordered_json JsonReport(const Plan& plan, const Outcome& outcome);

}  // namespace fleet
