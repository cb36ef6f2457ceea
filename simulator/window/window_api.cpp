// The API functions around windows.
#include <algorithm>
#include <utility>

#include "device/device.h"
#include "faults/api_call.h"
#include "profile/profile.h"
#include "window/window_system.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

/// Window names are compared without regard to case, as the class names are.
bool IsNamed(const std::u16string& name, const WCHAR* wanted) {
  if (wanted == nullptr) return true;
  const std::u16string_view other(wanted);
  const auto lower = [](char16_t unit) {
    return unit >= u'A' && unit <= u'Z' ? static_cast<char16_t>(unit - u'A' + u'a') : unit;
  };
  return std::equal(name.begin(), name.end(), other.begin(), other.end(),
                    [lower](char16_t a, char16_t b) { return lower(a) == lower(b); });
}

/// Lets `act` do the call's work on its window; without that window the call fails.
template <typename Act>
BOOL With(ApiCall& call, HWND handle, Act act) {
  if (call.failed()) return call.Return(FALSE);
  auto lock = call.world().Acquire();
  WindowSystem& system = SystemOf(call);
  Window* window = system.Find(handle);
  if (window == nullptr) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
  return act(system, lock, *window);
}

BOOL GiveArea(ApiCall& call, HWND handle, RECT* area, RECT (*area_of)(const Window&)) {
  call.Argument("window", handle);
  return With(call, handle, [&](WindowSystem&, World::Lock&, const Window& window) {
    if (area == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
    *area = area_of(window);
    return call.Return(TRUE);
  });
}

/// A window without a place of its own covers the desktop; there is no task bar to spare.
RECT FrameFor(const Profile& profile, int x, int y, int width, int height) {
  const int left = x == CW_USEDEFAULT ? 0 : x;
  const int top = x == CW_USEDEFAULT || y == CW_USEDEFAULT ? 0 : y;
  const int wide = width == CW_USEDEFAULT ? profile.screen_width - left : width;
  const int high =
      width == CW_USEDEFAULT || height == CW_USEDEFAULT ? profile.screen_height - top : height;
  return {left, top, left + std::clamp(wide, 0, 4096), top + std::clamp(high, 0, 4096)};
}

}  // namespace
}  // namespace sim

ATOM RegisterClassW(const WNDCLASSW* window_class) {
  sim::ApiCall call("RegisterClassW", ERROR_NOT_ENOUGH_MEMORY);
  if (window_class != nullptr) call.Argument("class", window_class->lpszClassName);
  if (call.failed()) return call.Return(ATOM{0});
  if (window_class == nullptr || window_class->lpszClassName == nullptr ||
      window_class->lpfnWndProc == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, ATOM{0});
  }
  const auto lock = call.world().Acquire();
  const sim::WindowClass* made = sim::SystemOf(call).Register(*window_class);
  if (made == nullptr) return call.Fail(ERROR_CLASS_ALREADY_EXISTS, ATOM{0});
  return call.Return(made->atom);
}

