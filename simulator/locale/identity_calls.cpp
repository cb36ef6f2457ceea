// What the platform tells of itself: KernelIoControl, SystemParametersInfoW, GetVersionExW.
#include <algorithm>
#include <cstring>
#include <optional>
#include <string>

#include "ce/errors.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "locale/code_pages.h"
#include "locale/platform_identity.h"
#include "profile/profile.h"

extern "C" BOOL KernelIoControl(DWORD code, void* input, DWORD input_size, void* output,
                                DWORD output_size, DWORD* returned) {
  sim::ApiCall call("KernelIoControl", ERROR_NOT_SUPPORTED);
  call.Argument("code", code);
  if (call.failed()) return call.Return(FALSE);
  if (code != sim::kIdentityControlCode) return call.Fail(ERROR_NOT_SUPPORTED, FALSE);
  if (input == nullptr || input_size < 2 || output == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::uint8_t selector = *static_cast<const std::uint8_t*>(input);
  call.Argument("selector", selector);
  const std::optional<std::string> answer = sim::IdentityAnswer(call.device().profile(), selector);
  if (!answer) return call.Fail(ERROR_NOT_SUPPORTED, FALSE);
  if (answer->size() > output_size) return call.Fail(ERROR_INSUFFICIENT_BUFFER, FALSE);
  std::memcpy(output, answer->data(), answer->size());
  if (returned != nullptr) *returned = static_cast<DWORD>(answer->size());
  return call.Return(TRUE);
}

extern "C" BOOL SystemParametersInfoW(UINT action, UINT parameter, void* value, UINT /*update*/) {
  sim::ApiCall call("SystemParametersInfoW", ERROR_INVALID_PARAMETER);
  call.Argument("action", action);
  if (call.failed()) return call.Return(FALSE);
  // Devices of this family answer both numbers with the platform type.
  if ((action != SPI_GETPLATFORMTYPE && action != SPI_GETOEMINFO) || value == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::u16string platform = sim::FromAnsi(call.device().profile().platform);
  if (platform.empty()) return call.Fail(ERROR_NOT_SUPPORTED, FALSE);
  if (platform.size() >= parameter) return call.Fail(ERROR_INSUFFICIENT_BUFFER, FALSE);
  std::copy_n(platform.c_str(), platform.size() + 1, static_cast<WCHAR*>(value));
  return call.Return(TRUE);
}

extern "C" BOOL GetVersionExW(OSVERSIONINFOW* version) {
  constexpr DWORD kPlatformCe = 3;
  sim::ApiCall call("GetVersionExW", ERROR_INSUFFICIENT_BUFFER);
  if (call.failed()) return call.Return(FALSE);
  if (version == nullptr || version->dwOSVersionInfoSize < sizeof *version) {
    return call.Fail(ERROR_INSUFFICIENT_BUFFER, FALSE);
  }
  const sim::Profile& profile = call.device().profile();
  version->dwMajorVersion = profile.os_major;
  version->dwMinorVersion = profile.os_minor;
  version->dwBuildNumber = profile.os_build;
  version->dwPlatformId = kPlatformCe;
  version->szCSDVersion[0] = 0;
  return call.Return(TRUE);
}
