// Values that a package writes into the registry.
#pragma once

#include <filesystem>

#include "tools/package/setup_writer.h"

namespace tools {

/// Adds the keys and values of a .reg text to `plan`. Throws Failure kBadInput for a text that is
/// not understood, and for what a package cannot carry.
void AddRegistryValues(const std::filesystem::path& file, PackagePlan& plan);

}  // namespace tools
