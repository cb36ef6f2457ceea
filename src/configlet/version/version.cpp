#include "configlet/version/version.h"

#include <coredll.h>

#include <cstddef>

#include "base/format.h"
#include "base/text.h"
#include "device/handle.h"
#include "report/log/log.h"

namespace configlet {
namespace {

constexpr WCHAR kSubsystemsKey[] = TEXT("Software\\Corvanta\\TWClient\\Subsystems");
constexpr WCHAR kFolderValue[] = TEXT("Path");
constexpr WCHAR kDefaultFolder[] = TEXT("\\Tarnwell\\TWSubSystems");
constexpr WCHAR kConfigletFile[] = TEXT("\\Orvenix.ini");
constexpr WCHAR kMulticastFile[] = TEXT("\\MCFTP.ini");

/// A longer value, terminating zero included, is not read at all.
constexpr DWORD kMaxFolderBytes = 260;

using Path = base::WideFixedText<260>;

/// The client's subsystem folder: the registry's, or the usual one when that names none.
Path SubsystemFolder() noexcept {
  WCHAR folder[kMaxFolderBytes / sizeof(WCHAR) + 1] = {};  // a value need not be terminated
  device::RegistryKey key;
  DWORD size = kMaxFolderBytes;
  if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, kSubsystemsKey, 0, KEY_READ, key.Receive()) !=
          ERROR_SUCCESS ||
      RegQueryValueExW(key.get(), kFolderValue, nullptr, nullptr, reinterpret_cast<BYTE*>(folder),
                       &size) != ERROR_SUCCESS) {
    folder[0] = 0;
  }
  return Path(folder[0] != 0 ? folder : kDefaultFolder);
}

void WriteVersionFile(const Path& folder, const WCHAR* name) noexcept {
  Path path = folder;
  path.Append(name);
  const device::FileHandle file(CreateFileW(path.c_str(), GENERIC_WRITE, FILE_SHARE_READ, nullptr,
                                            CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!file) return;
  char content[32];
  const std::size_t length = base::Format(content, sizeof content, "Version=%s", kVersionText);
  report::Log("%s\r\n", content);
  DWORD written = 0;
  WriteFile(file.get(), content, static_cast<DWORD>(length), &written, nullptr);
}

}  // namespace

void WriteVersionFiles() noexcept {
  const Path folder = SubsystemFolder();
  WriteVersionFile(folder, kConfigletFile);
  WriteVersionFile(folder, kMulticastFile);
}

}  // namespace configlet
