// What happens when the host closes the job: checks of the device, and the start of the upgrade.
#pragma once

#include "configlet/result.h"

namespace configlet {

struct Walk;

/// Starts the walk's job on a thread of its own, or reports why not, which takes 3 seconds. After a
/// failure no upgrade is in progress, whoever had begun it; the job stays with the walk.
/// Without a job nothing is checked and nothing starts.
IcfgResult StartJob(Walk& walk) noexcept;

}  // namespace configlet
