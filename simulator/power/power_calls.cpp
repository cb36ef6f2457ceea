// The power calls of the API.
#include "ce/errors.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "power/power.h"

extern "C" BOOL GetSystemPowerStatusEx(SYSTEM_POWER_STATUS_EX* status, BOOL refreshed) {
  sim::ApiCall call("GetSystemPowerStatusEx");
  call.Argument("refreshed", refreshed);
  if (call.failed()) return call.Return(FALSE);
  if (status == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  *status = call.device().power().status();
  return call.Return(TRUE);
}

extern "C" HANDLE SetPowerRequirement(void* device, CEDEVICE_POWER_STATE state, ULONG flags,
                                      void* /*system_state*/, ULONG /*system_flags*/) {
  sim::ApiCall call("SetPowerRequirement");
  const auto* name = static_cast<const WCHAR*>(device);
  if ((flags & POWER_NAME) != 0) call.Argument("device", name);
  call.Argument("state", static_cast<int>(state));
  const HANDLE none = nullptr;
  if (call.failed()) return call.Return(none);
  const bool is_name = (flags & POWER_NAME) != 0 && name != nullptr && name[0] != 0;
  if (!is_name || state < D0 || state >= PwrDeviceMaximum) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  return call.Return(call.device().power().Require({name, state}));
}

extern "C" DWORD ReleasePowerRequirement(HANDLE requirement) {
  sim::ApiCall call("ReleasePowerRequirement", ERROR_INVALID_PARAMETER);
  call.Argument("requirement", requirement);
  if (call.failed()) return call.Return(call.fault_error());
  if (!call.device().power().Release(requirement)) {
    return call.Fail(ERROR_INVALID_PARAMETER, ERROR_INVALID_PARAMETER);
  }
  return call.Return(ERROR_SUCCESS);
}

extern "C" void SystemIdleTimerReset() {
  sim::ApiCall call("SystemIdleTimerReset", sim::kCannotFail);
  call.device().power().CountIdleTimerReset();
}
