// A device whose firmware is upgraded, and what its flash driver has done.
#pragma once

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "kernel/debug.h"
#include "orvenix/configlet.h"
#include "scenario/scenario_test.h"

namespace test {

/// What was written into a device's flash under this name, "(none)" for nothing.
inline std::string FlashedOn(const sim::Device& device, const std::string& name) {
  const auto path = device.folder() / "flash" / name;
  if (!std::filesystem::exists(path)) return "(none)";
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

inline sim::Profile FirmwareProfile(const std::string& flash_start = "writes",
                                    std::uint8_t disk_generation = 0) {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  profile.flash_start = flash_start;
  profile.disk_generation = disk_generation;
  return profile;
}

class FirmwareScenario : public ScenarioTest {
 protected:
  explicit FirmwareScenario(const sim::Profile& profile = FirmwareProfile())
      : ScenarioTest(profile) {
    job_.store = "RAM:";
    job_.required_space = "1000000";
  }

  std::string Flashed(const std::string& name) { return FlashedOn(device(), name); }
  std::size_t FlashedFiles() {
    const auto folder = device().folder() / "flash";
    if (!std::filesystem::exists(folder)) return 0;
    const std::filesystem::directory_iterator begin(folder);
    return static_cast<std::size_t>(std::distance(begin, {}));
  }

  /// Lists a file for the job and puts it on the HTTP server.
  void ListAs(const std::string& destination, const std::string& name, const std::string& content) {
    const std::string crc = server().Put("fw/" + name, content);
    list_ += "fw/" + name + "," + destination + ",TQ5*," + crc + "," +
             std::to_string(content.size()) + "\r\n";
    const std::string list_crc = server().Put("fw/list.txt", list_);
    job_.list = HostFile{"fw/list.txt", "\\list.txt", "*", list_crc};
  }
  /// An image for the flash driver's store.
  void List(const std::string& name, const std::string& image) {
    ListAs("RAM:" + name, name, image);
  }
  void RunJob() {
    EXPECT_EQ(Start(job_), ICFG_OK);
    ASSERT_TRUE(AwaitEndOfJobs(device()));
  }
  /// How often a text stands in the kernel's debug output.
  std::size_t Count(const std::string& text) {
    const std::string output = device().debug().KernelText();
    std::size_t count = 0;
    for (std::size_t at = output.find(text); at != std::string::npos;
         at = output.find(text, at + 1)) {
      ++count;
    }
    return count;
  }

  HostJob job_;
  std::string list_;
};

}  // namespace test
