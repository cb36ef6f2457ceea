// Folders of the host, entered one name at a time from an open descriptor.
//
// No path of the host is ever built from a name of the device: every step opens one name in one
// open folder and refuses symbolic links, so that nothing leads out of the device's folder.
#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "ce/types.h"
#include "locale/clock.h"
#include "storage/unique_fd.h"

namespace sim {

/// A file or folder as the host has it. Links, pipes and whatever else a host's folder may hold do
/// not exist for the device, nor do names that it could not say.
struct HostEntry {
  std::string name;  ///< on the host, in the spelling it has there
  bool folder = false;
  std::uint64_t size = 0;    ///< bytes; 0 for a folder
  std::uint64_t device = 0;  ///< with the inode it tells files apart, whatever their names
  std::uint64_t inode = 0;
  FileTicks modified = 0;  ///< by the host's clock
};

/// Opens folder `name` of `parent`. @return none, with errno set, for anything but a real folder.
[[nodiscard]] UniqueFd OpenFolder(int parent, const std::string& name);

/// The entry with exactly this name on the host.
[[nodiscard]] std::optional<HostEntry> StatEntry(int folder, const std::string& name);

/// The entry of a file or folder of which the host has said this.
[[nodiscard]] HostEntry EntryOf(const struct stat& status, const std::string& name);

/// All names in `folder` that the device can say, in no order.
[[nodiscard]] std::vector<std::u16string> ReadNames(int folder);

/// Names of the device's files and folders in `folder`, in the order in which the device lists
/// them: without regard to case.
[[nodiscard]] std::vector<std::u16string> ListNames(int folder);

/// The device's error number for one of the host's.
[[nodiscard]] DWORD ErrorOfErrno(int error);

}  // namespace sim
