// The lock around what the progress window's threads share.
#pragma once

#include <coredll.h>

namespace report {

/// Guards a list of pointers or a short text for the time of a copy.
///
/// Zero memory is an unlocked lock: nothing has to set it up, so it holds from the first status
/// line of any thread on. It stands on InterlockedExchange, which the platform supplies even on
/// ARM cores that have no compare-and-swap. Who finds it taken sleeps, because spinning could keep
/// a holder of lower priority from ever going on.
///
/// While it is held nothing may be called that allocates, draws, waits or sends a message.
class ShortLock {
 public:
  void Lock() noexcept {
    while (InterlockedExchange(&taken_, 1) != 0) Sleep(1);
  }
  void Unlock() noexcept { InterlockedExchange(&taken_, 0); }

 private:
  LONG taken_ = 0;
};

class ShortLockHolder {
 public:
  explicit ShortLockHolder(ShortLock& lock) noexcept : lock_(lock) { lock_.Lock(); }
  ~ShortLockHolder() { lock_.Unlock(); }
  ShortLockHolder(const ShortLockHolder&) = delete;
  ShortLockHolder& operator=(const ShortLockHolder&) = delete;

 private:
  ShortLock& lock_;
};

}  // namespace report
