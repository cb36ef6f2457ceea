// The lock around what threads share in this library.
#pragma once

#include <coredll.h>

namespace device {

/// Guards a few words, a list of pointers or one open stream.
///
/// Zero memory is an unlocked lock: nothing has to set it up, so it holds from the first call of
/// any thread on, and nothing has to be released with the library. It stands on
/// InterlockedExchange, which the platform supplies even on ARM cores that have no
/// compare-and-swap. Who finds it taken sleeps, because spinning could keep a holder of lower
/// priority from ever going on.
///
/// While it is held nothing may be called that waits for another thread, draws or sends a message.
/// A thread must not take it twice.
class Lock {
 public:
  void Acquire() noexcept {
    while (InterlockedExchange(&taken_, 1) != 0) Sleep(1);
  }
  void Release() noexcept { InterlockedExchange(&taken_, 0); }

 private:
  LONG taken_ = 0;
};

/// Holds a lock for a scope.
class [[nodiscard]] LockGuard {
 public:
  explicit LockGuard(Lock& lock) noexcept : lock_(lock) { lock_.Acquire(); }
  ~LockGuard() { lock_.Release(); }
  LockGuard(const LockGuard&) = delete;
  LockGuard& operator=(const LockGuard&) = delete;

 private:
  Lock& lock_;
};

}  // namespace device
