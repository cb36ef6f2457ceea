// Power. A requirement keeps the display on, whatever device it names; where Windows has no such
// requests it is only remembered.
#define ORVENIX_DESKTOP_NAMES
#include <coredll.h>

#include <map>

#include "guard.h"

namespace {

struct Requirements {
  platform::Lock lock;
  std::map<HANDLE, HANDLE> requests;  ///< by the caller's handle; null: there is no request
};

Requirements& All() {
  static Requirements requirements;
  return requirements;
}

/// @return null when Windows takes no requests.
HANDLE KeepDisplayOn() {
  WCHAR reason[] = TEXT("Device upgrade");
  REASON_CONTEXT context = {};
  context.Version = POWER_REQUEST_CONTEXT_VERSION;
  context.Flags = POWER_REQUEST_CONTEXT_SIMPLE_STRING;
  context.Reason.SimpleReasonString = reason;
  const HANDLE request = PowerCreateRequest(&context);
  if (request == INVALID_HANDLE_VALUE || request == nullptr) return nullptr;
  if (PowerSetRequest(request, PowerRequestDisplayRequired) != FALSE) return request;
  CloseHandle(request);
  return nullptr;
}

}  // namespace

extern "C" {

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

HANDLE SetPowerRequirement(void* device, CEDEVICE_POWER_STATE /*state*/, ULONG /*flags*/,
                           void* /*system_state*/, ULONG /*system_flags*/) {
  if (device == nullptr) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return nullptr;
  }
  const HANDLE requirement = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  if (requirement == nullptr) return nullptr;
  const HANDLE request = KeepDisplayOn();
  const platform::Guard guard(All().lock);
  All().requests[requirement] = request;
  return requirement;
}

DWORD ReleasePowerRequirement(HANDLE requirement) {
  HANDLE request = nullptr;
  {
    const platform::Guard guard(All().lock);
    const auto found = All().requests.find(requirement);
    if (found == All().requests.end()) return ERROR_INVALID_HANDLE;
    request = found->second;
    All().requests.erase(found);
  }
  CloseHandle(requirement);
  if (request == nullptr) return ERROR_SUCCESS;
  PowerClearRequest(request, PowerRequestDisplayRequired);
  return CloseHandle(request) != FALSE ? ERROR_SUCCESS : GetLastError();
}

void SystemIdleTimerReset() {
  const DWORD error = GetLastError();
  SetThreadExecutionState(ES_SYSTEM_REQUIRED);
  SetLastError(error);
}

}  // extern "C"
