#include "report/window/paint.h"

#include "report/window/window_state.h"

namespace report {
namespace {

inline constexpr COLORREF kFillColour = RGB(128, 128, 128);

/// The default pen and brush.
void DrawRectangle(HDC dc, const RECT& area) noexcept {
  Rectangle(dc, area.left, area.top, area.right, area.bottom);
}

void DrawLineOfText(HDC dc, const POINT& at, base::WideView text) noexcept {
  SetBkMode(dc, TRANSPARENT);
  ExtTextOutW(dc, at.x, at.y, 0, nullptr, text.data(), static_cast<UINT>(text.size()), nullptr);
}

void DrawStatusLines(HDC dc, const Layout& layout) noexcept {
  // Line by line, so that no lock is held while drawing. A list that moves on meanwhile has asked
  // for the next paint already.
  LineList::Line line;
  for (int i = 0; window_state.lines.Copy(i, line); ++i) {
    DrawLineOfText(dc, layout.Line(i), line.view());
  }
}

/// The grey pen of the bars' fills. Lives longer than the context that it is selected into, so that
/// it can always be deleted.
class FillPen {
 public:
  FillPen() noexcept = default;
  ~FillPen() {
    if (pen_ != nullptr) DeleteObject(pen_);
  }
  FillPen(const FillPen&) = delete;
  FillPen& operator=(const FillPen&) = delete;

  /// Made when the first bar needs it; null when that failed.
  HPEN get() noexcept {
    if (pen_ == nullptr) pen_ = CreatePen(PS_SOLID, kFillWidth, kFillColour);
    return pen_;
  }

 private:
  HPEN pen_ = nullptr;
};

struct Canvas {
  HDC dc;
  const Layout& layout;
  FillPen& pen;
};

void DrawFill(const Canvas& canvas, const Bar& bar, int value) noexcept {
  HPEN pen = canvas.pen.get();
  HGDIOBJ previous = pen != nullptr ? SelectObject(canvas.dc, pen) : nullptr;
  if (previous == nullptr) return;
  const POINT line[] = {bar.fill_start, {bar.fill_start.x + value * bar.step, bar.fill_start.y}};
  Polyline(canvas.dc, line, 2);
  SelectObject(canvas.dc, previous);
}

void DrawBar(const Canvas& canvas, int row, int value) noexcept {
  if (value < 0) return;
  const Bar bar = canvas.layout.BarIn(row);
  DrawRectangle(canvas.dc, bar.outline);
  if (value > 0) DrawFill(canvas, bar, value);
}

void DrawSecondRow(const Canvas& canvas) noexcept {
  if (window_state.caption_shown.get() != 0) {
    DrawBar(canvas, kSecondRow, window_state.file_value.get());
    return;
  }
  CaptionText::Text caption;
  window_state.caption.Copy(caption);
  DrawLineOfText(canvas.dc, canvas.layout.Caption(), caption.view());
}

/// Asks the font's sizes and keeps what the other threads need of them.
FontSize Measure(HDC dc) noexcept {
  TEXTMETRICW metrics = {};
  GetTextMetricsW(dc, &metrics);
  const FontSize font = {metrics.tmHeight, metrics.tmInternalLeading, metrics.tmExternalLeading,
                         metrics.tmAveCharWidth};
  window_state.line_pitch.set(font.pitch());
  if (window_state.characters_per_line.get() == 0) {
    window_state.characters_per_line.set(GetDeviceCaps(dc, HORZRES) / (font.average_width + 1));
  }
  return font;
}

}  // namespace

ScreenKind CurrentScreenKind() noexcept {
  return {window_state.line_capacity.get(), window_state.bar_units.get(),
          window_state.small_screen.get()};
}

LRESULT PaintProgressWindow(HWND window) noexcept {
  FillPen pen;
  PAINTSTRUCT paint = {};
  HDC dc = BeginPaint(window, &paint);
  // An area that stays invalid would be reported for ever; the default handling settles it.
  if (dc == nullptr) return DefWindowProcW(window, WM_PAINT, 0, 0);

  RECT client = {};
  GetClientRect(window, &client);
  const Layout layout(client, Measure(dc), CurrentScreenKind());

  DrawRectangle(dc, layout.Frame());
  DrawRectangle(dc, layout.Background());
  // A bar's progress asks for the area below the lines only.
  if (paint.rcPaint.top == 0) DrawStatusLines(dc, layout);
  const Canvas canvas = {dc, layout, pen};
  DrawBar(canvas, kOverallRow, window_state.overall_value.get());
  DrawSecondRow(canvas);

  EndPaint(window, &paint);
  return 0;
}

}  // namespace report
