// Starting an upgrade from outside the configlet; for C++.
#pragma once

#include <cstdint>

#include "orvenix/export.h"
#include "orvenix/upgrade_config.h"

/// Carries out one upgrade job on a thread of its own and returns at once.
///
/// One job runs at a time: when the thread of an earlier job has not ended yet, the call first
/// waits for it, at most about 10 seconds.
///
/// @param config  the job, made with `new`. The thread owns it from here on and frees it at its
/// end; it may be null
///   or freed already by a job that ended during the wait, then nothing is started. When no thread
///   could be made, the job stays with the caller.
/// @param mode  0: the files come by multicast and what is missing by HTTP; any other value: the
///   thread runs the registry tests and the cleanup itself and fetches everything by HTTP
/// @return the thread's handle, which the caller closes; null when none was started.
extern "C" ORVENIX_EXPORT void* StartUpgradeThread(UpgradeConfig* config,
                                                   std::int32_t mode) noexcept;
