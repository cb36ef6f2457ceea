// Streams, windows, debug output and the calls that desktop Windows has under another name.
#define ORVENIX_DESKTOP_NAMES
#include <coredll.h>

#include <cstdarg>
#include <cstring>
#include <cwchar>
#include <string>

extern "C" {

FILE* PlatformFopen(const char* name, const char* mode) {
  std::string binary = mode;
  if (binary.find('b') == std::string::npos) binary += 'b';
  return fopen(name, binary.c_str());
}

HWND PlatformCreateWindowExW(DWORD extended, const WCHAR* name, const WCHAR* title, DWORD style,
                             int x, int y, int width, int height, HWND parent, HMENU menu,
                             HINSTANCE instance, void* parameter) {
  // What else the device's window manager is told by numbers means something else here.
  const DWORD known = extended & WS_EX_TOPMOST;
  if (x != CW_USEDEFAULT || parent != nullptr) {
    return CreateWindowExW(known, name, title, style, x, y, width, height, parent, menu, instance,
                           parameter);
  }
  return CreateWindowExW(known, name, title, style | WS_POPUP, 0, 0, GetSystemMetrics(SM_CXSCREEN),
                         GetSystemMetrics(SM_CYSCREEN), parent, menu, instance, parameter);
}

HPEN PlatformCreatePen(int style, int width, COLORREF colour) {
  if (style != PS_SOLID || width <= 1) return CreatePen(style, width, colour);
  const LOGBRUSH brush = {BS_SOLID, colour, 0};
  return ExtCreatePen(PS_GEOMETRIC | PS_SOLID | PS_ENDCAP_FLAT, static_cast<DWORD>(width), &brush,
                      0, nullptr);
}

/// To the debugger, as far as there is one.
void NKDbgPrintfW(const WCHAR* format, ...) {
  const DWORD error = GetLastError();
  WCHAR text[512];
  constexpr std::size_t kLast = sizeof text / sizeof text[0] - 1;
  va_list arguments;
  va_start(arguments, format);
  const int length = _vsnwprintf(text, kLast, format, arguments);
  va_end(arguments);
  text[length < 0 ? kLast : static_cast<std::size_t>(length)] = 0;
  OutputDebugStringW(text);
  SetLastError(error);
}

/// Desktop Windows knows 8-bit names only.
FARPROC GetProcAddressW(HMODULE module, const WCHAR* name) {
  char narrow[256];
  if (WideCharToMultiByte(CP_ACP, 0, name, -1, narrow, sizeof narrow, nullptr, nullptr) == 0) {
    return nullptr;
  }
  return GetProcAddress(module, narrow);
}

BOOL CloseToolhelp32Snapshot(HANDLE snapshot) {
  return CloseHandle(snapshot);
}

}  // extern "C"
