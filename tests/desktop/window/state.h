// What the progress window shows while its picture is taken, on the desktop as on the device.
#pragma once

#include <string_view>

#include "report/window/progress_window.h"

namespace window_test {

inline void ShowState(std::string_view name) {
  const report::GuiStart start = {nullptr, SW_SHOWNORMAL};
  if (name == "caption") report::ShowCaption("Corvanta", "MR700123");
  report::StartGUI(&start);
  static const char* const kLines[] = {
      "Cleaning device...",      "Processing OS files",
      "Processing INF files...", "Getting \\Flash File Store\\Tarnwell\\readme.txt",
      "Processing misc files",   "Validating 24 files",
  };
  int number = 0;
  for (const char* line : kLines) report::ShowStatus("%d %s", ++number, line);
  report::SetOverallProgress(50);
  report::SetFileProgress(25);
}

}  // namespace window_test
