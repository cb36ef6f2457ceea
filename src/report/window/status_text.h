// How a status line is fitted to the screen.
#pragma once

#include <cstddef>

namespace report {

/// Bytes of a formatted status line with its terminating zero; longer ones are cut.
inline constexpr std::size_t kStatusSize = 168;

/// Bytes that a shortened line can need: the dots may go up to four characters past the text.
inline constexpr std::size_t kStatusWorkSize = kStatusSize + 4;

/// Stands in for the characters per line while they are unknown: dots at 38, 39 and 40.
inline constexpr int kAssumedCharactersPerLine = 43;

/// Ends a line that is too long for the screen in "...".
///
/// A text of `characters_per_line` - 5 characters or more is cut there and gets the dots; one that
/// is exactly that long gets them too, though nothing of it is lost. Shorter texts stay, and so
/// does every text when there is not even room for the dots.
///
/// @param text  `length` characters and a zero, in a buffer of kStatusWorkSize bytes
/// @param characters_per_line  0 when nothing has been painted yet
/// @return the new length.
constexpr std::size_t ShortenForScreen(char* text, std::size_t length,
                                       int characters_per_line) noexcept {
  const int known = characters_per_line == 0 ? kAssumedCharactersPerLine : characters_per_line;
  if (known < 5) return length;
  const auto kept = static_cast<std::size_t>(known) - 5;
  if (length < kept) return length;
  for (std::size_t dot = 0; dot < 3; ++dot) text[kept + dot] = '.';
  text[kept + 3] = '\0';
  return kept + 3;
}

}  // namespace report
