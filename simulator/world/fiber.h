// A stack with code running on it. Many of them take turns on one thread of the host, which leaves
// one for another in a few nanoseconds.
#pragma once

#include <array>
#include <cstddef>
#include <functional>

namespace sim {

/// Belongs to the host's thread that first switches to it.
class Fiber {
 public:
  /// Stands for the calling host thread on its own stack.
  Fiber();
  /// @param body  runs from the first switch on; it must not return but switch away for ever
  /// @throws std::system_error when there is no memory for the stack
  explicit Fiber(std::function<void()> body);
  /// It must not be running.
  ~Fiber();
  Fiber(const Fiber&) = delete;
  Fiber& operator=(const Fiber&) = delete;

  /// Leaves `from`, on which the caller runs, and goes on where `to` was left. Returns when
  /// somebody switches back.
  static void Switch(Fiber& from, Fiber& to);
  /// As Switch, but `from` is done: it waits for nothing more than its destructor.
  [[noreturn]] static void SwitchForEver(Fiber& from, Fiber& to);

 private:
#if defined(__ARM_EABI_UNWINDER__)
  static constexpr std::size_t kExceptionWords = 3;  // it keeps those under way, too
#else
  static constexpr std::size_t kExceptionWords = 2;
#endif

  static void Enter();
  static void Go(Fiber& from, Fiber& to, bool for_ever);
  void Prepare();

  std::function<void()> body_;
  char* mapping_ = nullptr;  ///< guard page and stack; null for a host thread's own
  char* bottom_ = nullptr;   ///< lowest address of the stack
  std::size_t size_ = 0;
  void* place_ = nullptr;  ///< where it was left: the stack pointer, or a context
  /// What the run time of exceptions keeps for a thread: the exceptions being handled.
  std::array<unsigned char, kExceptionWords * sizeof(void*)> exceptions_{};
  void* fake_stack_ = nullptr;  ///< of the address sanitizer
  void* tsan_fiber_ = nullptr;  ///< of the thread sanitizer
};

}  // namespace sim
