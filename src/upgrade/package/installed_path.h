// Where a package installs its files.
#pragma once

#include <cstddef>
#include <string_view>

#include "base/text.h"

namespace upgrade {

/// Puts a path together from the texts of a package. A backslash that would follow a backslash is
/// dropped; what is longer than a path may be is cut.
class InstalledPath {
 public:
  static constexpr std::size_t kSize = 260;

  /// Adds the text of a folder. "%CE1%" to "%CE17%" in it stand for folders of the device, some for
  /// none; any other text is taken as it is, "%CE0%" and "%CE18%" too.
  void AddFolder(std::string_view text) noexcept;
  void AddText(std::string_view text) noexcept;

  /// @return the folder of "%CE<number>%", empty for a number that has none.
  [[nodiscard]] static std::string_view FolderOfMacro(std::size_t number) noexcept;

  [[nodiscard]] const char* c_str() const noexcept { return path_.c_str(); }
  [[nodiscard]] std::string_view view() const noexcept { return {path_.c_str(), size_}; }

 private:
  base::FixedText<kSize> path_;
  std::size_t size_ = 0;
};

}  // namespace upgrade
