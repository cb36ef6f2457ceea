// A picture, and what can be drawn on it.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "ce/window.h"

namespace sim {

class Font;

inline bool IsEmpty(const RECT& area) {
  return area.left >= area.right || area.top >= area.bottom;
}

inline RECT Intersect(const RECT& a, const RECT& b) {
  const RECT common = {std::max(a.left, b.left), std::max(a.top, b.top), std::min(a.right, b.right),
                       std::min(a.bottom, b.bottom)};
  return IsEmpty(common) ? RECT{} : common;
}

/// The smallest rectangle around both; an empty one counts for nothing.
inline RECT Around(const RECT& a, const RECT& b) {
  if (IsEmpty(a)) return b;
  if (IsEmpty(b)) return a;
  return {std::min(a.left, b.left), std::min(a.top, b.top), std::max(a.right, b.right),
          std::max(a.bottom, b.bottom)};
}

inline RECT Moved(const RECT& area, int x, int y) {
  return {area.left + x, area.top + y, area.right + x, area.bottom + y};
}

/// Rows of three bytes a pixel: red, green, blue.
struct Image {
  int width = 0;
  int height = 0;
  std::vector<std::uint8_t> rgb;

  Image() = default;
  Image(int image_width, int image_height, COLORREF colour);

  [[nodiscard]] RECT area() const { return {0, 0, width, height}; }
  /// Black outside the picture.
  [[nodiscard]] COLORREF At(int x, int y) const;
  bool operator==(const Image& other) const {
    return width == other.width && height == other.height && rgb == other.rgb;
  }
  bool operator!=(const Image& other) const { return !(*this == other); }
};

// All of these draw within `clip` only. Rectangles do not contain their right and bottom edge.

void Fill(Image& image, const RECT& clip, const RECT& area, COLORREF colour);
/// The one pixel wide inner edge of `area`.
void Outline(Image& image, const RECT& clip, const RECT& area, COLORREF colour);
/// Copies `from` with its upper left corner at (x, y).
void Blit(Image& image, const RECT& clip, int x, int y, const Image& from);
/// A straight line with flat ends, without its last point. A line of even width stands half a
/// pixel to the upper left: 8 wide at y 20 it covers rows 16 to 23.
void Line(Image& image, const RECT& clip, POINT from, POINT to, int width, COLORREF colour);
struct TextRun {
  POINT at;  ///< upper left corner
  std::u16string_view text;
  const INT* spacing;  ///< advance of each character, null for the font's
  COLORREF colour;
};
/// @return the width of the text.
int Text(Image& image, const RECT& clip, Font& font, const TextRun& run);

// PNG files. False, with one line in `error`, when the file is at fault or the simulator was built
// without pictures.

/// False in a build without them.
bool HavePictures();
bool WritePng(const Image& image, const std::filesystem::path& file, std::string& error);
bool ReadPng(const std::filesystem::path& file, Image& image, std::string& error);

}  // namespace sim
