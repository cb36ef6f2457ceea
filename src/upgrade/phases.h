// The phases of an upgrade that fetches everything by HTTP.
#pragma once

#include <cstdint>

#include "upgrade/run.h"

namespace upgrade {

enum class InfMode : std::uint8_t { kCountOnly, kFetch };

/// Fetches the firmware packages of this pass and hands their command lines to the program that
/// runs after the upgrade. A failure is logged and the next file follows.
/// @return the result of the last fetch, true when there was none.
bool FetchOsFiles(Run& run) noexcept;

/// Fetches the job's INF file into the root folder and, when asked to, the files of its entries for
/// this device.
/// @return the entries for this device plus 1, for the INF file itself; 0 when the job names none.
std::uint32_t FetchInfFiles(Run& run, InfMode mode) noexcept;

/// Fetches the job's other files, whether or not they are on the device.
/// @return the result of the last fetch, true when there was none.
bool FetchMiscFiles(Run& run) noexcept;

/// Sets how many files this pass brings, for the server's display. Fetches the INF file to count
/// its entries.
void CountFiles(Run& run) noexcept;

}  // namespace upgrade
