#include "upgrade/run_state/run_state.h"

#include <atomic>

namespace upgrade {
namespace {

std::atomic<int> in_progress{0};

}  // namespace

// Only the host's thread ever sets the word, so testing and setting it need not be one step.
bool TryBeginUpgrade() noexcept {
  if (UpgradeInProgress()) return false;
  in_progress.store(1, std::memory_order_relaxed);
  return true;
}

void EndUpgrade() noexcept {
  in_progress.store(0, std::memory_order_relaxed);
}

bool UpgradeInProgress() noexcept {
  return in_progress.load(std::memory_order_relaxed) != 0;
}

}  // namespace upgrade
