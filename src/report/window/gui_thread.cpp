#include "report/window/gui_thread.h"

#include "report/window/paint.h"
#include "report/window/progress_window.h"
#include "report/window/window_state.h"

namespace report {
namespace {

inline constexpr const WCHAR* kClassName = TEXT("TWUpgrade");
inline constexpr const WCHAR* kTitle = TEXT("TW Upgrade");
inline constexpr const WCHAR* kPackageInstallerClass = TEXT("WCELOAD");

/// The device's window manager knows this style bit by number only.
inline constexpr DWORD kExtendedStyle = WS_EX_TOPMOST | 0x00020000U;

inline constexpr int kNormalScreenWidth = 240;
inline constexpr int kNormalScreenHeight = 320;

inline constexpr DWORD kNoWindowExitCode = 8;

LRESULT OnPaint(HWND window, UINT, WPARAM, LPARAM) {
  return PaintProgressWindow(window);
}

LRESULT OnSize(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  return DefWindowProcW(window, message, wparam, lparam);
}

LRESULT OnTimer(HWND, UINT, WPARAM, LPARAM) {
  return 0;
}

LRESULT OnClose(HWND window, UINT, WPARAM, LPARAM) {
  // A window that stays would cover the device; it cannot outlive its thread.
  if (DestroyWindow(window) == FALSE) PostQuitMessage(0);
  return 0;
}

LRESULT OnDestroy(HWND, UINT, WPARAM, LPARAM) {
  PostQuitMessage(0);
  return 0;
}

/// KEPT ODDITY: a window that loses the foreground looks for the package installer's window and
/// does nothing with what it finds.
LRESULT OnActivate(HWND, UINT, WPARAM wparam, LPARAM) {
  if (LOWORD(wparam) == WA_INACTIVE) {
    static_cast<void>(FindWindowW(kPackageInstallerClass, nullptr));
  }
  return 0;
}

struct MessageRow {
  UINT message;
  LRESULT (*handle)(HWND window, UINT message, WPARAM wparam, LPARAM lparam);
};

// Searched in this order.
inline constexpr MessageRow kMessages[] = {
    {WM_PAINT, OnPaint}, {WM_SIZE, OnSize},       {WM_TIMER, OnTimer},
    {WM_CLOSE, OnClose}, {WM_DESTROY, OnDestroy}, {WM_ACTIVATE, OnActivate},
};

LRESULT CALLBACK WindowProcedure(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  for (const MessageRow& row : kMessages) {
    if (row.message == message) return row.handle(window, message, wparam, lparam);
  }
  return DefWindowProcW(window, message, wparam, lparam);
}

/// A process that has seen a small screen keeps its line capacity and its bars' place even if a
/// later window finds a larger one; only the bar units follow.
void FitToScreen() noexcept {
  RECT desktop = {};
  GetWindowRect(GetDesktopWindow(), &desktop);
  if (desktop.right - desktop.left < kNormalScreenWidth ||
      desktop.bottom - desktop.top < kNormalScreenHeight) {
    window_state.small_screen.set(true);
    window_state.bar_units.set(kBarUnitsSmall);
    window_state.line_capacity.set(kLineCapacitySmall);
  } else {
    window_state.bar_units.set(kBarUnits);
  }
}

HWND InitInstance(HINSTANCE instance) noexcept {
  window_state.characters_per_line.set(0);
  window_state.line_pitch.set(0);
  FitToScreen();

  WNDCLASSW window_class = {};
  window_class.lpfnWndProc = WindowProcedure;
  window_class.hInstance = instance;
  window_class.lpszClassName = kClassName;
  // Fails from the second job of a process on: the class is there already.
  RegisterClassW(&window_class);
  return CreateWindowExW(kExtendedStyle, kClassName, kTitle, WS_VISIBLE | WS_BORDER, CW_USEDEFAULT,
                         CW_USEDEFAULT, CW_USEDEFAULT, CW_USEDEFAULT, nullptr, nullptr, instance,
                         nullptr);
}

void RunMessageLoop() noexcept {
  MSG message = {};
  // Below 0 is an error of the call, which would only repeat itself.
  while (GetMessageW(&message, nullptr, 0, 0) > 0) {
    TranslateMessage(&message);
    DispatchMessageW(&message);
  }
}

}  // namespace

DWORD WINAPI GUIMain(void* start) noexcept {
  const GuiStart begin = *static_cast<const GuiStart*>(start);
  window_state.lines.Clear();
  window_state.overall_value.set(0);
  window_state.file_value.set(0);

  HWND window = InitInstance(begin.instance);
  if (IsWindow(window) == FALSE) {
    // Said before the message box, which waits for somebody to press its button.
    window_state.cannot_be_made.set(true);
    MessageBoxW(nullptr, TEXT("GUIMain - bad InitInstance"), TEXT("Info"), MB_OK);
    return kNoWindowExitCode;
  }
  window_state.window.set(window);
  ShowWindow(window, begin.show_command);
  UpdateWindow(window);
  RunMessageLoop();
  OutputDebugStringW(TEXT("GUIMAIN Exiting\r\n"));
  return 0;
}

}  // namespace report
