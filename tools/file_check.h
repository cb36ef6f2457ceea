// Whether a device has what its job wanted it to have.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tools/job_file.h"
#include "tools/lint/device_job.h"

namespace server {
class Site;
}
namespace sim {
class Device;
}

namespace tools {

enum class FileState : std::uint8_t {
  kRight,
  kWrong,  ///< another CRC or size than the list says
  kMissing,
  kUnchecked,  ///< there is nothing to compare it with
  kRemoved,    ///< a loader image for another chip, which the device has deleted
};

struct CheckedFile {
  std::string path;  ///< on the device
  FileState state = FileState::kMissing;
};

struct FileCheck {
  bool list_found = false;  ///< the job's list file is on the device
  std::vector<CheckedFile> files;

  [[nodiscard]] bool all_right() const;
};

[[nodiscard]] const char* NameOf(FileState state);

/// Reads the list file that `job` brings to the device, and looks at every file in it that is meant
/// for this device. What goes to "RAM:" must have been flashed. A job without a list file has
/// nothing to check.
[[nodiscard]] FileCheck CheckFiles(sim::Device& device, const Job& job);

/// The same for a configuration file, after this pass of the job: packages for the device, what its
/// INF file names, and downloads. They are compared with what is served.
/// @param site  the served folder; null: files only have to be there
[[nodiscard]] FileCheck CheckConfiguredFiles(sim::Device& device, const DeviceJob& job, int pass,
                                             server::Site* site);

}  // namespace tools
