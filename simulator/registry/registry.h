// A device's registry: kept in `registry.reg` of the device's folder, a text that can be read and
// edited while the device is off.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <mutex>
#include <unordered_map>

#include "ce/system.h"
#include "registry/key_tree.h"

namespace sim {

class Device;

/// Any thread. The functions for the API give error numbers, 0 for success.
class Registry {
 public:
  /// Reads the device's file; a missing one is an empty registry.
  /// @throws std::runtime_error "file: line 12: ..." for a file that is not understood: it is left
  ///   as it is, for whoever edited it.
  explicit Registry(Device& device);
  /// Saves what has changed.
  ~Registry();
  Registry(const Registry&) = delete;
  Registry& operator=(const Registry&) = delete;

  /// Writes the file if something has changed since it was written: at once, beside the old one,
  /// which it then replaces. Done at every RegCloseKey. @return false when the host refuses.
  bool Save();
  /// Key handles that nobody has closed.
  [[nodiscard]] std::size_t open_keys() const;

  // ---- for the API functions ----

  /// @param path  null and "" stand for the key itself
  DWORD Open(HKEY key, const WCHAR* path, HKEY& opened);
  DWORD Create(HKEY key, const WCHAR* path, HKEY& opened, DWORD& disposition);
  DWORD Close(HKEY key);
  /// @param value  a copy
  DWORD Query(HKEY key, const WCHAR* name, RegistryValue& value) const;
  DWORD Set(HKEY key, RegistryValue value);
  DWORD DeleteValue(HKEY key, const WCHAR* name);
  DWORD DeleteKey(HKEY key, const WCHAR* path);
  /// The name of the subkey, or the value, at `index` in the order of names.
  DWORD EnumKey(HKEY key, DWORD index, std::u16string& name) const;
  DWORD EnumValue(HKEY key, DWORD index, RegistryValue& value) const;

 private:
  using Hold = std::lock_guard<std::mutex>;

  // With the lock held:
  DWORD FindKey(HKEY handle, std::shared_ptr<RegistryKey>& key) const;
  DWORD AddHandle(std::shared_ptr<RegistryKey> key, HKEY& handle);
  bool SaveHeld();

  const std::filesystem::path file_;
  mutable std::mutex mutex_;
  KeyTree tree_;
  bool changed_ = false;
  std::unordered_map<std::uint32_t, std::shared_ptr<RegistryKey>> open_;
  std::uint32_t next_handle_;
};

}  // namespace sim
