// The configlet library as its host holds it.
#pragma once

#include <filesystem>

#include "orvenix/configlet.h"

namespace tools {

/// The loaded library and the entry points that a job's walk needs. The library is never unloaded:
/// its threads may outlive any holder.
struct ConfigletLibrary {
  decltype(&IcfgInitialize) initialize = nullptr;
  decltype(&IcfgSetCallbacks) set_callbacks = nullptr;
  decltype(&IcfgBeginGroup) begin_group = nullptr;
  decltype(&IcfgSetField) set_field = nullptr;
  decltype(&IcfgEndGroup) end_group = nullptr;
  decltype(&IcfgGetField) get_field = nullptr;
  decltype(&IcfgUninitialize) uninitialize = nullptr;
};

/// Loads `file`; an empty path means lib/liborvenix.so beside the folder of this program. Throws
/// Failure kBadInput.
[[nodiscard]] ConfigletLibrary LoadConfiglet(const std::filesystem::path& file);

/// The folder lib/ beside the folder of this program.
[[nodiscard]] std::filesystem::path LibraryFolder();

}  // namespace tools
