#include "window/image.h"

#include <cstdlib>

#include "window/font.h"

namespace sim {
namespace {

std::uint8_t Red(COLORREF colour) {
  return static_cast<std::uint8_t>(colour & 0xFFU);
}
std::uint8_t Green(COLORREF colour) {
  return static_cast<std::uint8_t>(colour >> 8U & 0xFFU);
}
std::uint8_t Blue(COLORREF colour) {
  return static_cast<std::uint8_t>(colour >> 16U & 0xFFU);
}

std::size_t Offset(const Image& image, int x, int y) {
  return (static_cast<std::size_t>(y) * static_cast<std::size_t>(image.width) +
          static_cast<std::size_t>(x)) *
         3;
}

void Put(Image& image, int x, int y, COLORREF colour) {
  std::uint8_t* pixel = &image.rgb[Offset(image, x, y)];
  pixel[0] = Red(colour);
  pixel[1] = Green(colour);
  pixel[2] = Blue(colour);
}

std::uint8_t Mix(std::uint8_t under, std::uint8_t over, unsigned coverage) {
  return static_cast<std::uint8_t>((under * (255U - coverage) + over * coverage + 127U) / 255U);
}

void Mix(Image& image, int x, int y, COLORREF colour, unsigned coverage) {
  std::uint8_t* pixel = &image.rgb[Offset(image, x, y)];
  pixel[0] = Mix(pixel[0], Red(colour), coverage);
  pixel[1] = Mix(pixel[1], Green(colour), coverage);
  pixel[2] = Mix(pixel[2], Blue(colour), coverage);
}

bool Contains(const RECT& area, int x, int y) {
  return x >= area.left && x < area.right && y >= area.top && y < area.bottom;
}

/// Keeps sums of squared distances within 64 bits.
int Bounded(int coordinate) {
  return std::clamp(coordinate, -8192, 8192);
}

void ThinLine(Image& image, const RECT& clip, POINT from, POINT to, COLORREF colour) {
  const int dx = std::abs(to.x - from.x);
  const int dy = std::abs(to.y - from.y);
  const int step_x = from.x < to.x ? 1 : -1;
  const int step_y = from.y < to.y ? 1 : -1;
  int error = dx - dy;
  for (POINT at = from; at.x != to.x || at.y != to.y;) {
    if (Contains(clip, at.x, at.y)) Put(image, at.x, at.y, colour);
    const int doubled = 2 * error;
    if (doubled > -dy) {
      error -= dy;
      at.x += step_x;
    }
    if (doubled < dx) {
      error += dx;
      at.y += step_y;
    }
  }
}

/// Which pixels a wide line covers, in whole numbers: those whose foot lies on the line and whose
/// distance from it is at most half the width.
class WideLine {
 public:
  WideLine(POINT from, POINT to, int width)
      : from_(from),
        dx_(to.x - from.x),
        dy_(to.y - from.y),
        // The side that a boundary pixel belongs to must not depend on the line's direction.
        side_(dx_ > 0 || (dx_ == 0 && dy_ < 0) ? 1 : -1),
        length2_(dx_ * dx_ + dy_ * dy_),
        width2_(static_cast<std::int64_t>(width) * width) {}

  [[nodiscard]] bool Covers(int x, int y) const {
    const std::int64_t px = x - from_.x;
    const std::int64_t py = y - from_.y;
    const std::int64_t along = px * dx_ + py * dy_;
    if (along < 0 || along >= length2_) return false;
    const std::int64_t across = side_ * (dx_ * py - dy_ * px);
    const std::int64_t across2 = 4 * across * across;
    const std::int64_t limit = width2_ * length2_;
    return across < 0 ? across2 <= limit : across2 < limit;
  }

