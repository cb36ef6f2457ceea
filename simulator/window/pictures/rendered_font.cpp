// The device's font, rendered from an outline font.
//
// Black and white, with the font's own instructions for small sizes: whole-number work from the
// outline to the pixel, so every machine gives the same picture.
#include <ft2build.h>
// FreeType's headers want this one first.
#include FT_FREETYPE_H
#include FT_MODULE_H

#include <cstdio>
#include <cstdlib>
#include <map>

#include "window/font.h"

namespace sim {
namespace {

/// Height of the letters' em in pixels: a line of it is 13 pixels high.
constexpr FT_UInt kEmPixels = 11;

int Rounded(FT_Pos in_64ths) {
  return static_cast<int>((in_64ths + 32) >> 6);
}

[[noreturn]] void GiveUp(const char* what) {
  std::fprintf(stderr,
               "cesim: %s the screen font %s; install the package fonts-dejavu-core, or build with "
               "-DCESIM_PICTURES=OFF\n",
               what, CESIM_FONT);
  std::abort();
}

class RenderedFont final : public Font {
 public:
  RenderedFont() {
    if (FT_Init_FreeType(&library_) != 0) GiveUp("cannot start the renderer for");
    FT_UInt interpreter = 35;  // the one without rules of its own on top of the font's
    FT_Property_Set(library_, "truetype", "interpreter-version", &interpreter);
    if (FT_New_Face(library_, CESIM_FONT, 0, &face_) != 0) GiveUp("cannot open");
    if (FT_Set_Pixel_Sizes(face_, 0, kEmPixels) != 0) GiveUp("cannot scale");
    Measure();
  }
  RenderedFont(const RenderedFont&) = delete;
  RenderedFont& operator=(const RenderedFont&) = delete;
  ~RenderedFont() override {
    FT_Done_Face(face_);
    FT_Done_FreeType(library_);
  }

  [[nodiscard]] const FontMetrics& metrics() const override { return metrics_; }

  const Glyph& GlyphOf(char16_t unit) override {
    const auto known = glyphs_.find(unit);
    if (known != glyphs_.end()) return known->second;
    return glyphs_[unit] = Render(unit);
  }

 private:
  [[nodiscard]] int Scaled(FT_Long font_units) const {
    return Rounded(FT_MulFix(font_units, face_->size->metrics.y_scale));
  }

  void Measure() {
    metrics_.ascent = Scaled(face_->ascender);
    metrics_.descent = Scaled(-face_->descender);
    metrics_.height = metrics_.ascent + metrics_.descent;
    metrics_.internal_leading = metrics_.height - static_cast<int>(kEmPixels);
    metrics_.external_leading = 0;
    metrics_.average_width = GlyphOf(u'x').advance;
    metrics_.max_width = Scaled(face_->max_advance_width);
  }

  Glyph Render(char16_t unit) {
    Glyph glyph;
    if (FT_Load_Char(face_, unit, FT_LOAD_RENDER | FT_LOAD_TARGET_MONO) != 0) return glyph;
    const FT_GlyphSlot slot = face_->glyph;
    const FT_Bitmap& bitmap = slot->bitmap;
    glyph.left = slot->bitmap_left;
    glyph.top = slot->bitmap_top;
    glyph.width = static_cast<int>(bitmap.width);
    glyph.height = static_cast<int>(bitmap.rows);
    glyph.advance = Rounded(slot->advance.x);
    for (unsigned row = 0; row < bitmap.rows; ++row) {
      const unsigned char* bits = bitmap.buffer + static_cast<std::ptrdiff_t>(row) * bitmap.pitch;
      for (unsigned column = 0; column < bitmap.width; ++column) {
        const bool set = (bits[column / 8] & (0x80U >> column % 8)) != 0;
        glyph.coverage.push_back(set ? 255 : 0);
      }
    }
    return glyph;
  }

  FT_Library library_ = nullptr;
  FT_Face face_ = nullptr;
  FontMetrics metrics_;
  std::map<char16_t, Glyph> glyphs_;
};

}  // namespace

std::unique_ptr<Font> MakeSystemFont() {
  return std::make_unique<RenderedFont>();
}

}  // namespace sim
