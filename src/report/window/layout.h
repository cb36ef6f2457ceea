// Where everything stands in the progress window, in pixels of its client area.
#pragma once

#include <coredll.h>

namespace report {

/// Sizes of the window's font, as GetTextMetricsW tells them.
struct FontSize {
  int height = 0;
  int internal_leading = 0;
  int external_leading = 0;
  int average_width = 0;

  [[nodiscard]] constexpr int pitch() const noexcept { return external_leading + height; }
};

/// What depends on the kind of screen.
struct ScreenKind {
  int line_capacity = 0;
  int bar_units = 0;
  bool small = false;

  /// A small screen's bars stand this much higher.
  [[nodiscard]] constexpr int bar_lift() const noexcept { return small ? 8 : 0; }
};

struct Bar {
  RECT outline;
  POINT fill_start;
  int step;  ///< pixels of one unit, 0 on a screen narrower than the units
};

/// Rows below the status lines, counted from the last of them.
inline constexpr int kOverallRow = 1;
inline constexpr int kSecondRow = 2;

/// The bars are 10 pixels high; a fill of 8 leaves their outline alone.
inline constexpr int kBarHeight = 10;
inline constexpr int kFillWidth = 8;

class Layout {
 public:
  constexpr Layout(const RECT& client, const FontSize& font, const ScreenKind& screen) noexcept
      : client_(client), font_(font), screen_(screen), top_(client.top + 2) {}

  [[nodiscard]] constexpr RECT Frame() const noexcept {
    return {client_.left + 2, top_, client_.right - 2,
            top_ + font_.pitch() * (screen_.line_capacity + 3) + 2};
  }

  /// Drawn after the frame and so over most of it. A normal screen keeps its last 22 rows as they
  /// are, where the platform's menu bar may stand.
  [[nodiscard]] constexpr RECT Background() const noexcept {
    return {0, 0, client_.right, screen_.small ? client_.bottom : client_.bottom - 22};
  }

  [[nodiscard]] constexpr POINT Line(int index) const noexcept {
    return {text_left(), top_ + 3 + font_.external_leading + index * font_.pitch()};
  }

  /// KEPT ODDITY: unlike the bar of its row the caption does not start below the window's margin
  /// and is not lifted on a small screen.
  [[nodiscard]] constexpr POINT Caption() const noexcept {
    return {text_left(), font_.pitch() * (screen_.line_capacity + kSecondRow)};
  }

  [[nodiscard]] constexpr Bar BarIn(int row) const noexcept {
    const int left = text_left();
    const int step = (client_.right - 4 - left) / screen_.bar_units;
    const int top = font_.pitch() * (screen_.line_capacity + row) - screen_.bar_lift() + top_ + 2;
    return {{left - 1, top, left + screen_.bar_units * step + 1, top + kBarHeight},
            {left, top + kBarHeight / 2},
            step};
  }

  /// What a new bar value has painted again: everything from the upper bar's row downwards, for
  /// the lower bar too.
  [[nodiscard]] constexpr RECT BarArea() const noexcept {
    RECT area = client_;
    area.top += font_.pitch() * (screen_.line_capacity + kOverallRow) - screen_.bar_lift() + 2;
    return area;
  }

 private:
  [[nodiscard]] constexpr int text_left() const noexcept {
    return client_.left + 3 + font_.internal_leading;
  }

  RECT client_;
  FontSize font_;
  ScreenKind screen_;
  int top_;
};

/// Units of a bar at `percent`, which is held to 0..100: the whole part of percent * 0.01 * units
/// in single precision. Whole numbers give the same value for every percent, on every processor
/// and without its floating-point library; the assertion below says so.
[[nodiscard]] constexpr int BarValue(int percent, int units) noexcept {
  const int held = percent < 0 ? 0 : percent > 100 ? 100 : percent;
  return held * units / 100;
}

constexpr bool BarValueIsTheSinglePrecisionProduct(int units) noexcept {
  for (int percent = 0; percent <= 100; ++percent) {
    const float share = static_cast<float>(percent) * 0.01F;
    const float product = share * static_cast<float>(units);
    if (static_cast<int>(product) != BarValue(percent, units)) return false;
  }
  return true;
}
static_assert(BarValueIsTheSinglePrecisionProduct(38) && BarValueIsTheSinglePrecisionProduct(48));
static_assert(BarValue(2, 38) == 0, "the first overall progress of an upgrade shows nothing yet");
static_assert(BarValue(150, 38) == 38 && BarValue(-5, 38) == 0);

}  // namespace report
