// The platform's wide formatting.
#pragma once

#include <cstdarg>
#include <string>

#include "ce/types.h"

namespace sim {

/// printf for UTF-16: "%s" takes wide text, "%S" and "%hs" narrow (in the
/// device's code page), "%c" a wide character. Knows the
/// flags, width, precision and "*", d i u x X o p and "%%"; "l", "h" and "w" as length. All numbers
/// are 32 bits, as on the device. An unknown conversion is copied as it stands and takes nothing.
[[nodiscard]] std::u16string FormatWide(const WCHAR* format, std::va_list arguments);

}  // namespace sim
