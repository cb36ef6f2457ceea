// A document's text becomes its tree.
#pragma once

#include <cstddef>
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

/// Parses a text in place: names, values and texts of the tree point into it. Each byte is read a
/// constant number of times.
///
/// @param length  bytes of the text; a zero stands behind them, and an earlier one ends the text
[[nodiscard]] ParseResult Parse(char* text, std::size_t length, Storage& storage) noexcept;

}  // namespace xml
