// The setup file of a package: what a device's installer is told to do.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tools {

/// Longest texts that a device prepares, in characters.
inline constexpr std::size_t kMaxPackageName = 63;
inline constexpr std::size_t kMaxPackagePath = 259;

/// What a package does. Texts are in the device's code page.
struct PackagePlan {
  struct File {
    std::size_t folder = 0;  ///< of folders
    std::string name;
  };
  enum class ValueType : std::uint32_t {
    kText = 0x00000000,
    kBinary = 0x00000001,
    kTexts = 0x00010000,
    kNumber = 0x00010001,
  };
  struct Value {
    std::size_t key = 0;  ///< of keys
    std::string name;
    ValueType type = ValueType::kText;
    std::string data;
  };
  struct Key {
    std::size_t root = 0;  ///< 1 to 4: HKEY_CLASSES_ROOT, _CURRENT_USER, _LOCAL_MACHINE, _USERS
    std::string path;
  };
  std::string provider;
  std::string application;
  std::vector<std::string> folders;  ///< macros for the device's own folders in them
  std::vector<File> files;           ///< numbered from 1
  std::vector<Key> keys;
  std::vector<Value> values;
};

/// The setup file. Every folder is one string and one directory of the same number: a device that
/// prepares a package takes one for the other.
[[nodiscard]] std::string FormatPackageSetup(const PackagePlan& plan);

}  // namespace tools
