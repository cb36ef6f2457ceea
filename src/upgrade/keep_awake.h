// Keeping the device from suspending while it is upgraded.
#pragma once

#include <cstdint>

#include "device/handle.h"

namespace upgrade {

/// A thread that resets the system's idle timer for as long as the object lives.
///
/// The thread ends by being terminated, so it holds nothing while it sleeps.
class KeepAwake {
 public:
  KeepAwake() noexcept;
  ~KeepAwake() { Stop(); }
  KeepAwake(const KeepAwake&) = delete;
  KeepAwake& operator=(const KeepAwake&) = delete;

  void Stop() noexcept;

 private:
  device::ThreadHandle thread_;
};

/// How long the thread sleeps between two resets, in seconds.
/// @param power_off_seconds  the device's own time to power-off on external power, 0 when unknown
[[nodiscard]] constexpr std::uint32_t KeepAwakeSeconds(std::uint32_t power_off_seconds) noexcept {
  if (power_off_seconds == 0) return 15;
  return power_off_seconds < 45 ? power_off_seconds : 45;
}
static_assert(KeepAwakeSeconds(0) == 15 && KeepAwakeSeconds(44) == 44);
static_assert(KeepAwakeSeconds(0xFFFFFFFFU) == 45, "never is a large number, not a negative one");

/// Holds the display's light on.
class LightRequirement {
 public:
  LightRequirement() noexcept;
  ~LightRequirement() { Release(); }
  LightRequirement(const LightRequirement&) = delete;
  LightRequirement& operator=(const LightRequirement&) = delete;

  void Release() noexcept;

 private:
  HANDLE requirement_;  ///< null when none is held
};

}  // namespace upgrade
