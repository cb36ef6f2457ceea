// Names of the device: how they are compared, and how they are written on the host.
//
// A device's names are any 16-bit units; half of a surrogate pair may stand alone. Written as UTF-8
// with such a half as its three bytes, every text has one spelling on the host and comes back as it
// was.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace sim {

/// Loses nothing: lone surrogates become three bytes, pairs four.
[[nodiscard]] std::string ToHostText(std::u16string_view text);

/// The inverse. @return false, with `text` unspecified, for bytes that ToHostText never writes
/// (overlong forms, a pair in six bytes, anything above U+10FFFF).
[[nodiscard]] bool FromHostText(std::string_view bytes, std::u16string& text);

/// A letter as names are compared: without regard to case, whatever the host's locale. Covers the
/// Latin, Greek and Cyrillic letters that have one partner.
[[nodiscard]] char16_t FoldCase(char16_t letter) noexcept;
[[nodiscard]] std::u16string FoldCase(std::u16string_view text);
[[nodiscard]] bool SameName(std::u16string_view a, std::u16string_view b) noexcept;

/// The text that a program gave, at most `most` characters of it; a null pointer is an empty one.
[[nodiscard]] std::u16string_view BoundedView(const char16_t* text, std::size_t most) noexcept;

}  // namespace sim
