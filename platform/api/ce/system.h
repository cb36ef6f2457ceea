// Registry, memory, power, identity, locale and text conversion.
#pragma once

#include "ce/types.h"

// ---- registry ----
#define HKEY_CLASSES_ROOT (reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(0x80000000U)))
#define HKEY_CURRENT_USER (reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(0x80000001U)))
#define HKEY_LOCAL_MACHINE (reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(0x80000002U)))
#define HKEY_USERS (reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(0x80000003U)))

using REGSAM = DWORD;
inline constexpr REGSAM KEY_READ = 0x20019;
inline constexpr REGSAM KEY_WRITE = 0x20006;
inline constexpr REGSAM KEY_ALL_ACCESS = 0xF003F;
inline constexpr DWORD REG_NONE = 0;
inline constexpr DWORD REG_SZ = 1;
inline constexpr DWORD REG_EXPAND_SZ = 2;
inline constexpr DWORD REG_BINARY = 3;
inline constexpr DWORD REG_DWORD = 4;
inline constexpr DWORD REG_MULTI_SZ = 7;
inline constexpr DWORD REG_OPTION_NON_VOLATILE = 0;
inline constexpr DWORD REG_CREATED_NEW_KEY = 1;
inline constexpr DWORD REG_OPENED_EXISTING_KEY = 2;

// ---- memory ----
inline constexpr UINT LMEM_FIXED = 0;
inline constexpr UINT LMEM_ZEROINIT = 0x40;
inline constexpr UINT LPTR = 0x40;

struct MEMORYSTATUS {
  DWORD dwLength;
  DWORD dwMemoryLoad;
  DWORD dwTotalPhys;
  DWORD dwAvailPhys;
  DWORD dwTotalPageFile;
  DWORD dwAvailPageFile;
  DWORD dwTotalVirtual;
  DWORD dwAvailVirtual;
};
static_assert(sizeof(MEMORYSTATUS) == 32, "the device's layout");

struct STORE_INFORMATION {
  DWORD dwStoreSize;
  DWORD dwFreeSize;
};

inline constexpr DWORD SYSMEM_CHANGED = 0;
inline constexpr DWORD SYSMEM_MUSTREBOOT = 1;
inline constexpr DWORD SYSMEM_REBOOTPENDING = 2;
inline constexpr DWORD SYSMEM_FAILED = 3;

inline constexpr DWORD MEM_COMMIT = 0x1000;
inline constexpr DWORD MEM_RESERVE = 0x2000;
inline constexpr DWORD MEM_RELEASE = 0x8000;

// ---- power ----
inline constexpr BYTE AC_LINE_OFFLINE = 0;
inline constexpr BYTE AC_LINE_ONLINE = 1;
inline constexpr BYTE AC_LINE_UNKNOWN = 255;
inline constexpr BYTE BATTERY_FLAG_HIGH = 1;
inline constexpr BYTE BATTERY_FLAG_LOW = 2;
inline constexpr BYTE BATTERY_FLAG_CRITICAL = 4;
inline constexpr BYTE BATTERY_FLAG_CHARGING = 8;
inline constexpr BYTE BATTERY_FLAG_NO_BATTERY = 128;
inline constexpr BYTE BATTERY_FLAG_UNKNOWN = 255;

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
static_assert(sizeof(SYSTEM_POWER_STATUS_EX) == 24, "the device's layout");

enum CEDEVICE_POWER_STATE { PwrDeviceUnspecified = -1, D0 = 0, D1, D2, D3, D4, PwrDeviceMaximum };
inline constexpr ULONG POWER_NAME = 1;

// ---- identity ----
inline constexpr UINT SPI_GETPLATFORMTYPE = 257;
inline constexpr UINT SPI_GETOEMINFO = 258;

struct OSVERSIONINFOW {
  DWORD dwOSVersionInfoSize;
  DWORD dwMajorVersion;
  DWORD dwMinorVersion;
  DWORD dwBuildNumber;
  DWORD dwPlatformId;
  WCHAR szCSDVersion[128];
};
static_assert(sizeof(OSVERSIONINFOW) == 276, "the device's layout");

// ---- locale and text ----
using LCID = DWORD;
inline constexpr LCID LOCALE_SYSTEM_DEFAULT = 0x800;
inline constexpr LCID LOCALE_USER_DEFAULT = 0x400;
inline constexpr UINT CP_ACP = 0;
inline constexpr UINT CP_UTF8 = 65001;
inline constexpr DWORD MB_ERR_INVALID_CHARS = 8;
inline constexpr DWORD DATE_SHORTDATE = 1;
inline constexpr DWORD DATE_LONGDATE = 2;
inline constexpr DWORD TIME_NOMINUTESORSECONDS = 1;
inline constexpr DWORD TIME_NOSECONDS = 2;
inline constexpr DWORD TIME_NOTIMEMARKER = 4;
inline constexpr DWORD TIME_FORCE24HOURFORMAT = 8;

