// The platform's own lock, which its owner may take again.
#pragma once

#include <coredll.h>

namespace device {

/// A critical section for what one object shares between threads. Unlike device::Lock it may be
/// taken again by the thread that holds it, has to be made and deleted, and waits without sleeping
/// in slices; so it may be held while the platform or the owner is called.
class CriticalSection {
 public:
  CriticalSection() noexcept { InitializeCriticalSection(&section_); }
  ~CriticalSection() { DeleteCriticalSection(&section_); }
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;

  void Enter() noexcept { EnterCriticalSection(&section_); }
  void Leave() noexcept { LeaveCriticalSection(&section_); }

 private:
  CRITICAL_SECTION section_;
};

/// Holds a critical section for a scope.
class [[nodiscard]] CriticalSectionGuard {
 public:
  explicit CriticalSectionGuard(CriticalSection& section) noexcept : section_(section) {
    section_.Enter();
  }
  ~CriticalSectionGuard() { section_.Leave(); }
  CriticalSectionGuard(const CriticalSectionGuard&) = delete;
  CriticalSectionGuard& operator=(const CriticalSectionGuard&) = delete;

 private:
  CriticalSection& section_;
};

}  // namespace device
