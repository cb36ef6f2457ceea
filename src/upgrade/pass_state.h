// Which pass of a job in several passes this is: the one thing that outlives a restart.
#pragma once

#include <cstdint>

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Where the number is kept. Devices whose family begins with '7' lose the root volume at a restart
/// and keep it in their flash.
[[nodiscard]] const char* PassStateFile(const UpgradeConfig& job) noexcept;

/// @return the number of the pass that ran last, 0 when there is none; 1 for a job in one pass,
///   without looking.
[[nodiscard]] std::int32_t ReadPass(const UpgradeConfig& job) noexcept;
void WritePass(const UpgradeConfig& job, std::int32_t pass) noexcept;
void DeletePassState(const UpgradeConfig& job) noexcept;

/// Begins a run: the next pass of a job in several passes, which is stored at once, or the only
/// one.
/// @return its number.
std::int32_t BeginPass(const UpgradeConfig& job) noexcept;

/// Whether a package belongs to this pass; in a job of one pass every package does.
[[nodiscard]] bool IsInPass(const UpgradeConfig& job, const FirmwarePackage& package,
                            std::int32_t pass) noexcept;

}  // namespace upgrade
