// A package read as the upgrade reads it, without a device.
#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "upgrade/package/cabinet.h"
#include "upgrade/package/setup_file.h"

namespace test {

/// A copy that ends where the sanitizer sees it.
class ExactCopy {
 public:
  explicit ExactCopy(std::string_view bytes) : bytes_(new char[bytes.size()]), size_(bytes.size()) {
    std::copy(bytes.begin(), bytes.end(), bytes_.get());
  }
  [[nodiscard]] std::string_view view() const { return {bytes_.get(), size_}; }

 private:
  std::unique_ptr<char[]> bytes_;
  std::size_t size_;
};

/// What preparing a package finds in it.
struct PackageReading {
  upgrade::PackageResult found = upgrade::PackageResult::kDone;
  upgrade::PackageResult key_result = upgrade::PackageResult::kDone;
  std::string key;
  struct Path {
    upgrade::PackageResult result;
    std::string text;
  };
  std::vector<Path> paths;  ///< by number, from 0 to the number of files

  /// The texts of the paths that were found.
  [[nodiscard]] std::vector<std::string> Texts() const {
    std::vector<std::string> texts;
    for (const Path& path : paths) {
      if (path.result == upgrade::PackageResult::kDone) texts.push_back(path.text);
    }
    return texts;
  }
};

inline PackageReading ReadPackage(std::string_view bytes) {
  const ExactCopy cabinet(bytes);
  PackageReading reading;
  upgrade::StoredFile stored;
  reading.found = upgrade::FindSetupFile(cabinet.view(), &stored);
  if (reading.found != upgrade::PackageResult::kDone) return reading;
  const upgrade::SetupFile setup(stored);
  upgrade::SetupFile::RegistryKey key;
  reading.key_result = setup.ReadKey(&key);
  reading.key = std::string(key.view());
  upgrade::EntryIndex files(stored, setup.files());
  upgrade::EntryIndex strings(stored, setup.strings());
  std::vector<std::uint32_t> file_slots(files.SlotsFor(files.table().count));
  std::vector<std::uint32_t> string_slots(strings.SlotsFor(0xFFFF));
  files.Build(file_slots.data(), static_cast<std::uint32_t>(file_slots.size()));
  strings.Build(string_slots.data(), static_cast<std::uint32_t>(string_slots.size()));
  for (std::uint32_t id = 0; id <= files.table().count; ++id) {
    upgrade::InstalledPath path;
    const upgrade::PackageResult result = setup.ReadPath(id, files, strings, &path);
    reading.paths.push_back({result, std::string(path.view())});
  }
  return reading;
}

}  // namespace test
