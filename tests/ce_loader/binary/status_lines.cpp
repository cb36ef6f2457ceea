// The lines of the progress window, read in the loaded binary.
#include "product_support/status_lines.h"

#include "ce_loader/binary/binary.h"
#include "report/window/window_state.h"

namespace test {
namespace {

report::WindowState& State() {
  static auto* const state =
      static_cast<report::WindowState*>(binary::Variable("_ZN6report12window_stateE"));
  return *state;
}

}  // namespace

std::vector<std::string> StatusLines() {
  std::vector<std::string> lines;
  report::LineList::Line line;
  for (int i = 0; State().lines.Copy(i, line); ++i) {
    lines.emplace_back(line.view().begin(), line.view().end());
  }
  return lines;
}

void ClearStatusLines() {
  State().lines.Clear();
}

int OverallProgress() {
  return State().overall_value.get();
}

}  // namespace test
