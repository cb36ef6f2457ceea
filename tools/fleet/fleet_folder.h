// Where the devices of a fleet live while it is under way.
#pragma once

#include <filesystem>

namespace fleet {

/// A new folder, gone with the object. One whose process was killed stays behind: the next object
/// removes it. A folder in use is known by a lock, which ends with its process.
class FleetFolder {
 public:
  /// @param parent  empty: in memory where the host has such a place, else where temporary files go
  /// @throws std::system_error when there can be none
  explicit FleetFolder(std::filesystem::path parent = {});
  ~FleetFolder();
  FleetFolder(const FleetFolder&) = delete;
  FleetFolder& operator=(const FleetFolder&) = delete;

  [[nodiscard]] const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
  int lock_ = -1;
};

}  // namespace fleet
