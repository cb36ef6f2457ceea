// What the configlet needs from the upgrade thread besides starting it.
#pragma once

#include <cstdint>

class UpgradeConfig;

namespace upgrade {

/// StartUpgradeThread for a number that was taken. @return null also for number 0.
void* StartNumber(std::uint32_t number) noexcept;

/// Sets who is told, on the upgrade thread, that a job is about to be freed, so that no pointer to
/// it is kept. One listener; null for none. Set before the first job starts.
void SetJobFreedListener(void (*listener)(const UpgradeConfig* job)) noexcept;

}  // namespace upgrade
