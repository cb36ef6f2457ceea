// The upgrade's progress window as somebody reads it who stands before the device.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "window/screen.h"

namespace sim {

struct BarView {
  int filled = 0;  ///< units
  int total = 0;   ///< 38, or 48 on a small screen; 0 on a screen too narrow for a bar
};

struct ProgressView {
  std::vector<std::string> status_lines;  ///< UTF-8, from the top
  std::optional<BarView> overall;
  std::optional<BarView> file;
  std::optional<std::string> caption;  ///< in place of the file bar
};

/// Reads the display list of the progress window (Screen::Shown, or the calls of a paint of the
/// whole window): boxes 10 pixels high are bars, the text below the first one is the caption, the
/// others are status lines.
ProgressView ReadProgress(const std::vector<Drawn>& shown);

/// The progress window of `screen`, read; nothing while there is none or while it is hidden.
std::optional<ProgressView> ReadProgress(const Screen& screen);

}  // namespace sim
