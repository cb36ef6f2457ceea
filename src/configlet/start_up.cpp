#include "configlet/start_up.h"

#include <coredll.h>

#include <cstdint>

#include "base/format.h"
#include "base/text.h"
#include "configlet/walk.h"
#include "device/handle.h"
#include "report/log/log.h"
#include "report/messages/message_link.h"
#include "upgrade/cleanup.h"
#include "upgrade/progress.h"
#include "upgrade/registry_tests.h"
#include "upgrade/run_state/run_state.h"
#include "upgrade/storage_check.h"
#include "upgrade/turn.h"
#include "upgrade/upgrade_thread.h"

namespace configlet {
namespace {

/// Gives the management system time to fetch the report of a failure.
constexpr DWORD kFailurePauseMs = 3000;

/// Why the job does not start, in words for the management system.
using FailureText = base::FixedText<256>;

/// Why the job does not start.
enum class Preflight : std::uint8_t { kReady, kPowerLow, kTestFailed, kSpaceShort, kJobGone };

/// No `default`: a reason added later does not compile until it has a code.
constexpr IcfgResult ToResult(Preflight outcome) noexcept {
  switch (outcome) {
    case Preflight::kReady: return IcfgResult::kOk;
    case Preflight::kPowerLow: return IcfgResult::kNoPower;
    case Preflight::kTestFailed: return IcfgResult::kTestFailed;
    case Preflight::kSpaceShort: return IcfgResult::kNoSpace;
    case Preflight::kJobGone: return IcfgResult::kOk;
  }
  return IcfgResult::kOk;  // not reached
}

/// KEPT ODDITY: the battery's flags are compared whole, so that a battery that is high and charging
/// (9) is not enough. So are critical, no battery and unknown.
bool HasPower() noexcept {
  SYSTEM_POWER_STATUS_EX status = {};
  if (GetSystemPowerStatusEx(&status, TRUE) == FALSE) return false;
  if (status.ACLineStatus == AC_LINE_ONLINE) return true;
  return status.BatteryFlag == BATTERY_FLAG_HIGH || status.BatteryFlag == BATTERY_FLAG_LOW ||
         status.BatteryFlag == BATTERY_FLAG_CHARGING;
}

/// The job that is to start, as the walk had it when "Upgrade" ended. The client may call on
/// another thread or from inside its callback: meanwhile an upgrade thread that runs the same job
/// may end it, and a new job may have begun, which nobody has filled, let alone tested.
class Candidate {
 public:
  explicit Candidate(Walk& walk) noexcept : walk_(walk) {
    const WalkLock lock;
    number_ = walk.jobs;
    exists_ = walk.job != nullptr;
    if (exists_) unique_id_.Assign(walk.job->GetUniqueId());
  }

  [[nodiscard]] bool exists() const noexcept { return exists_; }
  [[nodiscard]] const char* unique_id() const noexcept { return unique_id_.c_str(); }

  /// Calls `step` with the job, which nobody frees or replaces meanwhile.
  /// @return false when the walk has another job by now, or none.
  template <typename Step>
  bool With(const Step& step) const noexcept {
    const WalkLock lock;
    UpgradeConfig* const job = walk_.numbered_job(number_);
    if (job == nullptr) return false;
    step(*job);
    return true;
  }

