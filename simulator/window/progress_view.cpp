#include "window/progress_view.h"

#include "locale/code_pages.h"

namespace sim {
namespace {

constexpr int kBarHeight = 10;
constexpr int kFillWidth = 8;
constexpr int kUnits = 38;
constexpr int kUnitsSmall = 48;

BarView EmptyBar(const RECT& outline) {
  const int inside = outline.right - outline.left - 2;
  if (inside <= 0) return {};
  return {0, inside % kUnits == 0 ? kUnits : kUnitsSmall};
}

void FillBar(BarView& bar, const RECT& outline, const DrawnLine& fill) {
  const int inside = outline.right - outline.left - 2;
  if (bar.total == 0 || fill.pen_width != kFillWidth || fill.points.size() != 2) return;
  bar.filled = (fill.points[1].x - fill.points[0].x) / (inside / bar.total);
}

}  // namespace

ProgressView ReadProgress(const std::vector<Drawn>& shown) {
  ProgressView view;
  RECT outline = {};
  std::optional<BarView>* bar = nullptr;
  for (const Drawn& drawn : shown) {
    if (const auto* rectangle = std::get_if<DrawnRectangle>(&drawn)) {
      if (rectangle->area.bottom - rectangle->area.top != kBarHeight) continue;
      bar = bar == nullptr ? &view.overall : &view.file;
      outline = rectangle->area;
      *bar = EmptyBar(outline);
    } else if (const auto* line = std::get_if<DrawnLine>(&drawn)) {
      if (bar != nullptr) FillBar(**bar, outline, *line);
    } else if (bar == nullptr) {
      view.status_lines.push_back(ToUtf8(std::get<DrawnText>(drawn).text));
    } else {
      view.caption = ToUtf8(std::get<DrawnText>(drawn).text);
    }
  }
  return view;
}

std::optional<ProgressView> ReadProgress(const Screen& screen) {
  for (const WindowInfo& window : screen.Windows()) {
    if (window.class_name != u"TWUpgrade" || !window.visible) continue;
    return ReadProgress(screen.Shown(window.handle));
  }
  return std::nullopt;
}

}  // namespace sim
