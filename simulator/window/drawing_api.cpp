// The API functions that draw.
#include <string>
#include <utility>

#include "device/device.h"
#include "faults/api_call.h"
#include "window/window_system.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

constexpr UINT kOpaqueRectangle = 2;
constexpr UINT kClipped = 4;
constexpr UINT kLongestText = 8192;

/// Where a context's drawing goes. Nothing is drawn into a window that cannot be seen.
struct Target {
  DeviceContext* context = nullptr;
  Window* window = nullptr;

  explicit Target(WindowSystem& system, HDC dc) : context(system.ContextOf(dc)) {
    if (context != nullptr) window = system.Find(context->window);
  }
  [[nodiscard]] bool draws() const { return window != nullptr && window->visible; }
  [[nodiscard]] RECT OnSurface(const RECT& client) const {
    return Moved(client, window->border, window->border);
  }
  [[nodiscard]] RECT clip() const { return OnSurface(Intersect(context->clip, window->client())); }
};

RECT InOrder(int left, int top, int right, int bottom) {
  return {std::min(left, right), std::min(top, bottom), std::max(left, right),
          std::max(top, bottom)};
}

void DrawRectangle(const Target& target, const RECT& area, const Pen& pen, const Brush& brush) {
  Image& image = target.window->surface;
  const RECT place = target.OnSurface(area);
  if (!brush.hollow) Fill(image, target.clip(), place, brush.colour);
  if (pen.style == PS_NULL) return;
  // A thicker outline grows inwards.
  for (int ring = 0; ring < pen.width; ++ring) {
    const RECT edge = {place.left + ring, place.top + ring, place.right - ring,
                       place.bottom - ring};
    if (IsEmpty(edge)) return;
    Outline(image, target.clip(), edge, pen.colour);
  }
}

TEXTMETRICW TextMetricsOf(const FontMetrics& font) {
  TEXTMETRICW metrics = {};
  metrics.tmHeight = font.height;
  metrics.tmAscent = font.ascent;
  metrics.tmDescent = font.descent;
  metrics.tmInternalLeading = font.internal_leading;
  metrics.tmExternalLeading = font.external_leading;
  metrics.tmAveCharWidth = font.average_width;
  metrics.tmMaxCharWidth = font.max_width;
  metrics.tmWeight = 400;
  metrics.tmDigitizedAspectX = 96;
  metrics.tmDigitizedAspectY = 96;
  metrics.tmFirstChar = u' ';
  metrics.tmLastChar = 0xFFFC;
  metrics.tmDefaultChar = 0x1F;
  metrics.tmBreakChar = u' ';
  metrics.tmPitchAndFamily = 0x27;  // variable pitch, outlines, sans serif
  return metrics;
}

int WidthOf(Font& font, std::u16string_view text, const INT* spacing) {
  int width = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    width += spacing != nullptr ? spacing[i] : font.GlyphOf(text[i]).advance;
  }
  return width;
}

struct TextCall {
  POINT at;
  UINT options;
  const RECT* area;
  std::u16string_view text;
  const INT* spacing;
};

void DrawTextCall(const Target& target, Font& font, const TextCall& what) {
  const int width = WidthOf(font, what.text, what.spacing);
  const RECT cells = {what.at.x, what.at.y, what.at.x + width, what.at.y + font.metrics().height};
  target.context->calls.emplace_back(
      DrawnText{cells, std::u16string(what.text), target.context->text_colour});
  if (!target.draws()) return;

  Image& image = target.window->surface;
  RECT clip = target.clip();
  if (what.area != nullptr && (what.options & kOpaqueRectangle) != 0) {
    Fill(image, clip, target.OnSurface(*what.area), kWhite);
  }
  if (what.area != nullptr && (what.options & kClipped) != 0) {
    clip = Intersect(clip, target.OnSurface(*what.area));
  }
  const RECT place = target.OnSurface(cells);
  if (target.context->background_mode == OPAQUE) Fill(image, clip, place, kWhite);
  Text(image, clip, font,
       {{place.left, place.top}, what.text, what.spacing, target.context->text_colour});
}

}  // namespace
}  // namespace sim

