#include "report/window/progress_window.h"

#include <cstdarg>

#include "base/format.h"
#include "report/window/gui_thread.h"
#include "report/window/layout.h"
#include "report/window/paint.h"
#include "report/window/status_text.h"
#include "report/window/window_state.h"

namespace report {
namespace {

inline constexpr DWORD kPollMs = 100;
inline constexpr DWORD kCloseWaitMs = 2000;

/// Null areas mean the whole window. Without a window nothing is done: the platform would take the
/// null handle for all windows of the desktop.
void Invalidate(const RECT* area, bool erase) noexcept {
  HWND window = window_state.window.get();
  if (window != nullptr) InvalidateRect(window, area, erase ? TRUE : FALSE);
}

void BringToForeground() noexcept {
  HWND window = window_state.window.get();
  if (window != nullptr) SetForegroundWindow(window);
}

/// Pixels from line to line: as last painted, or asked of the font before the first paint.
int LinePitch(HWND window) noexcept {
  const int painted = window_state.line_pitch.get();
  if (painted != 0) return painted;
  HDC dc = GetDC(window);
  if (dc == nullptr) return 0;
  TEXTMETRICW metrics = {};
  GetTextMetricsW(dc, &metrics);
  ReleaseDC(window, dc);
  return metrics.tmExternalLeading + metrics.tmHeight;
}

void SetBar(Shared<int>& bar, int percent) noexcept {
  const int value = BarValue(percent, window_state.bar_units.get());
  const int before = bar.get();
  bar.set(value);

  HWND window = window_state.window.get();
  if (window == nullptr) return;
  FontSize font;
  font.height = LinePitch(window);
  RECT client = {};
  GetClientRect(window, &client);
  const RECT area = Layout(client, font, CurrentScreenKind()).BarArea();
  // A growing bar is drawn over the old one without flicker.
  Invalidate(&area, value < before);
}

void WaitForWindow() noexcept {
  HANDLE thread = window_state.thread.get();
  while (window_state.window.get() == nullptr && !window_state.cannot_be_made.get()) {
    const DWORD waited = WaitForSingleObject(thread, kPollMs);
    if (waited == WAIT_OBJECT_0) return;  // the thread is at its end: no window will come
    if (waited == WAIT_FAILED) Sleep(kPollMs);
  }
}

}  // namespace

void StartGUI(const GuiStart* start) noexcept {
  if (window_state.window.get() != nullptr) {
    BringToForeground();
    return;
  }
  if (start == nullptr || window_state.thread.get() != nullptr) return;

  OutputDebugStringW(TEXT("GUI Creating thread\r\n"));
  window_state.cannot_be_made.set(false);
  window_state.start = *start;
  DWORD thread_id = 0;
  window_state.thread.set(CreateThread(nullptr, 0, GUIMain, &window_state.start, 0, &thread_id));
  if (window_state.thread.get() != nullptr) WaitForWindow();
}

void ShowStatus(const char* format, ...) noexcept {
  char text[kStatusWorkSize];
  va_list arguments;
  va_start(arguments, format);
  const std::size_t length = base::FormatV(text, kStatusSize, format, arguments);
  va_end(arguments);
  const std::size_t shown = ShortenForScreen(text, length, window_state.characters_per_line.get());

  const LineList::Added added =
      window_state.lines.Add({text, shown}, window_state.line_capacity.get());
  if (added.oldest_left) Invalidate(nullptr, true);
  if (added.stored) Invalidate(nullptr, false);
  BringToForeground();
}

void SetOverallProgress(int percent) noexcept {
  SetBar(window_state.overall_value, percent);
}

void SetFileProgress(int percent) noexcept {
  SetBar(window_state.file_value, percent);
}

void ShowCaption(const char* maker, const char* serial) noexcept {
  char narrow[CaptionText::Text::capacity()];
  base::Format(narrow, sizeof narrow, "%s, %s", maker != nullptr ? maker : "",
               serial != nullptr ? serial : "");
  CaptionText::Text text;
  MultiByteToWideChar(CP_ACP, 0, narrow, -1, text.data(), static_cast<int>(text.capacity()));
  window_state.caption.Set(text);
  window_state.caption_shown.set(0);
}

void RepaintWindow() noexcept {
  Invalidate(nullptr, true);
}

void ShowProgressWindow() noexcept {
  HWND window = window_state.window.get();
  if (window != nullptr) ShowWindow(window, SW_SHOWNORMAL);
}

void CloseProgressWindow() noexcept {
  HWND window = window_state.window.get();
  // Tried twice: a window that misses this message would stay on top of everything.
  if (window != nullptr && PostMessageW(window, WM_CLOSE, 0, 0) == FALSE) {
    PostMessageW(window, WM_CLOSE, 0, 0);
  }
  HANDLE thread = window_state.thread.get();
  if (thread != nullptr) {
    WaitForSingleObject(thread, kCloseWaitMs);
    CloseHandle(thread);
  }
  window_state.thread.set(nullptr);
  window_state.window.set(nullptr);
  window_state.lines.Clear();
}

}  // namespace report
