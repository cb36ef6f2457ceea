// A wait that several calls share.
#pragma once

#include <coredll.h>

#include <cstdint>

namespace device {

/// The end of a wait of so many milliseconds that begins now; a wait of 0 has no end, as in the
/// calls that wait for sockets. Right for waits below 49 days, beyond the point where the device's
/// clock begins anew.
class Deadline {
 public:
  explicit Deadline(std::uint32_t wait_ms) noexcept : begin_(GetTickCount()), wait_ms_(wait_ms) {}

  /// Begins the whole wait anew.
  void Restart() noexcept {
    begin_ = GetTickCount();
    fresh_ = true;
  }

  /// The first time all is left, and the clock is not asked: most waits end with what they are for.
  /// @param left_ms  receives what is left: 0 only when there is no end
  /// @return false when nothing is left; `left_ms` is then unchanged.
  [[nodiscard]] bool HasLeft(std::uint32_t& left_ms) noexcept {
    std::uint32_t gone = 0;
    if (!fresh_ && wait_ms_ != 0) gone = static_cast<std::uint32_t>(GetTickCount() - begin_);
    fresh_ = false;
    if (wait_ms_ != 0 && gone >= wait_ms_) return false;
    left_ms = wait_ms_ - gone;
    return true;
  }

 private:
  DWORD begin_;
  std::uint32_t wait_ms_;
  bool fresh_ = true;
};

}  // namespace device
