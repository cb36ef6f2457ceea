// The progress window's thread.
#pragma once

#include <coredll.h>

namespace report {

/// Makes the window and runs its message loop. A thread's start routine.
/// @param start  a GuiStart that lives as long as the thread
/// @return 0 after the message loop, 8 when the window cannot be made.
DWORD WINAPI GUIMain(void* start) noexcept;

}  // namespace report
