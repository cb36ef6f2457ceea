// The images of the program loader that firmware brings along, one for each generation of the flash
// chip: only the one for the device's own chip may be there when the flash begins.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/text.h"
#include "orvenix/upgrade_config.h"

namespace upgrade {

/// What the names of the images for a device begin with: the model that its manufacturer string
/// begins with, empty for another one.
[[nodiscard]] constexpr std::string_view LoaderModel(std::string_view manufacturer) noexcept {
  // Longer names first: every "MR41" begins with "MR4", too.
  constexpr std::string_view kModels[] = {"MR41", "MV41", "TQ52", "TQ53", "MR4", "TQ2"};
  for (const std::string_view model : kModels) {
    if (base::StartsWith(manufacturer, model)) return model;
  }
  return {};
}

inline constexpr std::string_view kChipGenerations[] = {"G3", "G4", "H3"};

/// A chip's generation by the code that its driver tells, empty for an unknown one.
[[nodiscard]] constexpr std::string_view ChipGeneration(std::uint8_t code) noexcept {
  switch (code) {
    case 7:
    case 9: return "G3";
    case 13: return "G4";
    case 15: return "H3";
    default: return {};
  }
}

/// Deletes the images for other chips than the device's, as far as they can be, and shows each
/// name. All stay when the chip's generation is unknown.
void KeepMatchingLoaderImage(const UpgradeConfig& job) noexcept;

}  // namespace upgrade
