// The host's callback table, when the library that calls it has a misaligned stack.
#pragma once

#include "loader/import_table.h"

struct IcfgCallbacks;

namespace loader {

/// A function to be called like the DLL's own `set_callbacks`, its IcfgSetCallbacks: it hands the
/// library a table whose function leads to the host's through a gate out of the DLL. One library at
/// a time has a table.
[[nodiscard]] Function CallbacksThroughGates(Function set_callbacks);

/// The host's own table, for one that the library was handed.
[[nodiscard]] const IcfgCallbacks* HostTable(const IcfgCallbacks* given);

}  // namespace loader