// NOLINTNEXTLINE(readability-function-size): the platform's signature
HWND CreateWindowExW(DWORD extended_style, const WCHAR* class_name, const WCHAR* title, DWORD style,
                     int x, int y, int width, int height, HWND parent, HMENU menu,
                     HINSTANCE instance, void* parameter) {
  static_cast<void>(instance);
  static_cast<void>(parameter);  // WM_CREATE carries nothing: the platform declares no record
  HWND none = nullptr;
  sim::ApiCall call("CreateWindowExW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("class", class_name);
  call.Argument("title", title);
  call.Argument("style", style);
  if (call.failed()) return call.Return(none);
  if (class_name == nullptr || parent != nullptr || menu != nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::WindowClass* window_class = system.ClassOf(class_name);
  if (window_class == nullptr) return call.Fail(ERROR_CANNOT_FIND_WND_CLASS, none);

  sim::Window& window = system.Create(*window_class, title != nullptr ? title : u"", call.thread());
  HWND handle = window.handle;
  window.style = style;
  window.extended_style = extended_style;
  window.border = (style & WS_BORDER) != 0 ? 1 : 0;
  window.frame = sim::FrameFor(call.device().profile(), x, y, width, height);
  window.surface = sim::Image(window.frame.right - window.frame.left,
                              window.frame.bottom - window.frame.top, sim::kDesktopColour);
  system.Raise(window);
  if (system.Send(lock, handle, WM_CREATE, 0, 0) == -1) {
    system.Destroy(lock, handle);
    return call.Return(none);
  }
  if ((style & WS_VISIBLE) != 0 && system.Find(handle) != nullptr) {
    system.Show(lock, handle, true);
  }
  return call.Return(system.Find(handle) != nullptr ? handle : none);
}

BOOL DestroyWindow(HWND handle) {
  sim::ApiCall call("DestroyWindow", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", handle);
  return sim::With(call, handle, [&](auto& system, auto& lock, const sim::Window& window) {
    if (window.owner != &call.thread()) return call.Fail(ERROR_ACCESS_DENIED, FALSE);
    system.Destroy(lock, handle);
    return call.Return(TRUE);
  });
}

BOOL ShowWindow(HWND handle, int command) {
  constexpr int kShowWithoutActivation = 4;
  constexpr int kShowAsItIs = 8;
  sim::ApiCall call("ShowWindow", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", handle);
  call.Argument("command", command);
  return sim::With(call, handle, [&](auto& system, auto& lock, const sim::Window& window) {
    if (&window == &system.desktop()) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
    const bool activate = command != kShowWithoutActivation && command != kShowAsItIs;
    const bool was_visible =
        command == SW_HIDE ? system.Hide(lock, handle) : system.Show(lock, handle, activate);
    return call.Return(was_visible ? TRUE : FALSE);
  });
}

BOOL UpdateWindow(HWND handle) {
  sim::ApiCall call("UpdateWindow", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", handle);
  return sim::With(call, handle, [&](auto& system, auto& lock, const sim::Window& window) {
    if (window.visible && !sim::IsEmpty(window.update)) system.Send(lock, handle, WM_PAINT, 0, 0);
    return call.Return(TRUE);
  });
}

BOOL InvalidateRect(HWND window, const RECT* area, BOOL erase) {
  sim::ApiCall call("InvalidateRect", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", window);
  if (area != nullptr) call.Argument("top", area->top);
  call.Argument("erase", erase);
  if (call.failed()) return call.Return(FALSE);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  if (window == nullptr) {  // every window of the desktop, whatever the other arguments say
    for (HWND handle : system.Order()) system.Invalidate(*system.Find(handle), nullptr, true);
    return call.Return(TRUE);
  }
  sim::Window* found = system.Find(window);
  if (found == nullptr) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
  system.Invalidate(*found, area, erase != FALSE);
  return call.Return(TRUE);
}

BOOL GetUpdateRect(HWND window, RECT* area, BOOL erase) {
  sim::ApiCall call("GetUpdateRect", sim::kCannotFail);
  call.Argument("window", window);
  static_cast<void>(erase);
  const auto lock = call.world().Acquire();
  const sim::Window* found = sim::SystemOf(call).Find(window);
  if (found == nullptr) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
  if (area != nullptr) *area = found->update;
  return call.Return(sim::IsEmpty(found->update) ? FALSE : TRUE);
}

BOOL GetClientRect(HWND window, RECT* area) {
  sim::ApiCall call("GetClientRect", ERROR_INVALID_WINDOW_HANDLE);
  return sim::GiveArea(call, window, area, [](const sim::Window& of) { return of.client(); });
}

BOOL GetWindowRect(HWND window, RECT* area) {
  sim::ApiCall call("GetWindowRect", ERROR_INVALID_WINDOW_HANDLE);
  return sim::GiveArea(call, window, area, [](const sim::Window& of) { return of.frame; });
}

HWND GetDesktopWindow() {
  sim::ApiCall call("GetDesktopWindow", sim::kCannotFail);
  const auto lock = call.world().Acquire();
  return call.Return(sim::SystemOf(call).desktop().handle);
}

BOOL IsWindow(HWND window) {
  sim::ApiCall call("IsWindow", sim::kCannotFail);
  call.Argument("window", window);
  const auto lock = call.world().Acquire();
  return call.Return(sim::SystemOf(call).Find(window) != nullptr ? TRUE : FALSE);
}

BOOL IsWindowVisible(HWND window) {
  sim::ApiCall call("IsWindowVisible", sim::kCannotFail);
  call.Argument("window", window);
  const auto lock = call.world().Acquire();
  const sim::Window* found = sim::SystemOf(call).Find(window);
  return call.Return(found != nullptr && found->visible ? TRUE : FALSE);
}

BOOL SetForegroundWindow(HWND handle) {
  sim::ApiCall call("SetForegroundWindow", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", handle);
  return sim::With(call, handle, [&](auto& system, auto& lock, const sim::Window& window) {
    if (&window == &system.desktop()) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
    system.Activate(lock, handle);
    return call.Return(TRUE);
  });
}

HWND GetForegroundWindow() {
  sim::ApiCall call("GetForegroundWindow", sim::kCannotFail);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  HWND none = nullptr;
  return call.Return(system.Find(system.active()) != nullptr ? system.active() : none);
}

HWND FindWindowW(const WCHAR* class_name, const WCHAR* title) {
  HWND none = nullptr;
  sim::ApiCall call("FindWindowW", ERROR_FILE_NOT_FOUND);
  call.Argument("class", class_name);
  call.Argument("title", title);
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const std::vector<HWND> order = system.Order();
  for (auto at = order.rbegin(); at != order.rend(); ++at) {
    const sim::Window& window = *system.Find(*at);
    if (sim::IsNamed(window.window_class->name, class_name) && sim::IsNamed(window.title, title)) {
      return call.Return(*at);
    }
  }
  return call.Fail(ERROR_FILE_NOT_FOUND, none);
}

int MessageBoxW(HWND window, const WCHAR* text, const WCHAR* caption, UINT style) {
  sim::ApiCall call("MessageBoxW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("window", window);
  call.Argument("text", text);
  call.Argument("caption", caption);
  if (call.failed()) return call.Return(0);
  const sim::ShownMessageBox box = {text != nullptr ? text : u"",
                                    caption != nullptr ? caption : u"Error", style};
  std::function<int(const sim::ShownMessageBox&)> answer;
  {
    const auto lock = call.world().Acquire();
    sim::WindowSystem& system = sim::SystemOf(call);
    system.message_boxes.push_back(box);
    answer = system.message_box_answer;
  }
  return call.Return(answer ? answer(box) : IDOK);
}
