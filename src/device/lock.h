// A lock for state that lives as long as the process.
#pragma once

namespace device {

/// Holds one of the module's locks for a scope; ask it before touching what the lock guards.
///
///     const device::LockGuard lock("TransferLog");
///     if (!lock) return;
///
/// The lock itself is a named mutex that exists while somebody holds or awaits it. So there is no
/// object to construct before the first use, no compare-and-swap, which older ARM cores lack, to
/// construct it once, and nothing to release when the library is unloaded.
///
/// Hold it for a few instructions and never across a call that could come back. A thread may take
/// the same lock twice. A lock whose owner was terminated passes on like a free one.
class [[nodiscard]] LockGuard {
 public:
  /// Waits without limit.
  /// @param name  what tells this lock from the module's others: at most 32 ASCII characters. The
  ///   process's number is added, so processes do not wait for each other.
  explicit LockGuard(const char* name) noexcept;
  ~LockGuard();
  LockGuard(const LockGuard&) = delete;
  LockGuard& operator=(const LockGuard&) = delete;

  /// False when the system had no handle left for the lock. The caller then does without what it
  /// wanted to do.
  [[nodiscard]] explicit operator bool() const noexcept { return mutex_ != nullptr; }

 private:
  void* mutex_;  ///< the system's handle, owned by this thread; null when the lock is not held
};

}  // namespace device
