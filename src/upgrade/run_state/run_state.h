// Whether an upgrade runs: the one word that the configlet and the upgrade thread share.
#pragma once

namespace upgrade {

/// Notes that an upgrade begins. Host's thread.
/// @return false, changing nothing, when one is in progress.
bool TryBeginUpgrade() noexcept;

/// Notes that none is in progress any more. Any thread, at any time: a refused job may clear the
/// word while another job still runs.
void EndUpgrade() noexcept;

[[nodiscard]] bool UpgradeInProgress() noexcept;

}  // namespace upgrade
