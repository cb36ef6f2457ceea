// A device with a flash store, onto which tests put configuration files.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "memory/memory.h"
#include "orvenix/upgrade_config.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace test {

inline constexpr char kInSystemFolder[] = "\\windows\\job.xml";
inline constexpr char kInFlashStore[] = "\\Flash File Store\\job.xml";

/// The device is a TQ52-A1 unless the profile says otherwise.
class ConfigurationTest : public DeviceTest {
 protected:
  ConfigurationTest() : ConfigurationTest(sim::Profile{}) {}
  explicit ConfigurationTest(sim::Profile profile) : DeviceTest(WithFlash(std::move(profile))) {}

  static sim::Profile WithFlash(sim::Profile profile) {
    profile.volumes.push_back({"\\Flash File Store", 100000000, true});
    return profile;
  }

  /// Puts a whole file into the flash store, where it stays, and loads it.
  static int LoadText(UpgradeConfig& job, std::string_view text) {
    PutFile(kInFlashStore, text);
    return job.LoadFromFile(u"job.xml");
  }

  /// The same with `elements` below a root.
  static int Load(UpgradeConfig& job, std::string_view elements) {
    return LoadText(job, "<Job>" + std::string(elements) + "</Job>");
  }

  [[nodiscard]] std::size_t Blocks() { return device().memory().live_blocks(); }
  [[nodiscard]] std::uint64_t BadFrees() { return device().memory().bad_frees(); }
};

inline std::vector<std::string> Texts(const orvenix::PointerList<char>& list) {
  std::vector<std::string> texts;
  for (const char* text : list) texts.emplace_back(text);
  return texts;
}

/// Source and destination of each, with an arrow between them.
inline std::vector<std::string> Downloads(const UpgradeConfig& job) {
  std::vector<std::string> files;
  for (const tagDownloadFile* file : job.DownloadFiles()) {
    files.push_back(std::string(file->source) + " -> " + file->destination);
  }
  return files;
}

/// A list of one package with these attributes.
inline std::string Package(const std::string& attributes) {
  return "<OSFirmware><Package " + attributes + "/></OSFirmware>";
}

/// Source folder, base and destination folder of each package, divided by bars.
inline std::vector<std::string> Packages(const UpgradeConfig& job) {
  std::vector<std::string> packages;
  for (const FirmwarePackage* package : job.FirmwarePackages()) {
    packages.push_back(std::string(package->source_folder) + "|" + package->base + "|" +
                       package->destination_folder);
  }
  return packages;
}

}  // namespace test
