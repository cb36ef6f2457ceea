// What the stand-ins share: a lock, and its holder.
#pragma once

#include <coredll.h>

namespace platform {

class Lock {
 public:
  void Take() { AcquireSRWLockExclusive(&lock_); }
  void Give() { ReleaseSRWLockExclusive(&lock_); }

 private:
  SRWLOCK lock_ = SRWLOCK_INIT;
};

class Guard {
 public:
  explicit Guard(Lock& lock) : lock_(lock) { lock_.Take(); }
  ~Guard() { lock_.Give(); }
  Guard(const Guard&) = delete;
  Guard& operator=(const Guard&) = delete;

 private:
  Lock& lock_;
};

}  // namespace platform
