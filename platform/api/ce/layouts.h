// The device's layout of every structure of the API: where each member lies. Holds where pointers
// have the device's 32 bits; included after the declarations.
#pragma once

#include <cstddef>

#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "ce/types.h"
#include "ce/window.h"
#include "ce/winsock.h"

#define CE_LIES_AT(type, member, offset) \
  static_assert(offsetof(type, member) == (offset), "the device's layout")
#define CE_HAS_SIZE(type, size) static_assert(sizeof(type) == (size), "the device's layout")

// Sizes that hold everywhere.
CE_HAS_SIZE(WCHAR, 2);
CE_HAS_SIZE(BOOL, 4);
CE_HAS_SIZE(CEDEVICE_POWER_STATE, 4);
CE_HAS_SIZE(FILETIME, 8);
CE_LIES_AT(FILETIME, dwLowDateTime, 0);
CE_LIES_AT(FILETIME, dwHighDateTime, 4);
CE_HAS_SIZE(SYSTEMTIME, 16);
CE_LIES_AT(SYSTEMTIME, wYear, 0);
CE_LIES_AT(SYSTEMTIME, wMonth, 2);
CE_LIES_AT(SYSTEMTIME, wDayOfWeek, 4);
CE_LIES_AT(SYSTEMTIME, wDay, 6);
CE_LIES_AT(SYSTEMTIME, wHour, 8);
CE_LIES_AT(SYSTEMTIME, wMinute, 10);
CE_LIES_AT(SYSTEMTIME, wSecond, 12);
CE_LIES_AT(SYSTEMTIME, wMilliseconds, 14);
CE_HAS_SIZE(POINT, 8);
CE_LIES_AT(POINT, x, 0);
CE_LIES_AT(POINT, y, 4);
CE_HAS_SIZE(SIZE, 8);
CE_LIES_AT(SIZE, cx, 0);
CE_LIES_AT(SIZE, cy, 4);
CE_HAS_SIZE(RECT, 16);
CE_LIES_AT(RECT, left, 0);
CE_LIES_AT(RECT, top, 4);
CE_LIES_AT(RECT, right, 8);
CE_LIES_AT(RECT, bottom, 12);
CE_HAS_SIZE(ULARGE_INTEGER, 8);

#if __SIZEOF_POINTER__ == 4

CE_HAS_SIZE(HANDLE, 4);
CE_HAS_SIZE(SOCKET, 4);
CE_HAS_SIZE(WPARAM, 4);
CE_HAS_SIZE(LPARAM, 4);
CE_HAS_SIZE(LRESULT, 4);
static_assert(alignof(ULARGE_INTEGER) == 8, "members of 64 bits lie at multiples of 8");

// ---- kernel ----
CE_HAS_SIZE(CRITICAL_SECTION, 20);
CE_LIES_AT(CRITICAL_SECTION, LockCount, 0);
CE_LIES_AT(CRITICAL_SECTION, OwnerThread, 4);
CE_LIES_AT(CRITICAL_SECTION, hCrit, 8);
CE_LIES_AT(CRITICAL_SECTION, needtrap, 12);
CE_LIES_AT(CRITICAL_SECTION, dwContentions, 16);

CE_HAS_SIZE(PROCESSENTRY32, 564);
CE_LIES_AT(PROCESSENTRY32, dwSize, 0);
CE_LIES_AT(PROCESSENTRY32, cntUsage, 4);
CE_LIES_AT(PROCESSENTRY32, th32ProcessID, 8);
CE_LIES_AT(PROCESSENTRY32, th32DefaultHeapID, 12);
CE_LIES_AT(PROCESSENTRY32, th32ModuleID, 16);
CE_LIES_AT(PROCESSENTRY32, cntThreads, 20);
CE_LIES_AT(PROCESSENTRY32, th32ParentProcessID, 24);
CE_LIES_AT(PROCESSENTRY32, pcPriClassBase, 28);
CE_LIES_AT(PROCESSENTRY32, dwFlags, 32);
CE_LIES_AT(PROCESSENTRY32, szExeFile, 36);
CE_LIES_AT(PROCESSENTRY32, th32MemoryBase, 556);
CE_LIES_AT(PROCESSENTRY32, th32AccessKey, 560);

CE_HAS_SIZE(PROCESS_INFORMATION, 16);
CE_LIES_AT(PROCESS_INFORMATION, hProcess, 0);
CE_LIES_AT(PROCESS_INFORMATION, hThread, 4);
CE_LIES_AT(PROCESS_INFORMATION, dwProcessId, 8);
CE_LIES_AT(PROCESS_INFORMATION, dwThreadId, 12);

