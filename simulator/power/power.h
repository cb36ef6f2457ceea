// The device's power: line and battery as its API tells them, and who keeps what awake.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "ce/system.h"
#include "ce/types.h"

namespace sim {

class Device;
struct Profile;

/// Begins as the profile says. May be used by any thread; every method takes the world's lock
/// itself.
class Power {
 public:
  struct Requirement {
    std::u16string device;  ///< "BKL1:"
    CEDEVICE_POWER_STATE state = PwrDeviceUnspecified;
  };

  explicit Power(Device& device);

  /// What GetSystemPowerStatusEx tells from now on.
  void SetStatus(std::uint8_t ac_line, std::uint8_t battery_flag, std::uint8_t battery_percent);
  [[nodiscard]] SYSTEM_POWER_STATUS_EX status() const;

  /// @return the handle of a new requirement.
  HANDLE Require(Requirement requirement);
  /// @return false when `handle` is no requirement that is held.
  bool Release(HANDLE handle);
  /// The requirements that are held now, oldest first.
  [[nodiscard]] std::vector<Requirement> Held() const;

  void CountIdleTimerReset();
  /// How often the device was kept from falling asleep.
  [[nodiscard]] std::uint64_t IdleTimerResets() const;

 private:
  Device& device_;
  SYSTEM_POWER_STATUS_EX status_ = {};
  std::map<HANDLE, Requirement> held_;
  std::uint64_t idle_timer_resets_ = 0;
};

}  // namespace sim
