// The basic types, constants and calling conventions of the Windows CE API.
// Sizes are the device's whatever the build machine's `long` and `wchar_t` are.
#pragma once

#include <cstddef>
#include <cstdint>

using BYTE = std::uint8_t;
using UCHAR = std::uint8_t;
using WORD = std::uint16_t;
using USHORT = std::uint16_t;
using DWORD = std::uint32_t;
using UINT = std::uint32_t;
using ULONG = std::uint32_t;
using LONG = std::int32_t;
using INT = std::int32_t;
using BOOL = int;
using CHAR = char;
using VOID = void;
using LONGLONG = std::int64_t;
using ULONGLONG = std::uint64_t;

// UTF-16: the compiler's own wide character where that has 16 bits, as on the device, and elsewhere
// a type of its own, so that code which mistakes it for a 32-bit wchar_t does not compile.
#if __SIZEOF_WCHAR_T__ == 2
using WCHAR = wchar_t;
#define TEXT(literal) L##literal
#else
using WCHAR = char16_t;
#define TEXT(literal) u##literal
#endif
using TCHAR = WCHAR;

using LPVOID = void*;
using LPCVOID = const void*;
using LPDWORD = DWORD*;
using PDWORD = DWORD*;
using LPLONG = LONG*;
using PLONG = LONG*;
using LPBYTE = BYTE*;
using LPSTR = char*;
using LPCSTR = const char*;
using LPWSTR = WCHAR*;
using LPCWSTR = const WCHAR*;
using PVOID = void*;

using UINT_PTR = std::uintptr_t;
using DWORD_PTR = std::uintptr_t;
using WPARAM = std::uintptr_t;
using LPARAM = std::intptr_t;
using LRESULT = std::intptr_t;
using ATOM = WORD;
using COLORREF = DWORD;

// A number from a table, never an address: it has to survive being kept in 32 bits.
using HANDLE = void*;
using HLOCAL = void*;
using HMODULE = void*;
using HINSTANCE = void*;
using HWND = struct HWND_tag*;
using HDC = struct HDC_tag*;
using HGDIOBJ = void*;
using HPEN = void*;
using HBRUSH = void*;
using HFONT = void*;
using HMENU = void*;
using HICON = void*;
using HCURSOR = void*;
using HKEY = struct HKEY_tag*;

#define INVALID_HANDLE_VALUE (reinterpret_cast<HANDLE>(~static_cast<std::uintptr_t>(0)))

#define WINAPI
#define CALLBACK
#define APIENTRY

inline constexpr BOOL FALSE = 0;
inline constexpr BOOL TRUE = 1;
inline constexpr DWORD INFINITE = 0xFFFFFFFFU;
inline constexpr std::size_t MAX_PATH = 260;

#define MAKEWORD(low, high) \
  (static_cast<WORD>((static_cast<WORD>(low) & 0xFFU) | ((static_cast<WORD>(high) & 0xFFU) << 8U)))
#define LOBYTE(value) (static_cast<BYTE>(static_cast<DWORD_PTR>(value) & 0xFFU))
#define HIBYTE(value) (static_cast<BYTE>((static_cast<DWORD_PTR>(value) >> 8U) & 0xFFU))
#define LOWORD(value) (static_cast<WORD>(static_cast<DWORD_PTR>(value) & 0xFFFFU))
#define HIWORD(value) (static_cast<WORD>((static_cast<DWORD_PTR>(value) >> 16U) & 0xFFFFU))

struct FILETIME {
  DWORD dwLowDateTime;
  DWORD dwHighDateTime;
};

struct SYSTEMTIME {
  WORD wYear;
  WORD wMonth;
  WORD wDayOfWeek;
  WORD wDay;
  WORD wHour;
  WORD wMinute;
  WORD wSecond;
  WORD wMilliseconds;
};

struct POINT {
  LONG x;
  LONG y;
};

struct SIZE {
  LONG cx;
  LONG cy;
};

struct RECT {
  LONG left;
  LONG top;
  LONG right;
  LONG bottom;
};

union ULARGE_INTEGER {
  struct {
    DWORD LowPart;
    DWORD HighPart;
  } u;
  ULONGLONG QuadPart;
};
using PULARGE_INTEGER = ULARGE_INTEGER*;

struct SECURITY_ATTRIBUTES;

static_assert(sizeof(DWORD) == 4 && sizeof(LONG) == 4 && sizeof(WCHAR) == 2, "device sizes");
static_assert(sizeof(FILETIME) == 8 && sizeof(SYSTEMTIME) == 16 && sizeof(RECT) == 16);
static_assert(sizeof(ULARGE_INTEGER) == 8);
