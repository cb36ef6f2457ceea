// Simulated devices on disk, as the verbs of the program find and make them.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "profile/profile.h"

namespace tools {

/// The names inside a device's folder that this program keeps: the profile, and the screen as it
/// was painted last.
inline constexpr const char* kDeviceProfile = "device.profile";
inline constexpr const char* kDeviceScreen = "screen.png";
inline constexpr const char* kDeviceScreenText = "screen.json";

/// Makes a device in `folder`, which must not exist or be empty.
/// @param profile  a profile file to begin with; empty: the usual handheld
/// @param settings  "section.key=value", in the words of a profile file, applied on top
/// Throws Failure kUsage, kBadInput or kCannotWrite.
sim::Profile MakeDeviceFolder(const std::filesystem::path& folder,
                              const std::filesystem::path& profile,
                              const std::vector<std::string>& settings);

/// Reads the profile of the device in `folder`. Throws Failure kBadInput.
[[nodiscard]] sim::Profile ReadDeviceFolder(const std::filesystem::path& folder);

}  // namespace tools