CE_HAS_SIZE(STARTUPINFOW, 68);
CE_LIES_AT(STARTUPINFOW, cb, 0);
CE_LIES_AT(STARTUPINFOW, lpReserved, 4);
CE_LIES_AT(STARTUPINFOW, lpDesktop, 8);
CE_LIES_AT(STARTUPINFOW, lpTitle, 12);
CE_LIES_AT(STARTUPINFOW, dwX, 16);
CE_LIES_AT(STARTUPINFOW, dwY, 20);
CE_LIES_AT(STARTUPINFOW, dwXSize, 24);
CE_LIES_AT(STARTUPINFOW, dwYSize, 28);
CE_LIES_AT(STARTUPINFOW, dwXCountChars, 32);
CE_LIES_AT(STARTUPINFOW, dwYCountChars, 36);
CE_LIES_AT(STARTUPINFOW, dwFillAttribute, 40);
CE_LIES_AT(STARTUPINFOW, dwFlags, 44);
CE_LIES_AT(STARTUPINFOW, wShowWindow, 48);
CE_LIES_AT(STARTUPINFOW, cbReserved2, 50);
CE_LIES_AT(STARTUPINFOW, lpReserved2, 52);
CE_LIES_AT(STARTUPINFOW, hStdInput, 56);
CE_LIES_AT(STARTUPINFOW, hStdOutput, 60);
CE_LIES_AT(STARTUPINFOW, hStdError, 64);

// ---- files ----
CE_HAS_SIZE(WIN32_FIND_DATAW, 560);
CE_LIES_AT(WIN32_FIND_DATAW, dwFileAttributes, 0);
CE_LIES_AT(WIN32_FIND_DATAW, ftCreationTime, 4);
CE_LIES_AT(WIN32_FIND_DATAW, ftLastAccessTime, 12);
CE_LIES_AT(WIN32_FIND_DATAW, ftLastWriteTime, 20);
CE_LIES_AT(WIN32_FIND_DATAW, nFileSizeHigh, 28);
CE_LIES_AT(WIN32_FIND_DATAW, nFileSizeLow, 32);
CE_LIES_AT(WIN32_FIND_DATAW, dwOID, 36);
CE_LIES_AT(WIN32_FIND_DATAW, cFileName, 40);

// ---- memory, power, identity ----
CE_HAS_SIZE(MEMORYSTATUS, 32);
CE_LIES_AT(MEMORYSTATUS, dwLength, 0);
CE_LIES_AT(MEMORYSTATUS, dwMemoryLoad, 4);
CE_LIES_AT(MEMORYSTATUS, dwTotalPhys, 8);
CE_LIES_AT(MEMORYSTATUS, dwAvailPhys, 12);
CE_LIES_AT(MEMORYSTATUS, dwTotalPageFile, 16);
CE_LIES_AT(MEMORYSTATUS, dwAvailPageFile, 20);
CE_LIES_AT(MEMORYSTATUS, dwTotalVirtual, 24);
CE_LIES_AT(MEMORYSTATUS, dwAvailVirtual, 28);
CE_HAS_SIZE(STORE_INFORMATION, 8);
CE_LIES_AT(STORE_INFORMATION, dwStoreSize, 0);
CE_LIES_AT(STORE_INFORMATION, dwFreeSize, 4);

CE_HAS_SIZE(SYSTEM_POWER_STATUS_EX, 24);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, ACLineStatus, 0);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BatteryFlag, 1);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BatteryLifePercent, 2);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, Reserved1, 3);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BatteryLifeTime, 4);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BatteryFullLifeTime, 8);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, Reserved2, 12);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BackupBatteryFlag, 13);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BackupBatteryLifePercent, 14);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, Reserved3, 15);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BackupBatteryLifeTime, 16);
CE_LIES_AT(SYSTEM_POWER_STATUS_EX, BackupBatteryFullLifeTime, 20);

CE_HAS_SIZE(OSVERSIONINFOW, 276);
CE_LIES_AT(OSVERSIONINFOW, dwOSVersionInfoSize, 0);
CE_LIES_AT(OSVERSIONINFOW, dwMajorVersion, 4);
CE_LIES_AT(OSVERSIONINFOW, dwMinorVersion, 8);
CE_LIES_AT(OSVERSIONINFOW, dwBuildNumber, 12);
CE_LIES_AT(OSVERSIONINFOW, dwPlatformId, 16);
CE_LIES_AT(OSVERSIONINFOW, szCSDVersion, 20);

// ---- windows ----
CE_HAS_SIZE(WNDCLASSW, 40);
CE_LIES_AT(WNDCLASSW, style, 0);
CE_LIES_AT(WNDCLASSW, lpfnWndProc, 4);
CE_LIES_AT(WNDCLASSW, cbClsExtra, 8);
CE_LIES_AT(WNDCLASSW, cbWndExtra, 12);
CE_LIES_AT(WNDCLASSW, hInstance, 16);
CE_LIES_AT(WNDCLASSW, hIcon, 20);
CE_LIES_AT(WNDCLASSW, hCursor, 24);
CE_LIES_AT(WNDCLASSW, hbrBackground, 28);
CE_LIES_AT(WNDCLASSW, lpszMenuName, 32);
CE_LIES_AT(WNDCLASSW, lpszClassName, 36);

