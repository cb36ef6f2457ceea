// The host's descriptors of files that were written and closed a moment ago.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <utility>

#include "storage/host_folder.h"
#include "storage/unique_fd.h"

namespace sim {

/// A log is opened and closed for each of its lines; while its descriptor waits here, that costs
/// the host nothing. A descriptor that is held keeps its inode from being given to another file, so
/// what is found by device and inode is the same file. For one thread at a time.
class ParkedFiles {
 public:
  /// @param access  what the file was opened for; only an equal one takes it out again
  void Park(std::uint64_t device, std::uint64_t inode, std::uint32_t access, UniqueFd fd) {
    Forget(device, inode);
    files_[next_] = {device, inode, access, std::move(fd)};
    next_ = (next_ + 1) % files_.size();
  }
  /// @return none when the file is not here.
  UniqueFd Take(const HostEntry& entry, std::uint32_t access) {
    for (File& file : files_) {
      if (file.Is(entry.device, entry.inode) && file.access == access) return std::move(file.fd);
    }
    return {};
  }
  /// A deleted file must not keep its room on the host.
  void Forget(std::uint64_t device, std::uint64_t inode) {
    for (File& file : files_) {
      if (file.Is(device, inode)) file.fd.Reset();
    }
  }

 private:
  struct File {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::uint32_t access = 0;
    UniqueFd fd;
    [[nodiscard]] bool Is(std::uint64_t on, std::uint64_t number) const {
      return fd && device == on && inode == number;
    }
  };
  std::array<File, 4> files_;
  std::size_t next_ = 0;
};

}  // namespace sim
