// The options in a firmware package's additional parameters, a text such as
// "Pass=2,DiskSize=\SDMMC Disk:5000000,RAMAllocSize=16777216".
#pragma once

#include <cstdint>
#include <string_view>

#include "base/text.h"

namespace upgrade {

/// Options are found wherever their name stands in the text, letter case counting.
///
/// KEPT ODDITY: the pass is the one character behind "Pass=", so "Pass=12" names pass 1. What is
/// not a digit names pass 0, which never comes.
/// @return the pass in which the package is used, 1 when the text does not say.
[[nodiscard]] std::int32_t PackagePass(std::string_view options) noexcept;

/// What "DiskSize=FOLDER:BYTES" asks for.
struct DiskNeed {
  base::FixedText<128> folder;  ///< empty when there is no colon
  std::int32_t bytes = 0;       ///< 0: nothing is needed
};
[[nodiscard]] DiskNeed PackageDiskNeed(std::string_view options) noexcept;

/// The size of the firmware driver's buffer for the package in bytes, 0 when the text names none.
[[nodiscard]] std::int32_t PackageRamSize(std::string_view options) noexcept;

}  // namespace upgrade
