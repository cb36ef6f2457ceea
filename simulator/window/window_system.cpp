// Classes and windows.
#include "window/window_system.h"

#include <algorithm>
#include <utility>

#include "device/device.h"
#include "faults/api_call.h"
#include "profile/profile.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

char16_t Lower(char16_t unit) {
  return unit >= u'A' && unit <= u'Z' ? static_cast<char16_t>(unit - u'A' + u'a') : unit;
}

bool EqualNames(std::u16string_view a, std::u16string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char16_t left, char16_t right) { return Lower(left) == Lower(right); });
}

LPARAM Pair(int low, int high) {
  return static_cast<LPARAM>((static_cast<DWORD>(high) & 0xFFFFU) << 16U |
                             (static_cast<DWORD>(low) & 0xFFFFU));
}

}  // namespace

WindowSystem::WindowSystem(Device& device) : device_(device), world_(device.world()) {
  AddStockObjects();
  auto window = std::make_unique<Window>();
  window->handle = desktop_ = NewHandle<HWND>();
  window->frame = {0, 0, device.profile().screen_width, device.profile().screen_height};
  window->visible = true;
  window->surface =
      Image(device.profile().screen_width, device.profile().screen_height, kDesktopColour);
  windows_[desktop_] = std::move(window);
}

const WindowClass* WindowSystem::Register(const WNDCLASSW& definition) {
  if (ClassOf(definition.lpszClassName) != nullptr) return nullptr;
  auto made = std::make_unique<WindowClass>();
  made->name = definition.lpszClassName;
  made->procedure = definition.lpfnWndProc;
  made->background = definition.hbrBackground;
  made->atom = ++next_atom_;
  classes_.push_back(std::move(made));
  return classes_.back().get();
}

const WindowClass* WindowSystem::ClassOf(const WCHAR* name_or_atom) const {
  const auto number = reinterpret_cast<std::uintptr_t>(name_or_atom);
  const bool is_atom = number < 0x10000U;
  for (const auto& known : classes_) {
    if (is_atom ? known->atom == number : EqualNames(known->name, name_or_atom)) {
      return known.get();
    }
  }
  return nullptr;
}

Window* WindowSystem::Find(HWND handle) {
  const auto found = windows_.find(handle);
  if (found == windows_.end()) return nullptr;
  const SimThread* owner = found->second->owner;
  if (owner != nullptr && owner->state == SimThread::State::kFinished) {
    Remove(handle);
    return nullptr;
  }
  return found->second.get();
}

Window& WindowSystem::Create(const WindowClass& window_class, std::u16string title,
                             SimThread& owner) {
  auto made = std::make_unique<Window>();
  made->handle = NewHandle<HWND>();
  made->window_class = &window_class;
  made->title = std::move(title);
  made->owner = &owner;
  Window& window = *made;
  windows_[window.handle] = std::move(made);
  return window;
}

void WindowSystem::Remove(HWND handle) {
  if (active_ == handle) active_ = nullptr;
  order_.erase(std::remove(order_.begin(), order_.end(), handle), order_.end());
  for (auto& [id, queue] : queues_) {
    auto& posted = queue->posted;
    posted.erase(std::remove_if(posted.begin(), posted.end(),
                                [handle](const MSG& message) { return message.hwnd == handle; }),
                 posted.end());
  }
  for (auto& [key, message] : sent_) {
    if (message.window == handle && !message.taken) AnswerForGone(message);
  }
  windows_.erase(handle);
}

std::vector<HWND> WindowSystem::Order() {
  const std::vector<HWND> known = order_;
  for (HWND handle : known) static_cast<void>(Find(handle));
  return order_;
}

void WindowSystem::Raise(const Window& window) {
  if (window.handle == desktop_) return;
  order_.erase(std::remove(order_.begin(), order_.end(), window.handle), order_.end());
  auto place = order_.end();
  if ((window.extended_style & WS_EX_TOPMOST) == 0) {
    place = std::find_if(order_.begin(), order_.end(), [this](HWND handle) {
      return (windows_.at(handle)->extended_style & WS_EX_TOPMOST) != 0;
    });
  }
  order_.insert(place, window.handle);
}

HWND WindowSystem::TopVisible() {
  const std::vector<HWND> order = Order();
  for (auto at = order.rbegin(); at != order.rend(); ++at) {
    const Window& window = *windows_.at(*at);
    if (window.visible && !window.going) return *at;
  }
  return nullptr;
}

void WindowSystem::Activate(Lock& lock, HWND handle) {
  if (const Window* window = Find(handle); window != nullptr) Raise(*window);
  if (active_ == handle) return;
  HWND before = std::exchange(active_, handle);
  Send(lock, before, WM_ACTIVATE, WA_INACTIVE, reinterpret_cast<LPARAM>(handle));
  if (active_ != handle) return;  // the one before has given it to somebody else
  Send(lock, handle, WM_ACTIVATE, WA_ACTIVE, reinterpret_cast<LPARAM>(before));
}

bool WindowSystem::Show(Lock& lock, HWND handle, bool activate) {
  const bool was_visible = Find(handle)->visible;
  if (!was_visible) {
    Send(lock, handle, WM_SHOWWINDOW, TRUE, 0);
    Window* window = Find(handle);
    if (window == nullptr) return was_visible;
    // What the window does not paint keeps showing what was there before.
    Blit(window->surface, window->surface.area(), -window->frame.left, -window->frame.top,
         Compose());
    if (window->border > 0) {
      Outline(window->surface, window->surface.area(), window->surface.area(), kBlack);
    }
    window->visible = true;
    Invalidate(*window, nullptr, true);
    if (!std::exchange(window->placed, true)) {
      const RECT client = window->client();
      const LPARAM place =
          Pair(window->frame.left + window->border, window->frame.top + window->border);
      Send(lock, handle, WM_SIZE, 0, Pair(client.right, client.bottom));
      Send(lock, handle, WM_MOVE, 0, place);
    }
  }
  if (activate) Activate(lock, handle);
  return was_visible;
}

bool WindowSystem::Hide(Lock& lock, HWND handle) {
  if (!Find(handle)->visible) return false;
  Send(lock, handle, WM_SHOWWINDOW, FALSE, 0);
  Window* window = Find(handle);
  if (window == nullptr) return true;
  window->visible = false;
  window->update = {};
  window->erase = false;
  window->shown.clear();
  if (active_ == handle) Activate(lock, TopVisible());
  return true;
}

void WindowSystem::Destroy(Lock& lock, HWND handle) {
  Window* window = Find(handle);
  if (window == nullptr || std::exchange(window->going, true)) return;
  window->visible = false;
  if (active_ == handle) {
    active_ = nullptr;
    Send(lock, handle, WM_ACTIVATE, WA_INACTIVE, 0);
  }
  Send(lock, handle, WM_DESTROY, 0, 0);
  Remove(handle);
  if (active_ == nullptr) Activate(lock, TopVisible());
}

void WindowSystem::Invalidate(Window& window, const RECT* area, bool erase) {
  if (!window.visible || window.owner == nullptr) return;
  const RECT added = area == nullptr ? window.client() : Intersect(*area, window.client());
  if (IsEmpty(added)) return;
  window.update = Around(window.update, added);
  window.erase = window.erase || erase;
  world_.Notify(QueueOf(*window.owner).wake);
}

WindowSystem& SystemOf(const ApiCall& call) {
  return call.device().screen().system();
}

}  // namespace sim
