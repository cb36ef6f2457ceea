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
/// While it is held nothing may be called that draws, that calls the host, or that waits for a
/// thread which could wait for this lock. Most are held for a few instructions. Two are held for
/// long, and say so: the walk's, while a device is tested and cleaned, and the message link's,
/// while the queue's library is loaded and called. Others are taken under these two, never the
/// other way round. A thread must not take one twice.
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
