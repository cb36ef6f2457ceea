// Dates and times of day as text, in the device's language, English.
#pragma once

#include <string>
#include <string_view>

#include "ce/types.h"

namespace sim {

/// Writes `date` as a picture string says: d dd ddd dddd, M MM MMM MMMM, y yy yyyy, gg; text in
/// single quotes and everything else stands for itself.
[[nodiscard]] std::u16string DateText(const SYSTEMTIME& date, std::u16string_view picture);

struct TimeStyle {
  bool force_24_hours = false;  ///< h and hh count to 24
  bool no_marker = false;       ///< t and tt are left out
};

/// The same for h hh, H HH, m mm, s ss, t tt.
[[nodiscard]] std::u16string TimeText(const SYSTEMTIME& time, std::u16string_view picture,
                                      TimeStyle style);

}  // namespace sim
