// The fixture of the tests that end programs and delete files on a device.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "process/processes.h"
#include "product_support/jobs.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/cleanup.h"

namespace upgrade {

/// A volume's bit on a folder; on a file it means something else.
constexpr std::uint32_t kTemporary = FILE_ATTRIBUTE_TEMPORARY;

class CleanupTest : public DeviceTest {
 protected:
  explicit CleanupTest(const sim::Profile& profile = WithVolumes())
      : DeviceTest(profile), job_(std::make_unique<UpgradeConfig>()) {
    test::SetTypeAndFamily(*job_, "M", "R");
  }

  static sim::Profile WithVolumes() {
    sim::Profile profile;
    profile.volumes = {{"\\Flash File Store", 1000000, true},
                       {"\\TQ_FFS", 1000000, true},
                       {"\\Storage Card", 1000000, true}};
    profile.processes = {{"shell32.exe"}, {"Scanner.exe"}, {"Scanner.exe"}, {"sync.exe"}};
    return profile;
  }

  UpgradeConfig& job() { return *job_; }

  void Delete(const std::string& path) { DeletePath(path.c_str(), job()); }

  static void MakeRomFile(sim::Device& device, const std::string& path) {
    test::PutFile(path, "rom");
    const std::u16string wide(path.begin(), path.end());
    ASSERT_EQ(device.storage().SetAllAttributes(wide.c_str(), FILE_ATTRIBUTE_INROM), ERROR_SUCCESS);
  }

  /// The host's folder that is the device's root.
  std::filesystem::path Root() { return device().storage().HostPath(TEXT("\\")).value(); }

  /// A file that only a wide name can say.
  static void PutWide(const std::u16string& path) {
    HANDLE const file = CreateFileW(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                    FILE_ATTRIBUTE_NORMAL, nullptr);
    ASSERT_NE(file, INVALID_HANDLE_VALUE);
    CloseHandle(file);
  }
  static bool ExistsWide(const std::u16string& path) {
    return GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
  }

  std::vector<std::string> Running() {
    std::vector<std::string> names;
    for (const auto& entry : device().processes().List()) names.push_back(entry.name);
    return names;
  }

 private:
  std::unique_ptr<UpgradeConfig> job_;
};

}  // namespace upgrade
