// Conditions on the device's registry that a job sets before anything is touched.
#pragma once

#include <cstddef>

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Carries out the job's registry tests in their order, up to the first that fails. Writes each
/// reason of its own to the log. A null entry is passed over. When a test has been lost for want of
/// memory, none is carried out and they count as failed, with an empty message. Host's thread
/// before an upgrade, or the upgrade thread.
/// @param failure_text  receives the message of the test that failed; untouched when all passed.
///   Null: the message is not logged either
/// @param size  of `failure_text`; 256 holds every message
/// @return whether all passed; true when there are none.
///
// KEPT ODDITY: a test whose root is unknown is asked below the root of the test before it, the
// first one below HKEY_LOCAL_MACHINE.
bool PerformTests(const UpgradeConfig& job, char* failure_text, std::size_t size) noexcept;

}  // namespace upgrade