CE_HAS_SIZE(MSG, 28);
CE_LIES_AT(MSG, hwnd, 0);
CE_LIES_AT(MSG, message, 4);
CE_LIES_AT(MSG, wParam, 8);
CE_LIES_AT(MSG, lParam, 12);
CE_LIES_AT(MSG, time, 16);
CE_LIES_AT(MSG, pt, 20);

CE_HAS_SIZE(PAINTSTRUCT, 64);
CE_LIES_AT(PAINTSTRUCT, hdc, 0);
CE_LIES_AT(PAINTSTRUCT, fErase, 4);
CE_LIES_AT(PAINTSTRUCT, rcPaint, 8);
CE_LIES_AT(PAINTSTRUCT, fRestore, 24);
CE_LIES_AT(PAINTSTRUCT, fIncUpdate, 28);
CE_LIES_AT(PAINTSTRUCT, rgbReserved, 32);

CE_HAS_SIZE(TEXTMETRICW, 60);
CE_LIES_AT(TEXTMETRICW, tmHeight, 0);
CE_LIES_AT(TEXTMETRICW, tmAscent, 4);
CE_LIES_AT(TEXTMETRICW, tmDescent, 8);
CE_LIES_AT(TEXTMETRICW, tmInternalLeading, 12);
CE_LIES_AT(TEXTMETRICW, tmExternalLeading, 16);
CE_LIES_AT(TEXTMETRICW, tmAveCharWidth, 20);
CE_LIES_AT(TEXTMETRICW, tmMaxCharWidth, 24);
CE_LIES_AT(TEXTMETRICW, tmWeight, 28);
CE_LIES_AT(TEXTMETRICW, tmOverhang, 32);
CE_LIES_AT(TEXTMETRICW, tmDigitizedAspectX, 36);
CE_LIES_AT(TEXTMETRICW, tmDigitizedAspectY, 40);
CE_LIES_AT(TEXTMETRICW, tmFirstChar, 44);
CE_LIES_AT(TEXTMETRICW, tmLastChar, 46);
CE_LIES_AT(TEXTMETRICW, tmDefaultChar, 48);
CE_LIES_AT(TEXTMETRICW, tmBreakChar, 50);
CE_LIES_AT(TEXTMETRICW, tmItalic, 52);
CE_LIES_AT(TEXTMETRICW, tmUnderlined, 53);
CE_LIES_AT(TEXTMETRICW, tmStruckOut, 54);
CE_LIES_AT(TEXTMETRICW, tmPitchAndFamily, 55);
CE_LIES_AT(TEXTMETRICW, tmCharSet, 56);

// ---- sockets ----
CE_HAS_SIZE(ce_in_addr, 4);
CE_LIES_AT(ce_in_addr, s_addr, 0);
CE_HAS_SIZE(ce_sockaddr, 16);
CE_LIES_AT(ce_sockaddr, sa_family, 0);
CE_LIES_AT(ce_sockaddr, sa_data, 2);
CE_HAS_SIZE(ce_sockaddr_in, 16);
CE_LIES_AT(ce_sockaddr_in, sin_family, 0);
CE_LIES_AT(ce_sockaddr_in, sin_port, 2);
CE_LIES_AT(ce_sockaddr_in, sin_addr, 4);
CE_LIES_AT(ce_sockaddr_in, sin_zero, 8);
CE_HAS_SIZE(ce_ip_mreq, 8);
CE_LIES_AT(ce_ip_mreq, imr_multiaddr, 0);
CE_LIES_AT(ce_ip_mreq, imr_interface, 4);
CE_HAS_SIZE(ce_linger, 4);
CE_LIES_AT(ce_linger, l_onoff, 0);
CE_LIES_AT(ce_linger, l_linger, 2);
CE_HAS_SIZE(ce_timeval, 8);
CE_LIES_AT(ce_timeval, tv_sec, 0);
CE_LIES_AT(ce_timeval, tv_usec, 4);
CE_HAS_SIZE(ce_fd_set, 260);
CE_LIES_AT(ce_fd_set, fd_count, 0);
CE_LIES_AT(ce_fd_set, fd_array, 4);

CE_HAS_SIZE(ce_hostent, 16);
CE_LIES_AT(ce_hostent, h_name, 0);
CE_LIES_AT(ce_hostent, h_aliases, 4);
CE_LIES_AT(ce_hostent, h_addrtype, 8);
CE_LIES_AT(ce_hostent, h_length, 10);
CE_LIES_AT(ce_hostent, h_addr_list, 12);

CE_HAS_SIZE(ce_WSADATA, 400);
CE_LIES_AT(ce_WSADATA, wVersion, 0);
CE_LIES_AT(ce_WSADATA, wHighVersion, 2);
CE_LIES_AT(ce_WSADATA, szDescription, 4);
CE_LIES_AT(ce_WSADATA, szSystemStatus, 261);
CE_LIES_AT(ce_WSADATA, iMaxSockets, 390);
CE_LIES_AT(ce_WSADATA, iMaxUdpDg, 392);
CE_LIES_AT(ce_WSADATA, lpVendorInfo, 396);

#endif

#undef CE_LIES_AT
#undef CE_HAS_SIZE
