// A document's text becomes its tree.
#pragma once

#include <cstdint>

#include "xml/document.h"

namespace xml {

struct ParseResult {
  XmlElement* root = nullptr;
  XmlParseError error = XmlParseError::kNone;
  std::uint32_t error_offset = 0;  ///< see XmlDocument::error_offset()
};

/// The style of a text that ends with a zero: FormatFlag bits, from its beginning up to the third
/// "<" that is followed by neither "?" nor "!".
[[nodiscard]] std::uint8_t SniffFormat(const char* text) noexcept;

/// Parses a text that ends with a zero, in place: names, values and texts of the tree point into
/// it. Reads nothing behind the zero, and each byte a constant number of times.
[[nodiscard]] ParseResult Parse(char* text, Storage& storage) noexcept;

}  // namespace xml
