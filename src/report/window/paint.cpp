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

void DrawFill(HDC dc, const Bar& bar, int value) noexcept {
  HPEN pen = CreatePen(PS_SOLID, kFillWidth, kFillColour);
  if (pen == nullptr) return;
  HGDIOBJ previous = SelectObject(dc, pen);
  const POINT line[] = {bar.fill_start, {bar.fill_start.x + value * bar.step, bar.fill_start.y}};
  Polyline(dc, line, 2);
  SelectObject(dc, previous);
  DeleteObject(pen);
}

void DrawBar(HDC dc, const Bar& bar, int value) noexcept {
  if (value < 0) return;
  DrawRectangle(dc, bar.outline);
  if (value > 0) DrawFill(dc, bar, value);
}

void DrawSecondRow(HDC dc, const Layout& layout) noexcept {
  if (window_state.caption_shown.get() != 0) {
    DrawBar(dc, layout.BarIn(kSecondRow), window_state.file_value.get());
    return;
  }
  CaptionText::Text caption;
  window_state.caption.Copy(caption);
  DrawLineOfText(dc, layout.Caption(), caption.view());
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
  DrawBar(dc, layout.BarIn(kOverallRow), window_state.overall_value.get());
  DrawSecondRow(dc, layout);

  EndPaint(window, &paint);
  return 0;
}

}  // namespace report
