// Painting of the progress window. The window's own thread only.
#pragma once

#include <coredll.h>

#include "report/window/layout.h"

namespace report {

/// The screen's kind as the window found it.
[[nodiscard]] ScreenKind CurrentScreenKind() noexcept;

/// Answers WM_PAINT.
LRESULT PaintProgressWindow(HWND window) noexcept;

}  // namespace report