 private:
  Walk& walk_;
  std::uint32_t number_ = 0;
  bool exists_ = false;
  base::FixedText<64> unique_id_;
};

bool SetUpSyslog(const Candidate& candidate) noexcept {
  base::FixedText<32> address;
  int port = 0;
  const bool found = candidate.With([&](const UpgradeConfig& job) {
    address.Assign(job.GetSysLogIP());
    port = job.GetSysLogPort();
  });
  if (found) report::SetSyslogTarget(port, address.c_str());
  return found;
}

/// Only a failed test is told by a status, too, before the event.
void ReportFailedTest(const FailureText& failure) noexcept {
  base::FixedText<256> reason;
  base::Format(reason.data(), reason.capacity(), "Upgrade Failed: %s", failure.c_str());
  report::SetRWIStatus(report::kStateIdle, reason.c_str());
}

/// @param failure  receives the words for what is not met
///
// KEPT ODDITY: the device is cleaned before its room is measured. When that does not suffice, the
// files are gone all the same.
Preflight CheckJob(const Candidate& candidate, FailureText* failure) noexcept {
  if (!SetUpSyslog(candidate)) return Preflight::kJobGone;
  report::Log("Orvenix - PerformTests\r\n");
  bool met = false;
  if (!candidate.With([&](const UpgradeConfig& job) {
        met = upgrade::PerformTests(job, failure->data(), failure->capacity());
      })) {
    return Preflight::kJobGone;
  }
  if (!met) return Preflight::kTestFailed;
  report::Log("Orvenix - Cleanup\r\n");
  if (!candidate.With(upgrade::CleanUpDevice)) return Preflight::kJobGone;
  report::Log("Orvenix - CheckSpace\r\n");
  std::uint32_t total = 0;
  if (!candidate.With([&](const UpgradeConfig& job) { met = upgrade::CheckSpace(job, &total); })) {
    return Preflight::kJobGone;
  }
  if (!met) {
    failure->Assign("No space available");
    return Preflight::kSpaceShort;
  }
  report::Log("Orvenix - SetTransferBytes\r\n");
  upgrade::SetExpectedBytes(total);
  return Preflight::kReady;
}

Preflight Check(const Candidate& candidate, FailureText* failure) noexcept {
  if (!HasPower()) {
    failure->Assign("Power requirement not met");
    return Preflight::kPowerLow;
  }
  const Preflight outcome = CheckJob(candidate, failure);
  if (outcome == Preflight::kTestFailed) ReportFailedTest(*failure);
  return outcome;
}

/// Takes the job's place in the queue before its own thread, if one runs, can free it.
/// @return 0 when it gets none.
std::uint32_t TakeNumber(Walk& walk, const Candidate& candidate, bool* was_started) noexcept {
  std::uint32_t number = 0;
  candidate.With([&](UpgradeConfig& job) {
    *was_started = walk.job_started;
    walk.job_started = true;
    walk.download_file.ForgetJobs();
    walk.storage.ForgetJobs();
    walk.registry_test.ForgetJobs();
    number = upgrade::TakeNumber(&job, 0);
  });
  return number;
}

void StartThread(Walk& walk, const Candidate& candidate) noexcept {
  report::Log("Orvenix - StartUpgradeThread\r\n");
  upgrade::SetJobFreedListener(ForgetJob);
  bool was_started = false;
  const device::ThreadHandle thread(
      upgrade::StartNumber(TakeNumber(walk, candidate, &was_started)));
  if (thread) return;  // the thread clears the word when it is through
  candidate.With([&](const UpgradeConfig&) { walk.job_started = was_started; });
  upgrade::EndUpgrade();
}

/// Tells the management system and gives it time to look, before the connection ends. An upgrade
/// that runs beside this opens another for its next message.
void ReportFailure(const Candidate& candidate, const FailureText& failure) noexcept {
  report::SendDeviceEvent(candidate.unique_id(), report::kEventUpgradeFailed, failure.c_str());
  Sleep(kFailurePauseMs);
  report::CloseTransferHandle();
}

}  // namespace

IcfgResult StartJob(Walk& walk) noexcept {
  const Candidate candidate(walk);
  FailureText failure;
  const Preflight outcome = candidate.exists() ? Check(candidate, &failure) : Preflight::kJobGone;
  if (outcome == Preflight::kReady) {
    StartThread(walk, candidate);
    return IcfgResult::kOk;
  }
  if (outcome != Preflight::kJobGone) ReportFailure(candidate, failure);
  upgrade::EndUpgrade();
  return ToResult(outcome);
}

}  // namespace configlet
