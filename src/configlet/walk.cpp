#include "configlet/walk.h"

namespace configlet {
namespace {

Walk the_walk;
device::Lock the_lock;

}  // namespace

Walk& TheWalk() noexcept {
  return the_walk;
}

WalkLock::WalkLock() noexcept : guard_(the_lock) {}

void ForgetJob(const UpgradeConfig* job) noexcept {
  const WalkLock lock;
  if (the_walk.job != job) return;
  the_walk.job = nullptr;
  the_walk.job_started = false;
  the_walk.download_file.ForgetJobs();
  the_walk.storage.ForgetJobs();
  the_walk.registry_test.ForgetJobs();
}

}  // namespace configlet
