// Loading a job from an upgrade configuration file.
#include <coredll.h>

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "device/handle.h"
#include "device/local_memory.h"
#include "device/wide_text.h"
#include "orvenix/upgrade_config.h"
#include "upgrade_config/configuration_reader.h"
#include "xml/document.h"

namespace {

constexpr std::size_t kPathSize = 260;
constexpr std::string_view kSystemFolder = "\\windows\\";
constexpr std::string_view kFlashFolder = "\\Flash File Store\\";

/// Where a configuration file lies.
class Location {
 public:
  explicit Location(const WCHAR* name) noexcept {
    device::NarrowText<kPathSize> narrow;
    if (!narrow.Assign(name)) return;
    in_system_folder_ = Set(kSystemFolder, narrow.view()) && IsFile();
    valid_ = in_system_folder_ || Set(kFlashFolder, narrow.view());
  }

  /// False: the path is longer than any of the device's.
  [[nodiscard]] explicit operator bool() const noexcept { return valid_; }
  [[nodiscard]] bool in_system_folder() const noexcept { return in_system_folder_; }
  [[nodiscard]] const WCHAR* path() const noexcept { return path_.c_str(); }

 private:
  [[nodiscard]] bool Set(std::string_view folder, std::string_view name) noexcept {
    return path_.Assign(folder) && path_.Append(name);
  }
  [[nodiscard]] bool IsFile() const noexcept {
    const DWORD attributes = GetFileAttributesW(path());
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) == 0;
  }

  device::WideText<kPathSize> path_;
  bool in_system_folder_ = false;
  bool valid_ = false;
};

/// Room for the whole of an open file; empty when there is none, or when the size is unknown or
/// beyond what a block can have.
device::LocalBlock<char> RoomFor(HANDLE file, std::uint32_t* size) noexcept {
  constexpr DWORD kLargestBlock = 0x7FFFFFFE;
  DWORD high = 0;
  const DWORD low = GetFileSize(file, &high);  // on failure the largest of all
  if (high != 0 || low > kLargestBlock) return {};
  *size = static_cast<std::uint32_t>(low);
  // One byte more: an empty file is no shortage of memory.
  return device::LocalBlock<char>(
      static_cast<char*>(LocalAlloc(LMEM_FIXED, static_cast<std::size_t>(low) + 1)));
}

/// @return bytes read: fewer than `size` when the file ends or fails before.
std::uint32_t ReadAll(HANDLE file, char* bytes, std::uint32_t size) noexcept {
  std::uint32_t read = 0;
  DWORD taken = 0;
  while (read < size && ReadFile(file, bytes + read, size - read, &taken, nullptr) != 0 &&
         taken > 0) {
    read += static_cast<std::uint32_t>(taken);
  }
  return read;
}

enum class Reading : std::uint8_t { kNotOpened, kNoMemory, kDone };

/// Reads the file into the document, which stays empty when its text is refused.
Reading ReadDocument(const Location& location, xml::XmlDocument& document) noexcept {
  if (!location) return Reading::kNotOpened;
  device::FileHandle file(CreateFileW(location.path(), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                      OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!file) return Reading::kNotOpened;
  std::uint32_t size = 0;
  const device::LocalBlock<char> text = RoomFor(file.get(), &size);
  if (!text) return Reading::kNoMemory;
  const std::uint32_t read = ReadAll(file.get(), text.get(), size);
  file.Reset();
  document.LoadFromText(text.get(), read);
  return Reading::kDone;
}

}  // namespace

int UpgradeConfig::LoadFromFile(const orvenix::WideChar* name) noexcept {
  const Location location(name);
  xml::XmlDocument document;
  const Reading reading = ReadDocument(location, document);
  if (reading == Reading::kNoMemory) return 1;
  orvenix::ConfigurationReader(*this).Read(document);
  // A job of the system folder is loaded once, even if this one will never be understood.
  if (location.in_system_folder()) DeleteFileW(location.path());
  return reading == Reading::kDone ? 1 : 0;
}
