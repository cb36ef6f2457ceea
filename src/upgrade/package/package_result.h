// What comes of looking into a package.
#pragma once

#include <cstdint>

namespace upgrade {

/// The numbers are part of the interface; nobody acts on them.
enum class PackageResult : std::uint8_t {
  kDone = 0,
  kCannotOpen = 1,
  kCannotSeek = 2,  ///< a position lies behind the end of the file
  kCannotRead = 3,  ///< the file ends early, there is no memory, or an entry is missing
  kNoCabinet = 5,
  kNoSetupFile = 6,  ///< none that is stored uncompressed at the beginning of a folder
  kNameOrRegistry = 7,
};

}  // namespace upgrade
