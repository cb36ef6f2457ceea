#include "device/flash/registry_helpers.h"

#include "base/text.h"

namespace device {
namespace {

HKEY open_key = nullptr;

bool HasKey() noexcept {
  if (open_key != nullptr) return true;
  // The same text for numbers, too: whoever searches the output knows it so.
  NKDbgPrintfW(TEXT("RegSetString called with NULL handle.\r\n"));
  return false;
}

std::int32_t Set(const WCHAR* name, DWORD type, const void* data, std::size_t size) noexcept {
  return static_cast<std::int32_t>(RegSetValueExW(
      open_key, name, 0, type, static_cast<const BYTE*>(data), static_cast<DWORD>(size)));
}

}  // namespace

bool RegEnter(const WCHAR* path) noexcept {
  WCHAR no_class[] = {0};
  HKEY key = nullptr;
  DWORD disposition = 0;
  const bool opened =
      RegCreateKeyExW(HKEY_LOCAL_MACHINE, path, 0, no_class, REG_OPTION_NON_VOLATILE,
                      KEY_ALL_ACCESS, nullptr, &key, &disposition) == ERROR_SUCCESS;
  open_key = opened ? key : nullptr;
  if (!opened) NKDbgPrintfW(TEXT("ERROR Opening the registry key\r\n"));
  return opened;
}

bool RegExit() noexcept {
  if (open_key == nullptr) {
    NKDbgPrintfW(TEXT("RegExit called too often.\r\n"));
    return false;
  }
  RegCloseKey(open_key);
  return true;
}

HKEY OpenKey() noexcept {
  return open_key;
}

bool GetRegistryValue(HKEY key, const WCHAR* name, std::uint32_t* value) noexcept {
  DWORD type = 0;
  DWORD number = 0;
  DWORD size = sizeof number;
  const auto result =
      RegQueryValueExW(key, name, nullptr, &type, reinterpret_cast<BYTE*>(&number), &size);
  if (result != ERROR_SUCCESS || type != REG_DWORD) {
    NKDbgPrintfW(TEXT("RegQueryValueEx(%s) failed -returned %d  Error=%08X\r\n"), name,
                 static_cast<int>(result), static_cast<UINT>(GetLastError()));
    *value = 0xFFFFFFFFU;
    return false;
  }
  *value = static_cast<std::uint32_t>(number);
  NKDbgPrintfW(TEXT("GetRegistryValue(%s) Value(%x) hKey: %x\r\n"), name, static_cast<UINT>(number),
               static_cast<UINT>(reinterpret_cast<UINT_PTR>(key)));
  return true;
}

std::int32_t RegSetString(const WCHAR* name, const WCHAR* text) noexcept {
  if (!HasKey()) return ERROR_INVALID_HANDLE;
  const std::size_t length = base::WideView(text).size();
  return Set(name, REG_SZ, text, (length + 1) * sizeof(WCHAR));
}

std::int32_t RegSetDword(const WCHAR* name, std::uint32_t value) noexcept {
  if (!HasKey()) return ERROR_INVALID_HANDLE;
  return Set(name, REG_DWORD, &value, sizeof value);
}

}  // namespace device
