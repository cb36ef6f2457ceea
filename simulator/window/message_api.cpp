// The API functions around messages.
#include "device/device.h"
#include "faults/api_call.h"
#include "window/window_system.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

constexpr BOOL kGetMessageError = -1;

}  // namespace
}  // namespace sim

LRESULT DefWindowProcW(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  static_cast<void>(lparam);
  sim::ApiCall call("DefWindowProcW", sim::kCannotFail);
  call.Argument("window", window);
  call.Argument("message", message);
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  sim::Window* found = system.Find(window);
  if (found == nullptr || found->window_class == nullptr) return call.Return(LRESULT{0});
  switch (message) {
    case WM_CLOSE:
      if (found->owner == &call.thread()) system.Destroy(lock, window);
      return call.Return(LRESULT{0});
    case WM_PAINT:
      found->update = {};
      found->erase = false;
      return call.Return(LRESULT{0});
    case WM_ERASEBKGND: {
      const auto brush = system.BackgroundBrush(found->window_class->background);
      const sim::DeviceContext* context = system.ContextOf(reinterpret_cast<HDC>(wparam));
      if (!brush.has_value() || brush->hollow || context == nullptr) return call.Return(LRESULT{0});
      const RECT area = sim::Moved(context->clip, found->border, found->border);
      sim::Fill(found->surface, area, area, brush->colour);
      return call.Return(LRESULT{1});
    }
    default: return call.Return(LRESULT{0});
  }
}

BOOL GetMessageW(MSG* message, HWND window, UINT first, UINT last) {
  sim::ApiCall call("GetMessageW", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", window);
  if (call.failed()) return call.Return(sim::kGetMessageError);
  if (message == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, sim::kGetMessageError);
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  if (window != nullptr && system.Find(window) == nullptr) {
    return call.Fail(ERROR_INVALID_WINDOW_HANDLE, sim::kGetMessageError);
  }
  const sim::WindowSystem::Filter filter = {window, first, last};
  sim::MessageQueue& queue = system.QueueOf(call.thread());
  while (true) {
    if (system.AnswerSent(lock, call.thread())) continue;
    if (system.Take(call.thread(), filter, true, *message)) break;
    queue.waits = {&queue.wake};
    call.world().Block(lock, queue.waits, std::nullopt);
  }
  call.Argument("message", message->message);
  return call.Return(message->message == WM_QUIT ? FALSE : TRUE);
}

BOOL PeekMessageW(MSG* message, HWND window, UINT first, UINT last, UINT remove) {
  sim::ApiCall call("PeekMessageW", sim::kCannotFail);
  call.Argument("window", window);
  if (message == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  while (system.AnswerSent(lock, call.thread())) {
  }
  const bool found =
      system.Take(call.thread(), {window, first, last}, (remove & PM_REMOVE) != 0, *message);
  const bool taken = found && (remove & PM_REMOVE) != 0 && message->message != WM_PAINT;
  if (!taken) call.world().Yield(lock);  // the next look would find the same
  return call.Return(found ? TRUE : FALSE);
}

BOOL TranslateMessage(const MSG* message) {
  sim::ApiCall call("TranslateMessage", sim::kCannotFail);
  static_cast<void>(message);
  return call.Return(FALSE);  // no keys: nothing to translate
}

LRESULT DispatchMessageW(const MSG* message) {
  sim::ApiCall call("DispatchMessageW", sim::kCannotFail);
  if (message == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, LRESULT{0});
  call.Argument("window", message->hwnd);
  call.Argument("message", message->message);
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::Window* window = system.Find(message->hwnd);
  if (window == nullptr || window->owner != &call.thread()) return call.Return(LRESULT{0});
  return call.Return(
      system.CallProcedure(lock, *window, message->message, message->wParam, message->lParam));
}

BOOL PostMessageW(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  sim::ApiCall call("PostMessageW", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", window);
  call.Argument("message", message);
  if (call.failed()) return call.Return(FALSE);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  if (window == nullptr) {  // to the caller's own thread
    sim::Window own;
    own.owner = &call.thread();
    system.Post(own, message, wparam, lparam);
    return call.Return(TRUE);
  }
  const sim::Window* found = system.Find(window);
  if (found == nullptr || found->owner == nullptr) {
    return call.Fail(ERROR_INVALID_WINDOW_HANDLE, FALSE);
  }
  system.Post(*found, message, wparam, lparam);
  return call.Return(TRUE);
}

LRESULT SendMessageW(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  sim::ApiCall call("SendMessageW", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", window);
  call.Argument("message", message);
  if (call.failed()) return call.Return(LRESULT{0});
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  if (system.Find(window) == nullptr) {
    return call.Fail(ERROR_INVALID_WINDOW_HANDLE, LRESULT{0});
  }
  return call.Return(system.Send(lock, window, message, wparam, lparam));
}

void PostQuitMessage(int exit_code) {
  sim::ApiCall call("PostQuitMessage", sim::kCannotFail);
  call.Argument("code", exit_code);
  const auto lock = call.world().Acquire();
  sim::MessageQueue& queue = sim::SystemOf(call).QueueOf(call.thread());
  queue.quit = exit_code;
  call.world().Notify(queue.wake);
}
