// The device's one font.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

namespace sim {

/// One character's picture: rows of `width` bytes, 0 = nothing to 255 = covered.
struct Glyph {
  int left = 0;  ///< pixels from the pen position to the picture
  int top = 0;   ///< pixels from the base line up to the picture's first row
  int width = 0;
  int height = 0;
  int advance = 0;
  std::vector<std::uint8_t> coverage;
};

/// In pixels.
struct FontMetrics {
  int height = 0;  ///< ascent + descent
  int ascent = 0;
  int descent = 0;
  int internal_leading = 0;
  int external_leading = 0;
  int average_width = 0;
  int max_width = 0;
};

/// Not for several threads at once.
class Font {
 public:
  virtual ~Font() = default;
  [[nodiscard]] virtual const FontMetrics& metrics() const = 0;
  /// The picture of one UTF-16 unit; a box for what the font lacks. Valid as long as the font.
  virtual const Glyph& GlyphOf(char16_t unit) = 0;
};

/// The font that the screen uses: a rendered one, or the bitmap font in a build without pictures.
std::unique_ptr<Font> MakeSystemFont();

/// Fixed-width letters of 5 by 7 pixels for ASCII, without any library or file.
std::unique_ptr<Font> MakeBitmapFont();

}  // namespace sim
