#include "power/power.h"

#include <memory>
#include <utility>

#include "device/device.h"
#include "kernel/handle_table.h"
#include "profile/profile.h"
#include "world/world.h"

namespace sim {
namespace {

/// Only gives the requirement its number: a handle of it means nothing to other calls.
class PowerRequirement : public KernelObject {};

constexpr DWORD kUnknownLifeTime = 0xFFFFFFFFU;
constexpr BYTE kFullBackup = 100;

}  // namespace

Power::Power(Device& device) : device_(device) {
  const Profile& profile = device.profile();
  status_.ACLineStatus = profile.ac_line;
  status_.BatteryFlag = profile.battery_flag;
  status_.BatteryLifePercent = profile.battery_percent;
  status_.BatteryLifeTime = kUnknownLifeTime;
  status_.BatteryFullLifeTime = kUnknownLifeTime;
  status_.BackupBatteryFlag = BATTERY_FLAG_HIGH;
  status_.BackupBatteryLifePercent = kFullBackup;
  status_.BackupBatteryLifeTime = kUnknownLifeTime;
  status_.BackupBatteryFullLifeTime = kUnknownLifeTime;
}

void Power::SetStatus(std::uint8_t ac_line, std::uint8_t battery_flag,
                      std::uint8_t battery_percent) {
  const World::Lock lock = device_.world().Acquire();
  status_.ACLineStatus = ac_line;
  status_.BatteryFlag = battery_flag;
  status_.BatteryLifePercent = battery_percent;
}

SYSTEM_POWER_STATUS_EX Power::status() const {
  const World::Lock lock = device_.world().Acquire();
  return status_;
}

HANDLE Power::Require(Requirement requirement) {
  const World::Lock lock = device_.world().Acquire();
  HANDLE handle = device_.handles().Add(std::make_shared<PowerRequirement>());
  held_.emplace(handle, std::move(requirement));
  return handle;
}

bool Power::Release(HANDLE handle) {
  const World::Lock lock = device_.world().Acquire();
  if (held_.erase(handle) == 0) return false;
  device_.handles().Remove(handle);
  return true;
}

std::vector<Power::Requirement> Power::Held() const {
  const World::Lock lock = device_.world().Acquire();
  std::vector<Requirement> held;  // handle numbers grow, so their order is that of the calls
  for (const auto& [handle, requirement] : held_) held.push_back(requirement);
  return held;
}

void Power::CountIdleTimerReset() {
  const World::Lock lock = device_.world().Acquire();
  ++idle_timer_resets_;
}

std::uint64_t Power::IdleTimerResets() const {
  const World::Lock lock = device_.world().Acquire();
  return idle_timer_resets_;
}

}  // namespace sim