BOOL GetTextMetricsW(HDC dc, TEXTMETRICW* metrics) {
  sim::ApiCall call("GetTextMetricsW", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  if (call.failed()) return call.Return(FALSE);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  if (system.ContextOf(dc) == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  if (metrics == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  *metrics = sim::TextMetricsOf(system.font().metrics());
  return call.Return(TRUE);
}

BOOL Rectangle(HDC dc, int left, int top, int right, int bottom) {
  sim::ApiCall call("Rectangle", ERROR_INVALID_HANDLE);
  call.Argument("left", left);
  call.Argument("top", top);
  call.Argument("right", right);
  call.Argument("bottom", bottom);
  if (call.failed()) return call.Return(FALSE);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::Target target(system, dc);
  if (target.context == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  const sim::Pen pen = system.PenOf(*target.context);
  const sim::Brush brush = system.BrushOf(*target.context);
  const RECT area = sim::InOrder(left, top, right, bottom);
  target.context->calls.emplace_back(
      sim::DrawnRectangle{area, pen.style == PS_NULL ? 0 : pen.width, pen.colour, brush.colour});
  if (target.draws()) sim::DrawRectangle(target, area, pen, brush);
  return call.Return(TRUE);
}

BOOL Polyline(HDC dc, const POINT* points, int count) {
  sim::ApiCall call("Polyline", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  call.Argument("count", count);
  if (call.failed()) return call.Return(FALSE);
  if (points == nullptr || count < 2) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::Target target(system, dc);
  if (target.context == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  const sim::Pen pen = system.PenOf(*target.context);
  target.context->calls.emplace_back(
      sim::DrawnLine{std::vector<POINT>(points, points + count), pen.width, pen.colour});
  if (!target.draws() || pen.style == PS_NULL) return call.Return(TRUE);
  const int border = target.window->border;
  for (int i = 1; i < count; ++i) {
    sim::Line(target.window->surface, target.clip(),
              {points[i - 1].x + border, points[i - 1].y + border},
              {points[i].x + border, points[i].y + border}, pen.width, pen.colour);
  }
  return call.Return(TRUE);
}

int SetBkMode(HDC dc, int mode) {
  sim::ApiCall call("SetBkMode", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  call.Argument("mode", mode);
  if (call.failed()) return call.Return(0);
  const auto lock = call.world().Acquire();
  sim::DeviceContext* context = sim::SystemOf(call).ContextOf(dc);
  if (context == nullptr) return call.Fail(ERROR_INVALID_HANDLE, 0);
  if (mode != TRANSPARENT && mode != OPAQUE) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  return call.Return(std::exchange(context->background_mode, mode));
}

COLORREF SetTextColor(HDC dc, COLORREF colour) {
  constexpr COLORREF kNoColour = 0xFFFFFFFFU;
  sim::ApiCall call("SetTextColor", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  call.Argument("colour", colour);
  if (call.failed()) return call.Return(kNoColour);
  const auto lock = call.world().Acquire();
  sim::DeviceContext* context = sim::SystemOf(call).ContextOf(dc);
  if (context == nullptr) return call.Fail(ERROR_INVALID_HANDLE, kNoColour);
  return call.Return(std::exchange(context->text_colour, colour & 0xFFFFFFU));
}

// NOLINTNEXTLINE(readability-function-size): the platform's signature
BOOL ExtTextOutW(HDC dc, int x, int y, UINT options, const RECT* clip, const WCHAR* text,
                 UINT length, const INT* spacing) {
  sim::ApiCall call("ExtTextOutW", ERROR_INVALID_HANDLE);
  call.Argument("x", x);
  call.Argument("y", y);
  if (call.failed()) return call.Return(FALSE);
  if ((text == nullptr && length > 0) || length > sim::kLongestText) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::u16string shown(text != nullptr ? text : u"", length);
  call.Argument("text", shown.c_str());
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::Target target(system, dc);
  if (target.context == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  sim::DrawTextCall(target, system.font(), {{x, y}, options, clip, shown, spacing});
  return call.Return(TRUE);
}
