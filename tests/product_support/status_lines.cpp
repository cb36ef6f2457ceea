#include "product_support/status_lines.h"

#include "report/window/window_state.h"

namespace test {

std::vector<std::string> StatusLines() {
  std::vector<std::string> lines;
  report::LineList::Line line;
  for (int i = 0; report::window_state.lines.Copy(i, line); ++i) {
    lines.emplace_back(line.view().begin(), line.view().end());
  }
  return lines;
}

void ClearStatusLines() {
  report::window_state.lines.Clear();
}

int OverallProgress() {
  return report::window_state.overall_value.get();
}

}  // namespace test