 private:
  POINT from_;
  std::int64_t dx_;
  std::int64_t dy_;
  std::int64_t side_;
  std::int64_t length2_;
  std::int64_t width2_;
};

void DrawGlyph(Image& image, const RECT& clip, const Glyph& glyph, int x, int y, COLORREF colour) {
  auto coverage = glyph.coverage.begin();
  for (int row = 0; row < glyph.height; ++row) {
    for (int column = 0; column < glyph.width; ++column, ++coverage) {
      if (*coverage != 0 && Contains(clip, x + column, y + row)) {
        Mix(image, x + column, y + row, colour, *coverage);
      }
    }
  }
}

}  // namespace

Image::Image(int image_width, int image_height, COLORREF colour)
    : width(std::max(image_width, 0)),
      height(std::max(image_height, 0)),
      rgb(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 3) {
  Fill(*this, area(), area(), colour);
}

COLORREF Image::At(int x, int y) const {
  if (!Contains(area(), x, y)) return 0;
  const std::uint8_t* pixel = &rgb[Offset(*this, x, y)];
  return RGB(pixel[0], pixel[1], pixel[2]);
}

void Fill(Image& image, const RECT& clip, const RECT& area, COLORREF colour) {
  const RECT inside = Intersect(Intersect(image.area(), clip), area);
  if (IsEmpty(inside)) return;
  // One row pixel by pixel, the others as copies of it: backgrounds are most of what is drawn.
  for (int x = inside.left; x < inside.right; ++x) Put(image, x, inside.top, colour);
  const auto* first = &image.rgb[Offset(image, inside.left, inside.top)];
  const auto bytes = static_cast<std::ptrdiff_t>(inside.right - inside.left) * 3;
  for (int y = inside.top + 1; y < inside.bottom; ++y) {
    std::copy(first, first + bytes, &image.rgb[Offset(image, inside.left, y)]);
  }
}

void Outline(Image& image, const RECT& clip, const RECT& area, COLORREF colour) {
  if (IsEmpty(area)) return;
  Fill(image, clip, {area.left, area.top, area.right, area.top + 1}, colour);
  Fill(image, clip, {area.left, area.bottom - 1, area.right, area.bottom}, colour);
  Fill(image, clip, {area.left, area.top, area.left + 1, area.bottom}, colour);
  Fill(image, clip, {area.right - 1, area.top, area.right, area.bottom}, colour);
}

void Blit(Image& image, const RECT& clip, int x, int y, const Image& from) {
  const RECT inside = Intersect(Intersect(image.area(), clip), Moved(from.area(), x, y));
  if (IsEmpty(inside)) return;
  const auto bytes = static_cast<std::ptrdiff_t>(inside.right - inside.left) * 3;
  for (int row = inside.top; row < inside.bottom; ++row) {
    const auto* source = &from.rgb[Offset(from, inside.left - x, row - y)];
    std::copy(source, source + bytes, &image.rgb[Offset(image, inside.left, row)]);
  }
}

void Line(Image& image, const RECT& clip, POINT from, POINT to, int width, COLORREF colour) {
  from = {Bounded(from.x), Bounded(from.y)};
  to = {Bounded(to.x), Bounded(to.y)};
  const RECT inside = Intersect(image.area(), clip);
  if (width <= 1) return ThinLine(image, inside, from, to, colour);
  const int reach = Bounded(width) / 2 + 1;
  const RECT near =
      Intersect(inside, {std::min(from.x, to.x) - reach, std::min(from.y, to.y) - reach,
                         std::max(from.x, to.x) + reach + 1, std::max(from.y, to.y) + reach + 1});
  const WideLine line(from, to, Bounded(width));
  for (int y = near.top; y < near.bottom; ++y) {
    for (int x = near.left; x < near.right; ++x) {
      if (line.Covers(x, y)) Put(image, x, y, colour);
    }
  }
}

int Text(Image& image, const RECT& clip, Font& font, const TextRun& run) {
  const RECT inside = Intersect(image.area(), clip);
  const int baseline = run.at.y + font.metrics().ascent;
  int x = run.at.x;
  for (std::size_t i = 0; i < run.text.size(); ++i) {
    const Glyph& glyph = font.GlyphOf(run.text[i]);
    DrawGlyph(image, inside, glyph, x + glyph.left, baseline - glyph.top, run.colour);
    x += run.spacing != nullptr ? run.spacing[i] : glyph.advance;
  }
  return x - run.at.x;
}

}  // namespace sim
