// The platform's wide formatting, and wide text for people and files.
#pragma once

#include <cstdarg>
#include <string>
#include <string_view>

#include "ce/types.h"

namespace sim {

/// printf for UTF-16: "%s" takes wide text, "%S" and "%hs" narrow, "%c" a wide character. Knows the
/// flags, width, precision and "*", d i u x X o p and "%%"; "l", "h" and "w" as length. All numbers
/// are 32 bits, as on the device. An unknown conversion is copied as it stands and takes nothing.
[[nodiscard]] std::u16string FormatWide(const WCHAR* format, std::va_list arguments);

/// Surrogates without a partner become U+FFFD.
[[nodiscard]] std::string ToUtf8(std::u16string_view text);
/// Bytes that are not UTF-8 become U+FFFD.
[[nodiscard]] std::u16string ToUtf16(std::string_view text);

}  // namespace sim
