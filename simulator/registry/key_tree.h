// The registry's keys and values, and how they are found.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "ce/types.h"

namespace sim {

struct RegistryValue {
  std::u16string name;  ///< in its own spelling; empty: the key's default value
  DWORD type = 0;
  std::vector<BYTE> data;
};

/// A key and all below it. Children and values are kept, and listed, in the order of their names
/// without regard to case.
struct RegistryKey {
  using Children = std::map<std::u16string, std::shared_ptr<RegistryKey>>;
  using Values = std::map<std::u16string, RegistryValue>;

  std::u16string name;
  unsigned depth = 0;  ///< of a root 0
  bool deleted = false;
  Children children;
  Values values;
};

/// Bounds of the simulated registry.
inline constexpr std::size_t kMaxRegistryName = 255;    ///< characters of a key's or value's name
inline constexpr unsigned kMaxRegistryDepth = 32;       ///< keys below a root
inline constexpr std::size_t kMaxRegistryData = 65536;  ///< bytes of a value

/// What stands between the backslashes of a key's path; one backslash at either end is ignored.
/// @return nothing for a path with an empty name, one that is too long, or a control character.
[[nodiscard]] std::optional<std::vector<std::u16string>> SplitKeyPath(std::u16string_view path);

/// True for the name of a value: at most kMaxRegistryName characters, no control character.
[[nodiscard]] bool ValidValueName(std::u16string_view name);

/// The four root keys and everything below.
class KeyTree {
 public:
  struct Root {
    std::u16string_view name;
    std::u16string_view short_name;
    std::uint32_t handle;
  };
  static constexpr std::array<Root, 4> kRoots = {{
      {u"HKEY_CLASSES_ROOT", u"HKCR", 0x80000000U},
      {u"HKEY_CURRENT_USER", u"HKCU", 0x80000001U},
      {u"HKEY_LOCAL_MACHINE", u"HKLM", 0x80000002U},
      {u"HKEY_USERS", u"HKU", 0x80000003U},
  }};

  KeyTree();
  KeyTree(const KeyTree&) = delete;
  KeyTree& operator=(const KeyTree&) = delete;

  /// @return null for a number or name that is no root's. Both spellings of a name count.
  [[nodiscard]] std::shared_ptr<RegistryKey> root(std::uint32_t handle) const;
  [[nodiscard]] std::shared_ptr<RegistryKey> root(std::u16string_view name) const;

  using Path = std::vector<std::u16string>;
  /// @return null when a name of the path is missing.
  [[nodiscard]] static std::shared_ptr<RegistryKey> Find(std::shared_ptr<RegistryKey> key,
                                                         const Path& path);
  /// Makes what is missing of the path. @return null when it leads deeper than kMaxRegistryDepth.
  /// @param created  whether the last key is new
  [[nodiscard]] static std::shared_ptr<RegistryKey> Make(std::shared_ptr<RegistryKey> key,
                                                         const Path& path, bool& created);
  /// Deletes a key with all below it. @return false when it is missing. The path is not empty.
  static bool Delete(const std::shared_ptr<RegistryKey>& key, const Path& path);

 private:
  std::array<std::shared_ptr<RegistryKey>, kRoots.size()> roots_;
};

}  // namespace sim
