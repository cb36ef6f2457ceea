// Device contexts, drawing tools and the picture.
#include <algorithm>
#include <utility>

#include "device/device.h"
#include "profile/profile.h"
#include "window/window_system.h"

namespace sim {
namespace {

/// Stock objects are small numbers, below all handles that are made.
HGDIOBJ StockHandle(int index) {
  return reinterpret_cast<HGDIOBJ>(static_cast<std::uintptr_t>(0x100 + index));
}

GdiObject StockPen(int style, COLORREF colour) {
  return {Pen{style, 1, colour}, {}, true};
}
GdiObject StockBrush(bool hollow, COLORREF colour) {
  return {{}, Brush{hollow, colour}, true};
}

bool Touches(const RECT& a, const RECT& b) {
  return !IsEmpty(Intersect(a, b));
}

}  // namespace

void WindowSystem::AddStockObjects() {
  objects_ = {
      {StockHandle(WHITE_BRUSH), StockBrush(false, kWhite)},
      {StockHandle(GRAY_BRUSH), StockBrush(false, RGB(128, 128, 128))},
      {StockHandle(BLACK_BRUSH), StockBrush(false, kBlack)},
      {StockHandle(NULL_BRUSH), StockBrush(true, kBlack)},
      {StockHandle(WHITE_PEN), StockPen(PS_SOLID, kWhite)},
      {StockHandle(BLACK_PEN), StockPen(PS_SOLID, kBlack)},
      {StockHandle(NULL_PEN), StockPen(PS_NULL, kBlack)},
      {StockHandle(SYSTEM_FONT), {{}, {}, true}},
  };
}

HDC WindowSystem::OpenContext(HWND handle, const RECT& clip, bool painting) {
  HDC opened = NewHandle<HDC>();
  DeviceContext& context = contexts_[opened];
  context.window = handle;
  context.clip = clip;
  context.painting = painting;
  context.pen = StockHandle(BLACK_PEN);
  context.brush = StockHandle(WHITE_BRUSH);
  context.font = StockHandle(SYSTEM_FONT);
  return opened;
}

DeviceContext* WindowSystem::ContextOf(HDC handle) {
  const auto found = contexts_.find(handle);
  return found == contexts_.end() ? nullptr : &found->second;
}

void WindowSystem::CloseContext(HDC handle) {
  DeviceContext& context = contexts_.at(handle);
  if (Window* window = Find(context.window); window != nullptr && window->visible) {
    std::vector<Drawn>& shown = window->shown;
    if (context.painting) {
      shown.erase(
          std::remove_if(shown.begin(), shown.end(),
                         [&context](const Drawn& d) { return Touches(BoundsOf(d), context.clip); }),
          shown.end());
    }
    std::move(context.calls.begin(), context.calls.end(), std::back_inserter(shown));
  }
  contexts_.erase(handle);
}

HGDIOBJ WindowSystem::AddObject(GdiObject object) {
  auto* handle = NewHandle<HGDIOBJ>();
  objects_[handle] = object;
  return handle;
}

const GdiObject* WindowSystem::ObjectOf(HGDIOBJ handle) const {
  const auto found = objects_.find(handle);
  return found == objects_.end() ? nullptr : &found->second;
}

bool WindowSystem::RemoveObject(HGDIOBJ handle) {
  const GdiObject* object = ObjectOf(handle);
  if (object == nullptr) return false;
  if (object->stock) return true;
  for (const auto& [dc, context] : contexts_) {
    if (context.pen == handle || context.brush == handle) return false;
  }
  objects_.erase(handle);
  return true;
}

Pen WindowSystem::PenOf(const DeviceContext& context) const {
  return ObjectOf(context.pen)->pen.value_or(Pen{});
}

Brush WindowSystem::BrushOf(const DeviceContext& context) const {
  return ObjectOf(context.brush)->brush.value_or(Brush{});
}

std::optional<Brush> WindowSystem::BackgroundBrush(HBRUSH brush) const {
  if (brush == nullptr) return std::nullopt;
  const auto number = reinterpret_cast<std::uintptr_t>(brush);
  if (number == static_cast<std::uintptr_t>(COLOR_WINDOW) + 1) return Brush{};
  const GdiObject* object = ObjectOf(brush);
  return object == nullptr ? std::nullopt : object->brush;
}

Font& WindowSystem::font() {
  if (font_ == nullptr) font_ = MakeSystemFont();
  return *font_;
}

Image WindowSystem::Compose() {
  Image picture = desktop().surface;
  for (HWND handle : Order()) {
    const Window& window = *windows_.at(handle);
    if (window.visible) {
      Blit(picture, picture.area(), window.frame.left, window.frame.top, window.surface);
    }
  }
  return picture;
}

std::size_t WindowSystem::gdi_objects() const {
  return static_cast<std::size_t>(std::count_if(
      objects_.begin(), objects_.end(), [](const auto& entry) { return !entry.second.stock; }));
}

}  // namespace sim
