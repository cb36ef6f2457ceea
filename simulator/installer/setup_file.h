// The setup file of a package: what an installer is told to do.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "registry/key_tree.h"

namespace sim {

/// A file that a package brings.
struct PackageFile {
  std::uint16_t id = 0;  ///< the data are in the cabinet's file whose name ends in ".001" for 1
  std::string path;      ///< on the device, in its code page
};

/// A value that a package writes.
struct PackageValue {
  std::uint32_t root = 0;  ///< as KeyTree::Root::handle
  std::string key;         ///< in the device's code page, as the value's name and text
  RegistryValue value;
};

struct PackageSetup {
  std::string provider;
  std::string application;
  std::string folder;  ///< the package's first folder
  std::vector<PackageFile> files;
  std::vector<PackageValue> values;

  /// Below HKEY_LOCAL_MACHINE; it is there as long as the package is installed.
  [[nodiscard]] std::string key() const {
    return "SOFTWARE\\Apps\\" + provider + " " + application;
  }
};

/// Reads a setup file of any bytes.
/// @return false with what is wrong with it in `error`.
bool ReadPackageSetup(std::string_view bytes, PackageSetup& setup, std::string& error);

}  // namespace sim
