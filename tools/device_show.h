// `orvenix device show` and `orvenix device screen`.
#pragma once

#include <filesystem>

#include "tools/exit_codes.h"

namespace tools {

/// Prints the device's profile, its files with attributes, size and time, and the end of its
/// transfer log. Changes nothing. Throws Failure kBadInput.
ExitCode ShowDevice(const std::filesystem::path& device, bool json);

/// Prints the status lines and bars that the device's screen showed last, and copies its picture to
/// `picture` unless that is empty. Throws Failure kBadInput when nothing was ever painted.
ExitCode ShowScreen(const std::filesystem::path& device, const std::filesystem::path& picture,
                    bool json);

}  // namespace tools
