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
enum class Preflight : std::uint8_t { kReady, kPowerLow, kTestFailed, kSpaceShort };

/// No `default`: a reason added later does not compile until it has a code.
constexpr IcfgResult ToResult(Preflight outcome) noexcept {
  switch (outcome) {
    case Preflight::kReady: return IcfgResult::kOk;
    case Preflight::kPowerLow: return IcfgResult::kNoPower;
    case Preflight::kTestFailed: return IcfgResult::kTestFailed;
    case Preflight::kSpaceShort: return IcfgResult::kNoSpace;
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

void SetUpSyslog(const Walk& walk) noexcept {
  base::FixedText<32> address;
  int port = 0;
  {
    const WalkLock lock;
    if (walk.job == nullptr) return;
    address.Assign(walk.job->GetSysLogIP());
    port = walk.job->GetSysLogPort();
  }
  report::SetSyslogTarget(port, address.c_str());
}

// The next three hold the lock for as long as they read the job, however many files are deleted
// meanwhile: an upgrade thread that was started with the same job may be about to free it. Only
// that thread ever waits for this, and nothing in here waits for it or calls the host. A job that
// is gone meanwhile needs nothing; nothing will start.

bool TestsPass(const Walk& walk, FailureText* failure) noexcept {
  const WalkLock lock;
  return walk.job == nullptr ||
         upgrade::PerformTests(*walk.job, failure->data(), failure->capacity());
}

void CleanUp(const Walk& walk) noexcept {
  const WalkLock lock;
  if (walk.job != nullptr) upgrade::CleanUpDevice(*walk.job);
}

bool HasSpace(const Walk& walk, std::uint32_t* total) noexcept {
  const WalkLock lock;
  return walk.job == nullptr || upgrade::CheckSpace(*walk.job, total);
}

/// Only a failed test is told by a status, too, before the event.
void ReportFailedTest(const FailureText& failure) noexcept {
  base::FixedText<256> reason;
  base::Format(reason.data(), reason.capacity(), "Upgrade Failed: %s", failure.c_str());
  report::SetRWIStatus(report::kStateIdle, reason.c_str());
}

/// @param failure  receives the words for what is not met
Preflight Check(const Walk& walk, FailureText* failure) noexcept {
  if (!HasPower()) {
    failure->Assign("Power requirement not met");
    return Preflight::kPowerLow;
  }
  SetUpSyslog(walk);
  report::Log("Orvenix - PerformTests\r\n");
  if (!TestsPass(walk, failure)) {
    ReportFailedTest(*failure);
    return Preflight::kTestFailed;
  }
  report::Log("Orvenix - Cleanup\r\n");
  CleanUp(walk);
  report::Log("Orvenix - CheckSpace\r\n");
  std::uint32_t total = 0;
  if (!HasSpace(walk, &total)) {
    failure->Assign("No space available");
    return Preflight::kSpaceShort;
  }
  report::Log("Orvenix - SetTransferBytes\r\n");
  upgrade::SetExpectedBytes(total);
  return Preflight::kReady;
}

/// Takes the job's place in the queue before its own thread, if one runs, can free it.
std::uint32_t TakeNumber(Walk& walk, bool* was_started) noexcept {
  const WalkLock lock;
  *was_started = walk.job_started;
  if (walk.job == nullptr) return 0;
  walk.job_started = true;
  walk.download_file.ForgetJobs();
  walk.storage.ForgetJobs();
  walk.registry_test.ForgetJobs();
  return upgrade::TakeNumber(walk.job, 0);
}

void StartThread(Walk& walk) noexcept {
  report::Log("Orvenix - StartUpgradeThread\r\n");
  upgrade::SetJobFreedListener(ForgetJob);
  bool was_started = false;
  const device::ThreadHandle thread(upgrade::StartNumber(TakeNumber(walk, &was_started)));
  if (thread) return;  // the thread clears the word when it is through
  {
    const WalkLock lock;
    walk.job_started = walk.job != nullptr && was_started;
  }
  upgrade::EndUpgrade();
}

base::FixedText<64> UniqueId(const Walk& walk) noexcept {
  base::FixedText<64> id;
  const WalkLock lock;
  if (walk.job != nullptr) id.Assign(walk.job->GetUniqueId());
  return id;
}

/// Tells the management system and gives it time to look, before the connection ends. An upgrade
/// that runs beside this opens another for its next message.
void ReportFailure(const Walk& walk, const FailureText& failure) noexcept {
  const base::FixedText<64> id = UniqueId(walk);
  report::SendDeviceEvent(id.c_str(), report::kEventUpgradeFailed, failure.c_str());
  Sleep(kFailurePauseMs);
  report::CloseTransferHandle();
}

bool HasJob(const Walk& walk) noexcept {
  const WalkLock lock;
  return walk.job != nullptr;
}

}  // namespace

IcfgResult StartJob(Walk& walk) noexcept {
  if (!HasJob(walk)) {
    upgrade::EndUpgrade();
    return IcfgResult::kOk;
  }
  FailureText failure;
  const Preflight outcome = Check(walk, &failure);
  if (outcome == Preflight::kReady) {
    StartThread(walk);
  } else {
    ReportFailure(walk, failure);
    upgrade::EndUpgrade();
  }
  return ToResult(outcome);
}

}  // namespace configlet
