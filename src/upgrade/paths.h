// Names of files as jobs write them.
#pragma once

#include <cstddef>
#include <string_view>

#include "base/text.h"

namespace upgrade {

/// Room for the longest path.
inline constexpr std::size_t kPathSize = 260;
using PathText = base::FixedText<kPathSize>;

/// In front of the names of files in the memory of the flash driver.
inline constexpr std::string_view kRamPrefix = "RAM:";

/// Whether the name is that of a file in the memory of the flash driver. Letter case counts.
[[nodiscard]] constexpr bool IsRamName(std::string_view name) noexcept {
  return base::StartsWith(name, kRamPrefix);
}

/// What stands behind the last backslash.
[[nodiscard]] constexpr std::string_view FileName(std::string_view path) noexcept {
  return base::Part(path, path.rfind('\\') + 1);
}
static_assert(FileName("a\\b") == "b" && FileName("b") == "b" && FileName("a\\").empty());

/// What stands before the last backslash, empty without one.
[[nodiscard]] constexpr std::string_view FolderOf(std::string_view path) noexcept {
  const std::size_t at = path.rfind('\\');
  return at == std::string_view::npos ? std::string_view{} : base::Part(path, 0, at);
}
static_assert(FolderOf("\\a\\b") == "\\a" && FolderOf("\\b").empty() && FolderOf("b").empty());

/// Makes the folder that `path` lies in, and the folders above it, as far as they are missing. What
/// cannot be made is found out when the file is opened.
void CreateFolderOf(std::string_view path) noexcept;

}  // namespace upgrade
