// The Windows CE API for programs built for desktop Windows: its own headers, and the calls that
// only the device has, which platform/windows/ supplies.
#pragma once

#ifndef UNICODE
#define UNICODE
#endif
#ifndef _UNICODE
#define _UNICODE
#endif
#define WIN32_LEAN_AND_MEAN
#define NOMINMAX
// The order counts.
// clang-format off
#include <winsock2.h>
#include <windows.h>
// clang-format on
#include <tlhelp32.h>
#include <ws2tcpip.h>

#include <cstdio>

// These macros would rename our own methods in whichever files see them.
#undef CopyFile
#undef CreateDirectory
#undef DeleteFile
#undef FindFirst
#undef FindNext
#undef GetFreeSpace
#undef MoveFile
#undef RemoveDirectory
#undef GetMessage
#undef SendMessage

#ifndef HORZRES
#define HORZRES 8
#endif

struct STORE_INFORMATION {
  DWORD dwStoreSize;
  DWORD dwFreeSize;
};

inline constexpr DWORD SYSMEM_CHANGED = 0;
inline constexpr DWORD SYSMEM_FAILED = 3;
inline constexpr DWORD TH32CS_SNAPNOHEAPS = 0x40000000;  // no heaps are ever asked for here
inline constexpr ULONG POWER_NAME = 1;
enum CEDEVICE_POWER_STATE { PwrDeviceUnspecified = -1, D0 = 0, D1, D2, D3, D4, PwrDeviceMaximum };

struct SYSTEM_POWER_STATUS_EX {
  BYTE ACLineStatus;
  BYTE BatteryFlag;
  BYTE BatteryLifePercent;
  BYTE Reserved1;
  DWORD BatteryLifeTime;
  DWORD BatteryFullLifeTime;
  BYTE Reserved2;
  BYTE BackupBatteryFlag;
  BYTE BackupBatteryLifePercent;
  BYTE Reserved3;
  DWORD BackupBatteryLifeTime;
  DWORD BackupBatteryFullLifeTime;
};

extern "C" {
HANDLE CreateFileForMappingW(const WCHAR* name, DWORD access, DWORD share,
                             SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                             HANDLE template_file);
BOOL GetStoreInformation(STORE_INFORMATION* information);
BOOL GetSystemMemoryDivision(DWORD* store_pages, DWORD* ram_pages, DWORD* page_size);
DWORD SetSystemMemoryDivision(DWORD store_pages);
BOOL GetSystemPowerStatusEx(SYSTEM_POWER_STATUS_EX* status, BOOL refreshed);
HANDLE ActivateDevice(const WCHAR* key, DWORD client_information);
BOOL DeactivateDevice(HANDLE device);
HANDLE SetPowerRequirement(void* device, CEDEVICE_POWER_STATE state, ULONG flags,
                           void* system_state, ULONG system_flags);
DWORD ReleasePowerRequirement(HANDLE requirement);
void SystemIdleTimerReset();
BOOL KernelIoControl(DWORD code, void* input, DWORD input_size, void* output, DWORD output_size,
                     DWORD* returned);
FARPROC GetProcAddressW(HMODULE module, const WCHAR* name);
void NKDbgPrintfW(const WCHAR* format, ...);
BOOL CloseToolhelp32Snapshot(HANDLE snapshot);

// Calls that desktop Windows has, but which would leave out something of the device. Each takes
// care of that and hands on everything else.

/// Opens the flash driver's stand-in as "EFL1:" or whatever it was activated as.
HANDLE PlatformCreateFileW(const WCHAR* name, DWORD access, DWORD share,
                           SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                           HANDLE template_file);
BOOL PlatformDeviceIoControl(HANDLE device, DWORD code, void* input, DWORD input_size, void* output,
                             DWORD output_size, DWORD* returned, OVERLAPPED* overlapped);
BOOL PlatformCloseHandle(HANDLE handle);
/// Pages below 4 GiB, where a driver that is told addresses in 32 bits reaches them.
void* PlatformVirtualAlloc(void* address, SIZE_T size, DWORD type, DWORD protection);
/// Knows the platform type, too.
BOOL PlatformSystemParametersInfoW(UINT action, UINT parameter, void* value, UINT update);
/// A window without a place covers the whole desktop, with no frame but the one it asks for.
HWND PlatformCreateWindowExW(DWORD extended, const WCHAR* name, const WCHAR* title, DWORD style,
                             int x, int y, int width, int height, HWND parent, HMENU menu,
                             HINSTANCE instance, void* parameter);
/// A line with flat ends, however wide.
HPEN PlatformCreatePen(int style, int width, COLORREF colour);
/// Bytes as they are, as on the device; as text each line feed would become two bytes.
FILE* PlatformFopen(const char* name, const char* mode);
}

#ifndef ORVENIX_DESKTOP_NAMES
#define CreateFileW PlatformCreateFileW
#define DeviceIoControl PlatformDeviceIoControl
#define CloseHandle PlatformCloseHandle
#define VirtualAlloc PlatformVirtualAlloc
#define SystemParametersInfoW PlatformSystemParametersInfoW
#undef CreateWindowExW
#define CreateWindowExW PlatformCreateWindowExW
#define CreatePen PlatformCreatePen
#define fopen PlatformFopen
#endif
