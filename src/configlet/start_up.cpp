#include "configlet/start_up.h"

#include <coredll.h>

#include <cstdint>

#include "base/text.h"
#include "configlet/walk.h"
#include "device/handle.h"
#include "orvenix/upgrade_thread.h"
#include "report/log/log.h"
#include "upgrade/progress.h"
#include "upgrade/run_state/run_state.h"
#include "upgrade/storage_check.h"
#include "upgrade/upgrade_thread.h"

namespace configlet {
namespace {

/// Gives the client time to fetch the report of a failure.
constexpr DWORD kFailurePauseMs = 3000;

/// Why the job does not start.
enum class Preflight : std::uint8_t { kReady, kPowerLow, kSpaceShort };

/// No `default`: a reason added later does not compile until it has a code.
constexpr IcfgResult ToResult(Preflight outcome) noexcept {
  switch (outcome) {
    case Preflight::kReady: return IcfgResult::kOk;
    case Preflight::kPowerLow: return IcfgResult::kNoPower;
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

/// The job is held over the questions to the device's volumes: an upgrade thread that was started
/// twice with it may be about to free it.
bool HasSpace(const Walk& walk, std::uint32_t* total) noexcept {
  const WalkLock lock;
  return walk.job != nullptr && upgrade::CheckSpace(*walk.job, total);
}

Preflight Check(const Walk& walk) noexcept {
  if (!HasPower()) return Preflight::kPowerLow;
  SetUpSyslog(walk);
  report::Log("Orvenix - CheckSpace\r\n");
  std::uint32_t total = 0;
  if (!HasSpace(walk, &total)) return Preflight::kSpaceShort;
  report::Log("Orvenix - SetTransferBytes\r\n");
  upgrade::SetExpectedBytes(total);
  return Preflight::kReady;
}

void StartThread(Walk& walk) noexcept {
  report::Log("Orvenix - StartUpgradeThread\r\n");
  upgrade::SetJobFreedListener(ForgetJob);
  const device::ThreadHandle thread(StartUpgradeThread(walk.job, 0));
  if (!thread) upgrade::EndUpgrade();  // else the thread does that when it is through
}

}  // namespace

IcfgResult StartJob(Walk& walk) noexcept {
  if (walk.job == nullptr) {
    upgrade::EndUpgrade();
    return IcfgResult::kOk;
  }
  const Preflight outcome = Check(walk);
  if (outcome == Preflight::kReady) {
    StartThread(walk);
  } else {
    Sleep(kFailurePauseMs);
    upgrade::EndUpgrade();
  }
  return ToResult(outcome);
}

}  // namespace configlet
