// What only the device's API has, as far as desktop Windows has something like it. What has no
// counterpart answers that it is not supported, as a device without that feature does.
#include <coredll.h>

#include <cstdarg>
#include <cwchar>

namespace {

constexpr DWORD kDivisionFailed = 3;  // SYSMEM_FAILED

/// The device's calls count bytes in 32 bits, and some callers read them as signed.
constexpr ULONGLONG kMostBytes = 0x7FFFFFFF;

DWORD InDeviceRange(ULONGLONG bytes) {
  return static_cast<DWORD>(bytes < kMostBytes ? bytes : kMostBytes);
}

}  // namespace

extern "C" {

HANDLE CreateFileForMappingW(const WCHAR* name, DWORD access, DWORD share,
                             SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                             HANDLE template_file) {
  return CreateFileW(name, access, share, security, disposition, attributes, template_file);
}

/// The object store is the drive on which the program runs.
BOOL GetStoreInformation(STORE_INFORMATION* information) {
  ULARGE_INTEGER available = {};
  ULARGE_INTEGER total = {};
  if (GetDiskFreeSpaceExW(nullptr, &available, &total, nullptr) == FALSE) return FALSE;
  information->dwStoreSize = InDeviceRange(total.QuadPart);
  information->dwFreeSize = InDeviceRange(available.QuadPart);
  return TRUE;
}

BOOL GetSystemMemoryDivision(DWORD* /*store_pages*/, DWORD* /*ram_pages*/, DWORD* /*page_size*/) {
  SetLastError(ERROR_CALL_NOT_IMPLEMENTED);
  return FALSE;
}

DWORD SetSystemMemoryDivision(DWORD /*store_pages*/) {
  return kDivisionFailed;
}

/// Desktop Windows loads its drivers by other means, and none of the device's.
HANDLE ActivateDevice(const WCHAR* /*key*/, DWORD /*client_information*/) {
  SetLastError(ERROR_CALL_NOT_IMPLEMENTED);
  return nullptr;
}

BOOL DeactivateDevice(HANDLE /*device*/) {
  SetLastError(ERROR_INVALID_HANDLE);
  return FALSE;
}

BOOL GetSystemPowerStatusEx(SYSTEM_POWER_STATUS_EX* status, BOOL /*refreshed*/) {
  constexpr BYTE kUnknown = 255;
  SYSTEM_POWER_STATUS desktop = {};
  if (GetSystemPowerStatus(&desktop) == FALSE) return FALSE;
  *status = {};
  status->ACLineStatus = desktop.ACLineStatus;
  status->BatteryFlag = desktop.BatteryFlag;
  status->BatteryLifePercent = desktop.BatteryLifePercent;
  status->BatteryLifeTime = desktop.BatteryLifeTime;
  status->BatteryFullLifeTime = desktop.BatteryFullLifeTime;
  status->BackupBatteryFlag = kUnknown;
  status->BackupBatteryLifePercent = kUnknown;
  status->BackupBatteryLifeTime = BATTERY_LIFE_UNKNOWN;
  status->BackupBatteryFullLifeTime = BATTERY_LIFE_UNKNOWN;
  return TRUE;
}

/// Any requirement keeps the display on, whatever device it names.
HANDLE SetPowerRequirement(void* /*device*/, CEDEVICE_POWER_STATE /*state*/, ULONG /*flags*/,
                           void* /*system_state*/, ULONG /*system_flags*/) {
  WCHAR reason[] = TEXT("Device upgrade");
  REASON_CONTEXT context = {};
  context.Version = POWER_REQUEST_CONTEXT_VERSION;
  context.Flags = POWER_REQUEST_CONTEXT_SIMPLE_STRING;
  context.Reason.SimpleReasonString = reason;
  const HANDLE request = PowerCreateRequest(&context);
  if (request == INVALID_HANDLE_VALUE || request == nullptr) return nullptr;
  if (PowerSetRequest(request, PowerRequestDisplayRequired) == FALSE) {
    CloseHandle(request);
    return nullptr;
  }
  return request;
}

DWORD ReleasePowerRequirement(HANDLE requirement) {
  if (PowerClearRequest(requirement, PowerRequestDisplayRequired) == FALSE) return GetLastError();
  return CloseHandle(requirement) != FALSE ? ERROR_SUCCESS : GetLastError();
}

void SystemIdleTimerReset() {
  SetThreadExecutionState(ES_SYSTEM_REQUIRED);
}

BOOL KernelIoControl(DWORD /*code*/, void* /*input*/, DWORD /*input_size*/, void* /*output*/,
                     DWORD /*output_size*/, DWORD* /*returned*/) {
  SetLastError(ERROR_NOT_SUPPORTED);
  return FALSE;
}

/// Desktop Windows knows 8-bit names only.
FARPROC GetProcAddressW(HMODULE module, const WCHAR* name) {
  char narrow[256];
  if (WideCharToMultiByte(CP_ACP, 0, name, -1, narrow, sizeof narrow, nullptr, nullptr) == 0) {
    return nullptr;
  }
  return GetProcAddress(module, narrow);
}

void NKDbgPrintfW(const WCHAR* format, ...) {
  WCHAR text[512];
  va_list arguments;
  va_start(arguments, format);
  const int length = _vsnwprintf(text, sizeof text / sizeof text[0] - 1, format, arguments);
  va_end(arguments);
  text[length < 0 ? sizeof text / sizeof text[0] - 1 : static_cast<std::size_t>(length)] = 0;
  OutputDebugStringW(text);
}

BOOL CloseToolhelp32Snapshot(HANDLE snapshot) {
  return CloseHandle(snapshot);
}

}  // extern "C"
