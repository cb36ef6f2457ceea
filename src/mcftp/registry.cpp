#include "mcftp/registry.h"

#include <coredll.h>

#include <cstddef>

#include "base/text.h"
#include "device/wide_text.h"

namespace mcftp {
namespace {

/// A path, divided into the root that it names and the rest.
class Path {
 public:
  explicit Path(std::string_view path) noexcept {
    const std::size_t end = path.find('\\');
    root_ = RootOf(base::Part(path, 0, end));
    const std::string_view rest = end == std::string_view::npos ? "" : base::Part(path, end + 1);
    valid_ = root_ != nullptr && !rest.empty() && name_.Assign(rest);
  }

  [[nodiscard]] explicit operator bool() const noexcept { return valid_; }
  [[nodiscard]] HKEY root() const noexcept { return root_; }
  [[nodiscard]] const WCHAR* name() const noexcept { return name_.c_str(); }

 private:
  static HKEY RootOf(std::string_view name) noexcept {
    if (name == "HKEY_CLASSES_ROOT") return HKEY_CLASSES_ROOT;
    if (name == "HKEY_CURRENT_USER") return HKEY_CURRENT_USER;
    if (name == "HKEY_LOCAL_MACHINE") return HKEY_LOCAL_MACHINE;
    if (name == "HKEY_USERS") return HKEY_USERS;
    return nullptr;
  }

  HKEY root_ = nullptr;
  device::WideText<> name_;
  bool valid_ = false;
};

bool Write(HKEY key, std::string_view name, DWORD type, const void* data,
           std::size_t size) noexcept {
  device::WideText<> wide;
  return wide.Assign(name) &&
         RegSetValueExW(key, wide.c_str(), 0, type, static_cast<const BYTE*>(data),
                        static_cast<DWORD>(size)) == ERROR_SUCCESS;
}

}  // namespace

Registry::Outcome Registry::Open(std::string_view path) noexcept {
  Close();
  const Path at(path);
  if (!at) return Outcome::kFailed;
  const auto error =
      static_cast<DWORD>(RegOpenKeyExW(at.root(), at.name(), 0, KEY_ALL_ACCESS, key_.Receive()));
  if (error == ERROR_SUCCESS) return Outcome::kDone;
  return error == ERROR_FILE_NOT_FOUND ? Outcome::kMissing : Outcome::kFailed;
}

bool Registry::Create(std::string_view path) noexcept {
  Close();
  const Path at(path);
  DWORD disposition = 0;
  return at &&
         RegCreateKeyExW(at.root(), at.name(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS,
                         nullptr, key_.Receive(), &disposition) == ERROR_SUCCESS;
}

bool Registry::DeleteKey(std::string_view path) noexcept {
  const Path at(path);
  return at && RegDeleteKeyW(at.root(), at.name()) == ERROR_SUCCESS;
}

Registry::Outcome Registry::ReadDword(std::string_view name, std::uint32_t& value) const noexcept {
  device::WideText<> wide;
  if (!wide.Assign(name)) return Outcome::kFailed;
  DWORD type = 0;
  DWORD number = 0;
  DWORD size = sizeof number;
  const auto error = static_cast<DWORD>(RegQueryValueExW(key_.get(), wide.c_str(), nullptr, &type,
                                                         reinterpret_cast<BYTE*>(&number), &size));
  // A value of another type may also be too long for a number.
  if (error == ERROR_FILE_NOT_FOUND || error == ERROR_MORE_DATA) return Outcome::kMissing;
  if (error != ERROR_SUCCESS) return Outcome::kFailed;
  if (type != REG_DWORD || size != sizeof number) return Outcome::kMissing;
  value = static_cast<std::uint32_t>(number);
  return Outcome::kDone;
}

bool Registry::WriteDword(std::string_view name, std::uint32_t value) const noexcept {
  const DWORD number = value;
  return Write(key_.get(), name, REG_DWORD, &number, sizeof number);
}

bool Registry::WriteString(std::string_view name, std::string_view text) const noexcept {
  device::WideText<> wide;
  if (!wide.Assign(text)) return false;
  return Write(key_.get(), name, REG_SZ, wide.c_str(), (wide.size() + 1) * sizeof(WCHAR));
}

}  // namespace mcftp
