// A small wrapper of the registry: one key, named by its whole path.
#pragma once

#include <cstdint>
#include <string_view>

#include "device/handle.h"

namespace mcftp {

/// One open key. Paths begin with the root's name and a backslash:
/// "HKEY_LOCAL_MACHINE\Software\...". Paths, names and texts are at most 299 characters long.
class Registry {
 public:
  enum class Outcome : std::uint8_t { kDone, kMissing, kFailed };

  /// Opens a key for reading and writing; the one that was open is closed.
  [[nodiscard]] Outcome Open(std::string_view path) noexcept;
  /// Makes a key, and the keys above it, and opens it; opens the one that exists.
  [[nodiscard]] bool Create(std::string_view path) noexcept;
  /// Deletes a key with its values. It must not be open.
  static bool DeleteKey(std::string_view path) noexcept;
  void Close() noexcept { key_.Reset(); }

  /// @return kMissing also for a value that is no 32-bit number; `value` is then unchanged.
  [[nodiscard]] Outcome ReadDword(std::string_view name, std::uint32_t& value) const noexcept;
  [[nodiscard]] bool WriteDword(std::string_view name, std::uint32_t value) const noexcept;
  [[nodiscard]] bool WriteString(std::string_view name, std::string_view text) const noexcept;

 private:
  device::RegistryKey key_;
};

}  // namespace mcftp