extern "C" {
LONG RegOpenKeyExW(HKEY key, const WCHAR* name, DWORD options, REGSAM access, HKEY* opened);
LONG RegCreateKeyExW(HKEY key, const WCHAR* name, DWORD reserved, WCHAR* class_name, DWORD options,
                     REGSAM access, SECURITY_ATTRIBUTES* security, HKEY* opened,
                     DWORD* disposition);
LONG RegCloseKey(HKEY key);
LONG RegQueryValueExW(HKEY key, const WCHAR* name, DWORD* reserved, DWORD* type, BYTE* data,
                      DWORD* size);
LONG RegSetValueExW(HKEY key, const WCHAR* name, DWORD reserved, DWORD type, const BYTE* data,
                    DWORD size);
LONG RegDeleteValueW(HKEY key, const WCHAR* name);
LONG RegDeleteKeyW(HKEY key, const WCHAR* name);
LONG RegEnumKeyExW(HKEY key, DWORD index, WCHAR* name, DWORD* name_size, DWORD* reserved,
                   WCHAR* class_name, DWORD* class_size, FILETIME* last_write);
LONG RegEnumValueW(HKEY key, DWORD index, WCHAR* name, DWORD* name_size, DWORD* reserved,
                   DWORD* type, BYTE* data, DWORD* size);

HLOCAL LocalAlloc(UINT flags, std::size_t size);
HLOCAL LocalFree(HLOCAL block);
std::size_t LocalSize(HLOCAL block);
void GlobalMemoryStatus(MEMORYSTATUS* status);
BOOL GetStoreInformation(STORE_INFORMATION* information);
BOOL GetSystemMemoryDivision(DWORD* store_pages, DWORD* ram_pages, DWORD* page_size);
DWORD SetSystemMemoryDivision(DWORD store_pages);

/// Whole pages, all zero. Without a wish for an address they lie below 4 GiB, where drivers reach
/// them.
void* VirtualAlloc(void* address, std::size_t size, DWORD type, DWORD protection);
BOOL VirtualFree(void* address, std::size_t size, DWORD type);

/// Loads the driver that the registry key describes, below HKEY_LOCAL_MACHINE.
/// @return the handle of the loaded driver, null when there is none.
HANDLE ActivateDevice(const WCHAR* key, DWORD client_information);
BOOL DeactivateDevice(HANDLE device);

BOOL GetSystemPowerStatusEx(SYSTEM_POWER_STATUS_EX* status, BOOL refreshed);
/// @return the requirement's handle, null when it could not be set.
HANDLE SetPowerRequirement(void* device, CEDEVICE_POWER_STATE state, ULONG flags,
                           void* system_state, ULONG system_flags);
/// @return ERROR_SUCCESS or an error number.
DWORD ReleasePowerRequirement(HANDLE requirement);
void SystemIdleTimerReset();

BOOL KernelIoControl(DWORD code, void* input, DWORD input_size, void* output, DWORD output_size,
                     DWORD* returned);
BOOL SystemParametersInfoW(UINT action, UINT parameter, void* value, UINT update);
BOOL GetVersionExW(OSVERSIONINFOW* version);

void GetLocalTime(SYSTEMTIME* time);
void GetSystemTime(SYSTEMTIME* time);
BOOL FileTimeToSystemTime(const FILETIME* file_time, SYSTEMTIME* system_time);
BOOL SystemTimeToFileTime(const SYSTEMTIME* system_time, FILETIME* file_time);
BOOL FileTimeToLocalFileTime(const FILETIME* file_time, FILETIME* local);
BOOL LocalFileTimeToFileTime(const FILETIME* local, FILETIME* file_time);
LONG CompareFileTime(const FILETIME* first, const FILETIME* second);
int GetDateFormatW(LCID locale, DWORD flags, const SYSTEMTIME* date, const WCHAR* format,
                   WCHAR* text, int size);
int GetTimeFormatW(LCID locale, DWORD flags, const SYSTEMTIME* time, const WCHAR* format,
                   WCHAR* text, int size);
int MultiByteToWideChar(UINT code_page, DWORD flags, const char* text, int length, WCHAR* wide,
                        int size);
int WideCharToMultiByte(UINT code_page, DWORD flags, const WCHAR* wide, int length, char* text,
                        int size, const char* default_char, BOOL* used_default);
/// Puts `length` characters into lower case where they stand. @return `length`.
DWORD CharLowerBuffW(WCHAR* text, DWORD length);
}
