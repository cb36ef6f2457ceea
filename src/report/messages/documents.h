// The texts of the two messages.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

#include "base/text.h"
#include "xml/document.h"

namespace report {

/// Room for a status whose reason has 1,600 characters.
inline constexpr std::size_t kStatusSize = 2048;

/// Formats a ready-to-work status, one line. A reason that is too long is cut, never the document.
/// @return its length without the closing zero
std::size_t FormatStatus(char (&out)[kStatusSize], int state, const char* reason) noexcept;

/// "2006/03/01:14:05:09", or nothing for a time whose numbers have too many digits.
[[nodiscard]] base::FixedText<33> EventTimestamp(const SYSTEMTIME& time) noexcept;

struct DeviceEvent {
  const char* timestamp;  ///< empty: there is none
  const char* unique_id;  ///< null counts as empty, here and below
  std::uint32_t code;
  const char* text;
};

/// Makes the event's document and writes it, one line.
/// @param length  receives the text's length without the closing zero
/// @return the text, which belongs to `document`; null when there is no memory
const char* WriteEvent(xml::XmlDocument& document, const DeviceEvent& event,
                       std::uint32_t* length) noexcept;

}  // namespace report
