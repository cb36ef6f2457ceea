// What a device tells of itself. A desktop tells what its registry says below
// HKEY_LOCAL_MACHINE\Software\Orvenix\Identity: "Platform" is the platform type, and the value
// named by a selector's number, as text or as bytes, the answer to that selector. Without the value
// "2", the serial number, it is the machine's name.
#define ORVENIX_DESKTOP_NAMES
#include <coredll.h>

#include <cstring>
#include <string>

namespace {

constexpr WCHAR kIdentityKey[] = TEXT("Software\\Orvenix\\Identity");
constexpr DWORD kIdentityQuery = 0x010122C4;
constexpr BYTE kSerialSelector = 2;
constexpr DWORD kMostBytes = 512;
constexpr UINT kPlatformType = 257;  // SPI_GETPLATFORMTYPE, and the number behind it
constexpr UINT kMaker = 258;

/// @return the bytes of a value, none when there is no such value; texts with their terminator.
std::string ValueOf(const WCHAR* name, DWORD* type) {
  HKEY key = nullptr;
  if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, kIdentityKey, 0, KEY_READ, &key) != ERROR_SUCCESS)
    return {};
  char bytes[kMostBytes];
  DWORD size = sizeof bytes;
  const LONG result =
      RegQueryValueExW(key, name, nullptr, type, reinterpret_cast<BYTE*>(bytes), &size);
  RegCloseKey(key);
  return result == ERROR_SUCCESS ? std::string(bytes, size) : std::string();
}

std::wstring WideValueOf(const WCHAR* name) {
  DWORD type = 0;
  const std::string bytes = ValueOf(name, &type);
  if (type != REG_SZ) return {};
  std::wstring text(bytes.size() / sizeof(WCHAR), 0);
  std::memcpy(text.data(), bytes.data(), text.size() * sizeof(WCHAR));
  return text.c_str();
}

std::string Narrow(const WCHAR* text) {
  char narrow[kMostBytes];
  const int size =
      WideCharToMultiByte(CP_ACP, 0, text, -1, narrow, sizeof narrow, nullptr, nullptr);
  return size > 0 ? std::string(narrow, static_cast<std::size_t>(size)) : std::string();
}

std::string AnswerTo(BYTE selector) {
  const std::wstring name = std::to_wstring(selector);
  DWORD type = 0;
  const std::string bytes = ValueOf(name.c_str(), &type);
  if (!bytes.empty()) return type == REG_SZ ? Narrow(WideValueOf(name.c_str()).c_str()) : bytes;
  if (selector != kSerialSelector) return {};
  WCHAR machine[MAX_COMPUTERNAME_LENGTH + 1];
  const DWORD size = sizeof machine / sizeof machine[0];
  const DWORD length = GetEnvironmentVariableW(TEXT("COMPUTERNAME"), machine, size);
  return length != 0 && length < size ? Narrow(machine) : std::string();
}

BOOL Fail(DWORD error) {
  SetLastError(error);
  return FALSE;
}

}  // namespace

extern "C" {

BOOL KernelIoControl(DWORD code, void* input, DWORD input_size, void* output, DWORD output_size,
                     DWORD* returned) {
  if (code != kIdentityQuery) return Fail(ERROR_NOT_SUPPORTED);
  if (input == nullptr || input_size < 2 || output == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  const std::string answer = AnswerTo(*static_cast<const BYTE*>(input));
  if (answer.empty()) return Fail(ERROR_NOT_SUPPORTED);
  if (answer.size() > output_size) return Fail(ERROR_INSUFFICIENT_BUFFER);
  std::memcpy(output, answer.data(), answer.size());
  if (returned != nullptr) *returned = static_cast<DWORD>(answer.size());
  return TRUE;
}

BOOL PlatformSystemParametersInfoW(UINT action, UINT parameter, void* value, UINT update) {
  if (action != kPlatformType && action != kMaker) {
    return SystemParametersInfoW(action, parameter, value, update);
  }
  const std::wstring platform = WideValueOf(TEXT("Platform"));
  if (value == nullptr || platform.empty()) return Fail(ERROR_INVALID_PARAMETER);
  if (platform.size() >= parameter) return Fail(ERROR_INSUFFICIENT_BUFFER);
  std::memcpy(value, platform.c_str(), (platform.size() + 1) * sizeof(WCHAR));
  return TRUE;
}

}  // extern "C"
