// Whether a configlet can be loaded, used and unloaded.
#pragma once

#include <iosfwd>

#include "loader/program/command_line.h"

namespace loader {

/// Puts the DLL onto the device, loads it as a program of the device does, finds all its exports,
/// calls IcfgInitialize and IcfgUninitialize where it has them, and unloads it.
/// @param out  one line for each step
/// @return whether all went well and nothing was left behind
/// @throws std::runtime_error when there can be no such device
[[nodiscard]] bool Check(const CommandLine& command_line, std::ostream& out);

}  // namespace loader
