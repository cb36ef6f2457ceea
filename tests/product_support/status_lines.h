// The lines of the progress window, whether or not a window shows them.
#pragma once

#include <string>
#include <vector>

namespace test {

/// What the window would show, oldest first.
std::vector<std::string> StatusLines();
/// They belong to the process, not to a device.
void ClearStatusLines();
/// The whole job's progress, of report::kBarUnits.
int OverallProgress();

}  // namespace test
