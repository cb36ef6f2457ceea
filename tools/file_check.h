// Whether a device has what its job wanted it to have.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tools/job_file.h"

namespace sim {
class Storage;
}

namespace tools {

enum class FileState : std::uint8_t {
  kRight,
  kWrong,  ///< another CRC or size than the list says
  kMissing,
  kUnchecked,  ///< the list gives no CRC, so devices leave the file alone
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
/// for a device with this configuration text. A job without a list file has nothing to check.
[[nodiscard]] FileCheck CheckFiles(sim::Storage& storage, const Job& job,
                                   const std::string& configuration);

}  // namespace tools
