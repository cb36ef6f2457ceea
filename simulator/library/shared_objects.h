// Libraries of the device that are the host's own shared objects: the library under test is copied
// into a device's storage under the name that its programs load it by.
#pragma once

#include <filesystem>
#include <memory>

#include "library/library_code.h"

namespace sim {

/// Loads a shared object with its own copy of all that it keeps, whatever else of it is loaded. Its
/// calls of the API go to the simulator of this program. No function of it is called by itself.
/// For SetLibraryReader; not in simulators that are linked statically.
[[nodiscard]] std::unique_ptr<LibraryCode> ReadSharedObject(const std::filesystem::path& file);

}  // namespace sim
