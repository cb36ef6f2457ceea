// The groups that the host may begin and end.
#pragma once

#include <cstdint>
#include <string_view>

#include "configlet/result.h"

namespace configlet {

struct Walk;

struct GroupRow {
  std::string_view name;
  /// Null when beginning the group does nothing.
  IcfgResult (*begin)(Walk& walk, std::uint32_t mode) noexcept;
  /// Null when ending it does nothing.
  IcfgResult (*end)(Walk& walk) noexcept;
};

/// @return the group of that whole name, in any letter case; null for an unknown one.
[[nodiscard]] const GroupRow* FindGroup(std::string_view name) noexcept;

}  // namespace configlet
