// Conversion between the device's 8-bit texts and UTF-16.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace sim {

/// Windows-1252, the device's own code page. Its five unassigned bytes stand for the control
/// characters of the same number.
[[nodiscard]] std::u16string FromAnsi(std::string_view text);

/// @param substitute  stands for each UTF-16 unit that the code page lacks
/// @param substituted  set to whether it was needed
[[nodiscard]] std::string ToAnsi(std::u16string_view text, char substitute, bool& substituted);

/// Malformed sequences become U+FFFD; `malformed` says whether there were any.
[[nodiscard]] std::u16string FromUtf8(std::string_view text, bool& malformed);

/// Surrogates that stand alone become U+FFFD.
[[nodiscard]] std::string ToUtf8(std::u16string_view text);

}  // namespace sim
