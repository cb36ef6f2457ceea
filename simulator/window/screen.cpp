#include "window/screen.h"

#include <algorithm>
#include <utility>

#include "device/device.h"
#include "window/window_system.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace sim {
namespace {

RECT BoundsOfLine(const DrawnLine& line) {
  RECT bounds = {};
  const int reach = line.pen_width / 2;
  for (const POINT& at : line.points) {
    bounds = Around(bounds, {at.x - reach, at.y - reach, at.x + reach + 1, at.y + reach + 1});
  }
  return bounds;
}

}  // namespace

RECT BoundsOf(const Drawn& drawn) {
  if (const auto* rectangle = std::get_if<DrawnRectangle>(&drawn)) return rectangle->area;
  if (const auto* text = std::get_if<DrawnText>(&drawn)) return text->area;
  return BoundsOfLine(std::get<DrawnLine>(drawn));
}

Screen::Screen(Device& device) : device_(device), system_(std::make_unique<WindowSystem>(device)) {}

Screen::~Screen() = default;

Image Screen::Snapshot() const {
  const auto lock = device_.world().Acquire();
  return system_->Compose();
}

bool Screen::SavePng(const std::filesystem::path& file, std::string& error) const {
  return WritePng(Snapshot(), file, error);
}

void Screen::OnPaint(std::function<void(const FinishedPaint&)> listener) {
  const auto lock = device_.world().Acquire();
  system_->paint_listener = std::move(listener);
}

void Screen::SavePaints(std::filesystem::path folder) {
  std::error_code ignored;  // a folder that cannot be made shows at the first picture
  if (!folder.empty()) std::filesystem::create_directories(folder, ignored);
  const auto lock = device_.world().Acquire();
  system_->paint_folder = std::move(folder);
}

std::uint64_t Screen::finished_paints() const {
  const auto lock = device_.world().Acquire();
  return system_->finished_paints;
}

std::vector<WindowInfo> Screen::Windows() const {
  const auto lock = device_.world().Acquire();
  std::vector<HWND> order = system_->Order();
  std::reverse(order.begin(), order.end());
  std::vector<WindowInfo> windows;
  for (HWND handle : order) {
    const Window& window = *system_->Find(handle);
    windows.push_back({handle, window.window_class->name, window.title, window.style,
                       window.extended_style, window.frame, window.visible,
                       system_->active() == handle, window.owner->id});
  }
  return windows;
}

std::vector<Drawn> Screen::Shown(HWND window) const {
  const auto lock = device_.world().Acquire();
  const Window* found = system_->Find(window);
  return found == nullptr ? std::vector<Drawn>{} : found->shown;
}

std::vector<ShownMessageBox> Screen::MessageBoxes() const {
  const auto lock = device_.world().Acquire();
  return system_->message_boxes;
}

void Screen::AnswerMessageBoxes(std::function<int(const ShownMessageBox&)> answer) {
  const auto lock = device_.world().Acquire();
  system_->message_box_answer = std::move(answer);
}

std::size_t Screen::gdi_objects() const {
  const auto lock = device_.world().Acquire();
  return system_->gdi_objects();
}

std::size_t Screen::device_contexts() const {
  const auto lock = device_.world().Acquire();
  return system_->device_contexts();
}

}  // namespace sim
