// Packages: a folder of files as a cabinet that a device's installer installs.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <string>

#include "tools/package/setup_writer.h"

namespace tools {

/// What a package is made from.
struct PackageOptions {
  std::filesystem::path folder;   ///< the files; sub-folders included
  std::filesystem::path cabinet;  ///< where it goes; a file there is replaced
  std::string application;
  std::string provider;
  std::string destination;         ///< folder on the device
  std::filesystem::path registry;  ///< values to write, as .reg text; empty: none
};

struct Package {
  std::size_t files = 0;
  std::size_t values = 0;
  std::uint64_t size = 0;  ///< of the cabinet
  std::string key;         ///< below HKEY_LOCAL_MACHINE, there once it is installed
};

/// Makes a package that a device can prepare before it installs it: stored uncompressed, the setup
/// file first. The same files, times and options give the same bytes.
///
/// Throws Failure kBadInput and kUsage for what devices could not take, before anything is written,
/// and kCannotWrite.
Package MakePackage(const PackageOptions& options);

/// A folder of the device as packages name it: "\Program Files\Scan" is "%CE1%\Scan".
[[nodiscard]] std::string FolderWithMacro(const std::string& folder);

}  // namespace tools
