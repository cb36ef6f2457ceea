// Walking a job through the configlet, call by call, as a management host does.
#pragma once

#include <functional>
#include <string>

#include "tools/configlet_library.h"
#include "tools/job_file.h"

namespace tools {

/// One call of the walk, for whoever wants to see it.
struct WalkedCall {
  const char* function = "";
  std::string name;   ///< group or field
  std::string value;  ///< of a field
  std::uint32_t result = 0;
};

/// Begins every group, sets its fields, walks its inner groups in their order, and ends it. A call
/// that is refused ends the walk: Throws Failure with the code that the result stands for and the
/// job's line. `seen` may be empty.
void WalkJob(const ConfigletLibrary& configlet, const Job& job, const std::string& job_name,
             const std::function<void(const WalkedCall&)>& seen);

}  // namespace tools
