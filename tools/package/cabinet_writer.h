// Cabinets with stored data, as a device's installer takes them and a device can look into.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

namespace tools {

/// One file for a cabinet.
struct CabinetEntry {
  std::string name;                    ///< within the cabinet
  std::filesystem::path file;          ///< where the content is,
  std::optional<std::string> content;  ///< or the content itself
  std::uint64_t size = 0;
  std::int64_t time = 0;  ///< seconds since 1970
};

/// The largest sum of sizes that a cabinet can hold.
inline constexpr std::uint64_t kMaxCabinetData = 0x7FFF8000;

/// Writes a cabinet of one folder whose data are not compressed, with checksums. The same entries
/// give the same bytes. Nobody sees half of it: it is written beside its place and then moved
/// there. Throws Failure kCannotWrite, and kBadInput for a file that cannot be read or has another
/// size.
void WriteCabinet(const std::filesystem::path& cabinet, const std::vector<CabinetEntry>& entries);

}  // namespace tools
