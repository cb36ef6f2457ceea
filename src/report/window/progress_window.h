// The progress window: what an upgrade shows while it runs.
//
// A top-most window on a thread of its own shows the newest status lines, a bar for the whole
// upgrade and, below it, a bar for the file under way or a caption line. Whoever works feeds it
// from any thread; nobody waits for it to paint.
//
// Status lines, bar values and the caption are kept whether or not there is a window. All functions
// may be called by any thread at any time, except that StartGUI and CloseProgressWindow belong to
// the one thread that runs the upgrade.
#pragma once

#include <coredll.h>

namespace report {

/// How the window begins.
struct GuiStart {
  HINSTANCE instance;  ///< module that the window class belongs to
  int show_command;    ///< SW_SHOWNORMAL, or SW_HIDE for an upgrade that works unseen
};

/// Brings the window to the foreground when there is one. Otherwise starts the window's thread, if
/// `start` is given (it is copied) and no such thread exists, and returns once the window is there,
/// which is looked for every 100 ms, or once it is clear that it cannot be made.
void StartGUI(const GuiStart* start) noexcept;

/// Adds a status line; the oldest one leaves a full list. At most 167 characters are kept, and a
/// line too long for the screen ends in "...". Brings the window to the foreground. Without memory
/// for it the line is lost.
[[gnu::format(printf, 1, 2)]] void ShowStatus(const char* format, ...) noexcept;

/// Sets the upper bar. Values below 0 show an empty bar, values above 100 a full one.
void SetOverallProgress(int percent) noexcept;
/// Sets the lower bar, with the same rule.
void SetFileProgress(int percent) noexcept;

/// Shows the line "maker, serial" in place of the lower bar from the next paint on, for this
/// window and every later one. Null pointers are empty texts.
void ShowCaption(const char* maker, const char* serial) noexcept;

/// Has the whole window painted again, if there is one.
void RepaintWindow() noexcept;

/// Makes a hidden window visible; without a window nothing happens.
void ShowProgressWindow() noexcept;

/// Closes the window, waits at most 2000 ms for its thread to end, and forgets window, thread and
/// status lines, so that the next StartGUI makes a new window.
void CloseProgressWindow() noexcept;

}  // namespace report
