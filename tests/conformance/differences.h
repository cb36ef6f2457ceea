// Where desktop Windows, as Wine has it, answers otherwise than the device. The device's answer is
// the right one here: a test asserts it wherever it runs, but for what stands in this table.
// docs/platform.md shows the same rows.
#pragma once

#include <cstddef>

namespace conformance {

enum class Difference {
  kNewAttribute,
  kDots,
  kReplace,
  kReplaceOpen,
  kReadOnly,
  kBackslashes,
  kCreationTime,
  kMoveCase,
  kCopyAttributes,
  kFindClose,
  kFreeSpace,
  kSemaphore,
  kDebugError,
  kNoProgram,
  kPseudoHandle,
  kUtf8,
  kCalendar,
  kDivision,
  kHostName,
  kUnconnected,
  kAccept,
  kAddressRoom,
  kShortRoom,
  kSwitchSize,
  kMemberships,
  kCommands,
  kEmptyAddress,
  kNoClass,
  kGoneWindow,
  kFrameMessages,
  kPaintOnce,
  kStockPens,
  kPaintContext,
  kMessageBox,
  kCount
};

struct Row {
  Difference difference;
  const char* call;
  const char* device;
  const char* desktop;
};

inline constexpr Row kDifferences[] = {
    {Difference::kNewAttribute, "SetFileAttributesW, GetFileAttributesW, FindFirstFileW",
     "keep exactly the attributes that were set",
     "tell FILE_ATTRIBUTE_ARCHIVE of every file, whatever was set; ordinary users cannot set "
     "others together with FILE_ATTRIBUTE_READONLY"},
    {Difference::kDots, "FindFirstFileW", "finds neither \".\" nor \"..\"", "finds both"},
    {Difference::kReplace, "CreateFileW (CREATE_ALWAYS)",
     "refuses a file that is read-only, hidden or a system file", "replaces it"},
    {Difference::kReplaceOpen, "CreateFileW (CREATE_ALWAYS)",
     "refuses a file that another has open, whatever access is asked for",
     "replaces it when only reading is asked for, and shared"},
    {Difference::kReadOnly, "CreateFileW (GENERIC_WRITE)", "refuses a read-only file",
     "opens it when the system administrator asks"},
    {Difference::kBackslashes, "all calls with paths", "take several backslashes for one",
     "take two in front for the name of another machine"},
    {Difference::kCreationTime, "SetFileTime", "leaves the times alone that are not given",
     "moves the time of creation back to that of the last writing"},
    {Difference::kMoveCase, "MoveFileW", "changes the letter case of a name",
     "leaves the name as it is"},
    {Difference::kCopyAttributes, "CopyFileW",
     "copies the attributes, and refuses a target that is hidden", "copies the content only"},
    {Difference::kFindClose, "FindClose", "refuses a search that is closed", "takes it as done"},
    {Difference::kFreeSpace, "GetDiskFreeSpaceExW",
     "names a missing folder with ERROR_PATH_NOT_FOUND", "with ERROR_FILE_NOT_FOUND"},
    {Difference::kSemaphore, "ReleaseSemaphore", "refuses a count of 0", "takes it"},
    {Difference::kDebugError, "OutputDebugStringW", "leaves the last error alone", "changes it"},
    {Difference::kNoProgram, "CreateProcessW", "refuses to start nothing",
     "reads from address 0, and the process ends"},
    {Difference::kPseudoHandle, "GetExitCodeProcess", "refuses INVALID_HANDLE_VALUE",
     "takes it for the calling process"},
    {Difference::kUtf8, "WideCharToMultiByte (CP_UTF8)", "refuses a substitute", "passes it over"},
    {Difference::kCalendar, "SystemTimeToFileTime", "refuses 29 February of a common year",
     "takes it for 1 March"},
    {Difference::kDivision, "SetSystemMemoryDivision", "moves pages between store and programs",
     "fails: the store is a disk"},
    {Difference::kHostName, "gethostname", "needs WSAStartup", "does not"},
    {Difference::kUnconnected, "send", "names a missing connection with WSAENOTCONN",
     "with another error"},
    {Difference::kAccept, "accept, recvfrom",
     "refuse a socket that does not listen, or is not bound", "wait for ever"},
    {Difference::kAddressRoom, "recvfrom", "leaves the room behind an address alone", "clears it"},
    {Difference::kShortRoom, "recvfrom, getsockname, setsockopt",
     "refuse too little room with WSAEFAULT", "cut what does not fit, or answer WSAEINVAL"},
    {Difference::kSwitchSize, "getsockopt", "tells of a switch in four bytes", "in one byte"},
    {Difference::kMemberships, "setsockopt (IP_ADD_MEMBERSHIP, IP_DROP_MEMBERSHIP)",
     "name what is no group, or not joined, with WSAEADDRNOTAVAIL", "with WSAEINVAL"},
    {Difference::kCommands, "ioctlsocket", "refuses an unknown command with WSAEINVAL",
     "with WSAEOPNOTSUPP"},
    {Difference::kEmptyAddress, "inet_addr", "takes \"\" for 0.0.0.0", "for no address"},
    {Difference::kNoClass, "CreateWindowExW",
     "names a missing class with ERROR_CANNOT_FIND_WND_CLASS", "with ERROR_CLASS_DOES_NOT_EXIST"},
    {Difference::kGoneWindow, "DestroyWindow, UpdateWindow",
     "refuse a window that is gone with ERROR_INVALID_WINDOW_HANDLE",
     "name no reason, or take it as done"},
    {Difference::kFrameMessages, "window procedures",
     "see the messages of the device, which has no frames, themes and input methods",
     "see those of frames and of the order of windows, too"},
    {Difference::kPaintOnce, "PeekMessageW", "finds nothing once a shown window is valid",
     "finds messages of the desktop's own"},
    {Difference::kStockPens, "DeleteObject", "refuses a tool in use",
     "deletes it, and keeps it until it is put away"},
    {Difference::kPaintContext, "ReleaseDC, EndPaint, drawing",
     "refuse a context of another kind, or one that is gone",
     "take it, because contexts are kept and given out again"},
    {Difference::kMessageBox, "MessageBoxW", "is answered by the simulated device's user",
     "waits for somebody"},
};
inline constexpr auto kRows = sizeof kDifferences / sizeof kDifferences[0];
static_assert(kRows == static_cast<std::size_t>(Difference::kCount));

/// Whether the tests run on desktop Windows. Each target's environment says it; there, with
/// ORVENIX_DEVICE_ANSWERS set, the table is left out: what fails then shows that its rows are true.
bool OnDesktop();

/// Whether this platform answers otherwise than the device.
/// @param difference  why that may be; it is no matter of code but of whoever reads the test
inline bool Differs(Difference difference) {
  return OnDesktop() && difference != Difference::kCount;
}

}  // namespace conformance
