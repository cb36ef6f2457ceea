// The job's own program, at the end of an upgrade that went well.
#pragma once

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Starts the program that the job names, normally the package installer with a package that came
/// with the job, and waits for its end when the job says so. Nothing when it names none. Says
/// neither whether it could be started nor how it ended.
void StartUpgrade(const UpgradeConfig& job) noexcept;

}  // namespace upgrade
