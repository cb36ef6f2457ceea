#include "targets/host/device_files.h"

#include <cstring>
#include <vector>

namespace host {
namespace {

using Wide = std::basic_string<WCHAR>;

/// An open file, closed at the end of its scope.
class File {
 public:
  File(std::string_view path, DWORD access, DWORD disposition)
      : handle_(CreateFileW(Widen(path).c_str(), access, FILE_SHARE_READ | FILE_SHARE_WRITE,
                            nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr)) {}
  ~File() {
    if (is_open()) CloseHandle(handle_);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  [[nodiscard]] bool is_open() const { return handle_ != INVALID_HANDLE_VALUE; }
  [[nodiscard]] HANDLE handle() const { return handle_; }

  [[nodiscard]] bool Write(std::string_view text) const {
    DWORD written = 0;
    const auto size = static_cast<DWORD>(text.size());
    return is_open() && WriteFile(handle_, text.data(), size, &written, nullptr) != FALSE &&
           written == size;
  }

 private:
  HANDLE handle_;
};

/// An open registry key.
class Key {
 public:
  explicit Key(std::string_view path) {
    DWORD is_new = 0;
    const LONG error = RegCreateKeyExW(HKEY_LOCAL_MACHINE, Widen(path).c_str(), 0, nullptr, 0,
                                       KEY_ALL_ACCESS, nullptr, &key_, &is_new);
    if (error != ERROR_SUCCESS) key_ = nullptr;
  }
  ~Key() {
    if (key_ != nullptr) RegCloseKey(key_);
  }
  Key(const Key&) = delete;
  Key& operator=(const Key&) = delete;

  bool Set(std::string_view name, DWORD type, const void* data, std::size_t size) {
    return key_ != nullptr &&
           RegSetValueExW(key_, Widen(name).c_str(), 0, type, static_cast<const BYTE*>(data),
                          static_cast<DWORD>(size)) == ERROR_SUCCESS;
  }
  /// @return false when there is no such value
  bool Get(std::string_view name, DWORD& type, std::vector<BYTE>& data) {
    DWORD size = 1024;
    data.resize(size);
    const bool found = key_ != nullptr && RegQueryValueExW(key_, Widen(name).c_str(), nullptr,
                                                           &type, data.data(), &size) == 0;
    data.resize(found ? size : 0);
    return found;
  }

 private:
  HKEY key_ = nullptr;
};

std::string Hexadecimal(const std::vector<BYTE>& bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const BYTE byte : bytes) {
    text += kDigits[byte >> 4U];
    text += kDigits[byte & 0xFU];
  }
  return text;
}

/// Texts of the registry are ASCII here; their zeros at the end show.
std::string Narrow(const std::vector<BYTE>& bytes) {
  std::string text;
  for (std::size_t i = 0; i + 1 < bytes.size(); i += 2) {
    text += bytes[i] == 0 ? std::string("\\0") : std::string(1, static_cast<char>(bytes[i]));
  }
  return text;
}

}  // namespace

Wide Widen(std::string_view text) {
  Wide wide(text.size(), 0);
  const auto size = static_cast<int>(text.size());
  const int length = MultiByteToWideChar(CP_ACP, 0, text.data(), size, wide.data(), size);
  wide.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
  return wide;
}

std::optional<std::string> ReadWhole(std::string_view path) {
  const File file(path, GENERIC_READ, OPEN_EXISTING);
  if (!file.is_open()) return std::nullopt;
  std::string content(GetFileSize(file.handle(), nullptr), '\0');
  DWORD got = 0;
  if (!content.empty() && ReadFile(file.handle(), content.data(),
                                   static_cast<DWORD>(content.size()), &got, nullptr) == FALSE) {
    return std::nullopt;
  }
  content.resize(got);
  return content;
}

bool Append(std::string_view path, std::string_view text) {
  const File file(path, GENERIC_WRITE, OPEN_ALWAYS);
  if (!file.is_open()) return false;
  SetFilePointer(file.handle(), 0, nullptr, FILE_END);
  return file.Write(text);
}

bool Write(std::string_view path, std::string_view text) {
  return File(path, GENERIC_WRITE, CREATE_ALWAYS).Write(text);
}

std::uint64_t WriteTimeOf(std::string_view path) {
  const File file(path, GENERIC_READ, OPEN_EXISTING);
  FILETIME written = {};
  if (!file.is_open() || GetFileTime(file.handle(), nullptr, nullptr, &written) == FALSE) return 0;
  return std::uint64_t{written.dwHighDateTime} << 32U | written.dwLowDateTime;
}

bool MakeFolder(std::string_view path) {
  return CreateDirectoryW(Widen(path).c_str(), nullptr) != FALSE;
}

bool SetRegistryText(std::string_view key, std::string_view name, std::string_view value) {
  const Wide wide = Widen(value);
  return Key(key).Set(name, REG_SZ, wide.c_str(), (wide.size() + 1) * sizeof(WCHAR));
}

bool SetRegistryNumber(std::string_view key, std::string_view name, DWORD value) {
  return Key(key).Set(name, REG_DWORD, &value, sizeof value);
}

std::string DescribeRegistryValue(std::string_view key, std::string_view name) {
  DWORD type = 0;
  std::vector<BYTE> data;
  if (!Key(key).Get(name, type, data)) return "(none)";
  if (type == REG_SZ) return Narrow(data);
  if (type != REG_DWORD || data.size() != sizeof(DWORD)) return Hexadecimal(data);
  DWORD number = 0;
  std::memcpy(&number, data.data(), sizeof number);
  return std::to_string(number);
}

}  // namespace host
