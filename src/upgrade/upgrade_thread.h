// What the configlet needs from the upgrade thread besides starting it.
#pragma once

class UpgradeConfig;

namespace upgrade {

/// Sets who is told, on the upgrade thread, that a job is about to be freed, so that no pointer to
/// it is kept. One listener; null for none. Set before the first job starts.
void SetJobFreedListener(void (*listener)(const UpgradeConfig* job)) noexcept;

}  // namespace upgrade
