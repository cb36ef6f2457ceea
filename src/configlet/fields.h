// The fields that the host may set.
#pragma once

#include <string_view>

namespace configlet {

struct Walk;

enum class NameMatch : std::uint8_t {
  kLeadingPart,  ///< any leading part of the name stands for it, the empty one too
  kWhole,
};

struct FieldRow {
  std::string_view name;
  NameMatch match;
  /// Stores `value`, never null, where the walk stands; nowhere when the field has no meaning
  /// there.
  void (*apply)(Walk& walk, const char* value) noexcept;
};

/// @return the first field in the schema's order that `name` stands for, null for an unknown one.
[[nodiscard]] const FieldRow* FindField(std::string_view name) noexcept;

}  // namespace configlet
