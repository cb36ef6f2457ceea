// Whether the device has room for a job.
#pragma once

#include <cstdint>

class UpgradeConfig;

namespace upgrade {

/// Asks for the free space of every storage requirement of the job.
// KEPT ODDITY: the answer is that of the last requirement alone; an unmet one before it is passed
// over, and a job without requirements has no room.
///
/// @param total  receives the sum of the sizes, modulo 2^32, without those whose volume could not
///   be asked
/// @return whether the last requirement is met.
bool CheckSpace(const UpgradeConfig& job, std::uint32_t* total) noexcept;

}  // namespace upgrade
