// Drivers that a program loads. Desktop Windows loads its own by other means; here stands what the
// library needs of the device's: one driver is known, the flash driver, as "eflashdrv.dll".
#define ORVENIX_DESKTOP_NAMES
#include <coredll.h>

#include <cstring>
#include <cwchar>
#include <map>
#include <memory>
#include <string>

#include "flash_store.h"
#include "guard.h"

namespace {

constexpr WCHAR kFlashDriver[] = TEXT("eflashdrv.dll");
constexpr std::size_t kPrefixLength = 3;

using Driver = std::shared_ptr<platform::FlashStore>;

struct Active {
  std::wstring name;  ///< "EFL1:", in capitals
  Driver driver;
};

struct Drivers {
  platform::Lock lock;
  std::map<HANDLE, Active> active;                             ///< by what ActivateDevice gave
  std::map<HANDLE, std::weak_ptr<platform::FlashStore>> open;  ///< by what CreateFileW gave
};

Drivers& All() {
  static Drivers drivers;
  return drivers;
}

std::wstring InCapitals(std::wstring text) {
  CharUpperBuffW(text.data(), static_cast<DWORD>(text.size()));
  return text;
}

/// A short text of a registry key, empty when there is none.
std::wstring TextOf(HKEY key, const WCHAR* name) {
  WCHAR text[64] = {};
  DWORD size = sizeof text - sizeof text[0];
  DWORD type = 0;
  const LONG result =
      RegQueryValueExW(key, name, nullptr, &type, reinterpret_cast<BYTE*>(text), &size);
  return result == ERROR_SUCCESS && type == REG_SZ ? text : L"";
}

/// Locked: the first name with this prefix that no driver has, "" when all are taken.
std::wstring FreeName(const std::wstring& prefix) {
  for (WCHAR digit = L'1'; digit <= L'9'; ++digit) {
    const std::wstring name = InCapitals(prefix) + digit + L':';
    bool taken = false;
    for (const auto& [handle, active] : All().active) taken = taken || active.name == name;
    if (!taken) return name;
  }
  return {};
}

Driver Find(const WCHAR* name) {
  if (name == nullptr || wcsnlen(name, kPrefixLength + 3) != kPrefixLength + 2) return nullptr;
  const std::wstring wanted = InCapitals(name);
  const platform::Guard guard(All().lock);
  for (const auto& [handle, active] : All().active) {
    if (active.name == wanted) return active.driver;
  }
  return nullptr;
}

HANDLE NewHandle() {
  return CreateEventW(nullptr, TRUE, FALSE, nullptr);
}

DWORD Activate(const std::wstring& prefix, const std::wstring& library, HANDLE* handle) {
  if (library.empty() || prefix.size() != kPrefixLength) return ERROR_INVALID_PARAMETER;
  if (InCapitals(library) != InCapitals(kFlashDriver)) return ERROR_FILE_NOT_FOUND;
  const platform::Guard guard(All().lock);
  const std::wstring name = FreeName(prefix);
  if (name.empty()) return ERROR_ALREADY_EXISTS;
  *handle = NewHandle();
  if (*handle == nullptr) return GetLastError();
  All().active[*handle] = {name, std::make_shared<platform::FlashStore>()};
  return ERROR_SUCCESS;
}

}  // namespace

extern "C" {

HANDLE ActivateDevice(const WCHAR* key, DWORD /*client_information*/) {
  HKEY opened = nullptr;
  DWORD error = static_cast<DWORD>(RegOpenKeyExW(HKEY_LOCAL_MACHINE, key, 0, KEY_READ, &opened));
  HANDLE handle = nullptr;
  if (error == ERROR_SUCCESS) {
    error = Activate(TextOf(opened, TEXT("Prefix")), TextOf(opened, TEXT("Dll")), &handle);
    RegCloseKey(opened);
  }
  if (error != ERROR_SUCCESS) SetLastError(error);
  return handle;
}

BOOL DeactivateDevice(HANDLE device) {
  const platform::Guard guard(All().lock);
  if (All().active.erase(device) == 0) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  return CloseHandle(device);
}

HANDLE PlatformCreateFileW(const WCHAR* name, DWORD access, DWORD share,
                           SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                           HANDLE template_file) {
  const Driver driver = Find(name);
  if (driver == nullptr) {
    return CreateFileW(name, access, share, security, disposition, attributes, template_file);
  }
  const HANDLE handle = NewHandle();
  if (handle == nullptr) return INVALID_HANDLE_VALUE;
  const platform::Guard guard(All().lock);
  All().open[handle] = driver;
  return handle;
}

BOOL PlatformDeviceIoControl(HANDLE device, DWORD code, void* input, DWORD input_size, void* output,
                             DWORD output_size, DWORD* returned, OVERLAPPED* overlapped) {
  Driver driver;
  {
    const platform::Guard guard(All().lock);
    const auto found = All().open.find(device);
    if (found == All().open.end()) {
      return DeviceIoControl(device, code, input, input_size, output, output_size, returned,
                             overlapped);
    }
    driver = found->second.lock();
  }
  const DWORD error =
      driver == nullptr ? ERROR_INVALID_HANDLE : driver->Control(code, input, input_size);
  if (returned != nullptr) *returned = 0;
  if (error != ERROR_SUCCESS) SetLastError(error);
  return error == ERROR_SUCCESS ? TRUE : FALSE;
}

BOOL PlatformCloseHandle(HANDLE handle) {
  {
    const platform::Guard guard(All().lock);
    All().open.erase(handle);
  }
  return CloseHandle(handle);
}

}  // extern "C"
