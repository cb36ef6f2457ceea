// A RAM store as a device's driver would have it.
#pragma once

#include <cstdint>
#include <string>

namespace device {
class File;
}

namespace test {

/// A store of one file, and what was asked of it.
struct RamStore {
  std::string content;
  std::string made;    ///< the name that the object was made with
  std::string opened;  ///< and the one that it was opened with
  std::uint32_t size = 0;
  bool refuses = false;  ///< to open the file
  int files = 0;         ///< objects that there are
};
/// The device's store, set by the test.
extern RamStore* ram_store;

/// Makes a file of `ram_store`, for mcftp::ClientOwner.
device::File* MakeRamFile(const char* name);

}  // namespace test
