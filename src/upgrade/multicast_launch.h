// The multicast transfer of a job.
#pragma once

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Runs the multicast client with the job's command line until it ends, and shows its progress
/// meanwhile. Nothing happens when the job has no command line. How the transfer went is not told:
/// whoever calls looks at the files. Upgrade thread.
void RunMulticastTransfer(const UpgradeConfig& job) noexcept;

}  // namespace upgrade
