// The settings of a profile file, one row each.
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "profile/profile.h"

namespace sim {

/// Why a value is refused, and what would be accepted; empty when it was taken.
using Complaint = std::string;

/// One `key = value` of a section whose values belong to Record.
template <typename Record>
struct Setting {
  std::string_view section;  ///< of Profile; the sections of volumes and programs name their rows
  std::string_view key;
  std::string_view comment;
  std::function<Complaint(Record&, std::string_view)> read;
  std::function<std::string(const Record&)> write;
};

/// In the order in which they are written.
[[nodiscard]] const std::vector<Setting<Profile>>& ProfileSettings();
[[nodiscard]] const std::vector<Setting<VolumeProfile>>& VolumeSettings();
[[nodiscard]] const std::vector<Setting<ProgramProfile>>& ProgramSettings();

}  // namespace sim
