// The API functions around painting: contexts, update areas, drawing tools.
#include <cstdio>
#include <utility>

#include "device/device.h"
#include "faults/api_call.h"
#include "profile/profile.h"
#include "window/window_system.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

constexpr int kDotsPerInch = 96;

/// Saves the picture of a finished paint; the first file that cannot be written ends the saving.
void SavePaint(Device& device, const std::filesystem::path& folder, std::uint64_t number) {
  char name[40];
  std::snprintf(name, sizeof name, "paint-%06llu.png", static_cast<unsigned long long>(number));
  std::string error;
  if (device.screen().SavePng(folder / name, error)) return;
  std::fprintf(stderr, "cesim: %s\n", error.c_str());
  device.screen().SavePaints({});
}

/// Tells who watches the screen. Runs without the lock.
void Announce(Device& device, const FinishedPaint& paint) {
  std::function<void(const FinishedPaint&)> listener;
  std::filesystem::path folder;
  {
    const auto lock = device.world().Acquire();
    listener = device.screen().system().paint_listener;
    folder = device.screen().system().paint_folder;
  }
  if (!folder.empty()) SavePaint(device, folder, paint.number);
  if (listener) listener(paint);
}

}  // namespace
}  // namespace sim

HDC BeginPaint(HWND window, PAINTSTRUCT* paint) {
  HDC none = nullptr;
  sim::ApiCall call("BeginPaint", ERROR_INVALID_WINDOW_HANDLE);
  call.Argument("window", window);
  if (call.failed()) return call.Return(none);
  if (paint == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, none);
  auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  sim::Window* found = system.Find(window);
  if (found == nullptr || found->owner == nullptr) {
    return call.Fail(ERROR_INVALID_WINDOW_HANDLE, none);
  }
  *paint = {};
  paint->rcPaint = std::exchange(found->update, RECT{});
  const bool erase = std::exchange(found->erase, false);
  HDC dc = system.OpenContext(window, paint->rcPaint, true);
  paint->hdc = dc;
  if (erase) {
    const LRESULT erased =
        system.Send(lock, window, WM_ERASEBKGND, reinterpret_cast<WPARAM>(dc), 0);
    paint->fErase = erased == 0 ? TRUE : FALSE;
  }
  system.ContextOf(dc)->erase = paint->fErase != FALSE;
  return call.Return(dc);
}

BOOL EndPaint(HWND window, const PAINTSTRUCT* paint) {
  sim::ApiCall call("EndPaint", sim::kCannotFail);
  call.Argument("window", window);
  if (paint == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  sim::FinishedPaint finished;
  {
    const auto lock = call.world().Acquire();
    sim::WindowSystem& system = sim::SystemOf(call);
    const sim::DeviceContext* context = system.ContextOf(paint->hdc);
    if (context == nullptr || !context->painting || context->window != window) {
      return call.Fail(ERROR_INVALID_HANDLE, FALSE);
    }
    finished = {++system.finished_paints, window, context->clip, context->erase, context->calls};
    system.CloseContext(paint->hdc);
  }
  sim::Announce(call.device(), finished);
  return call.Return(TRUE);
}

HDC GetDC(HWND window) {
  HDC none = nullptr;
  sim::ApiCall call("GetDC", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("window", window);
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::Window* found = window == nullptr ? &system.desktop() : system.Find(window);
  if (found == nullptr) return call.Fail(ERROR_INVALID_WINDOW_HANDLE, none);
  return call.Return(system.OpenContext(found->handle, found->client(), false));
}

int ReleaseDC(HWND window, HDC dc) {
  sim::ApiCall call("ReleaseDC", sim::kCannotFail);
  call.Argument("window", window);
  call.Argument("dc", dc);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  const sim::DeviceContext* context = system.ContextOf(dc);
  if (context == nullptr || context->painting) return call.Fail(ERROR_INVALID_HANDLE, 0);
  system.CloseContext(dc);
  return call.Return(1);
}

int GetDeviceCaps(HDC dc, int index) {
  sim::ApiCall call("GetDeviceCaps", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  call.Argument("index", index);
  if (call.failed()) return call.Return(0);
  const auto lock = call.world().Acquire();
  if (sim::SystemOf(call).ContextOf(dc) == nullptr) return call.Fail(ERROR_INVALID_HANDLE, 0);
  switch (index) {
    case HORZRES: return call.Return(call.device().profile().screen_width);
    case VERTRES: return call.Return(call.device().profile().screen_height);
    case LOGPIXELSX:
    case LOGPIXELSY: return call.Return(sim::kDotsPerInch);
    default: return call.Fail(ERROR_INVALID_PARAMETER, 0);
  }
}

HPEN CreatePen(int style, int width, COLORREF colour) {
  HPEN none = nullptr;
  sim::ApiCall call("CreatePen", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("style", style);
  call.Argument("width", width);
  call.Argument("colour", colour);
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  const sim::Pen pen = {style, width < 1 ? 1 : width, colour & 0xFFFFFFU};
  return call.Return(sim::SystemOf(call).AddObject({pen, {}, false}));
}

HGDIOBJ GetStockObject(int index) {
  HGDIOBJ none = nullptr;
  sim::ApiCall call("GetStockObject", sim::kCannotFail);
  call.Argument("index", index);
  const auto lock = call.world().Acquire();
  auto* handle = reinterpret_cast<HGDIOBJ>(static_cast<std::uintptr_t>(0x100 + index));
  const bool known = index >= 0 && sim::SystemOf(call).ObjectOf(handle) != nullptr;
  return known ? call.Return(handle) : call.Fail(ERROR_INVALID_PARAMETER, none);
}

HGDIOBJ SelectObject(HDC dc, HGDIOBJ object) {
  HGDIOBJ none = nullptr;
  sim::ApiCall call("SelectObject", ERROR_INVALID_HANDLE);
  call.Argument("dc", dc);
  call.Argument("object", object);
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  sim::WindowSystem& system = sim::SystemOf(call);
  sim::DeviceContext* context = system.ContextOf(dc);
  const sim::GdiObject* found = system.ObjectOf(object);
  if (context == nullptr || found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, none);
  if (found->pen.has_value()) return call.Return(std::exchange(context->pen, object));
  if (found->brush.has_value()) return call.Return(std::exchange(context->brush, object));
  return call.Return(std::exchange(context->font, object));
}

BOOL DeleteObject(HGDIOBJ object) {
  sim::ApiCall call("DeleteObject", sim::kCannotFail);
  call.Argument("object", object);
  const auto lock = call.world().Acquire();
  if (!sim::SystemOf(call).RemoveObject(object)) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return call.Return(TRUE);
}
