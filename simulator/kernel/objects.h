// The objects behind the handles of threads, events, mutexes and semaphores.
#pragma once

#include "ce/kernel.h"
#include "kernel/handle_table.h"
#include "world/sim_thread.h"

namespace sim {

class ThreadObject final : public KernelObject {
 public:
  explicit ThreadObject(SimThread& thread) : thread_(thread) {}
  [[nodiscard]] bool Signalled(const SimThread& /*waiter*/) const override {
    return thread_.state == SimThread::State::kFinished;
  }
  [[nodiscard]] bool can_be_awaited() const override { return true; }
  [[nodiscard]] WaitQueue& wait_queue() override { return thread_.finished; }
  [[nodiscard]] SimThread& thread() const { return thread_; }

 private:
  SimThread& thread_;
};

class EventObject final : public KernelObject {
 public:
  EventObject(bool manual_reset, bool set) : manual_reset_(manual_reset), set_(set) {}
  [[nodiscard]] bool Signalled(const SimThread& /*waiter*/) const override { return set_; }
  bool Take(SimThread& thread) override;
  [[nodiscard]] bool can_be_awaited() const override { return true; }

  void Set();
  void Reset() { set_ = false; }
  /// Releases the threads that wait now (one, for an auto-reset event) and leaves the event unset.
  void Pulse();

 private:
  const bool manual_reset_;
  bool set_;
};

class MutexObject final : public KernelObject, public ThreadEndListener {
 public:
  explicit MutexObject(SimThread* owner) {
    if (owner != nullptr) Take(*owner);
  }
  ~MutexObject() override;
  [[nodiscard]] bool Signalled(const SimThread& waiter) const override {
    return owner_ == nullptr || owner_ == &waiter;
  }
  bool Take(SimThread& thread) final;
  [[nodiscard]] bool can_be_awaited() const override { return true; }
  void ThreadEnded(SimThread& thread) override;

  /// @return false when `thread` does not own the mutex.
  bool Release(SimThread& thread);

 private:
  void ForgetOwner();

  SimThread* owner_ = nullptr;
  DWORD depth_ = 0;
  bool abandoned_ = false;
};

class SemaphoreObject final : public KernelObject {
 public:
  SemaphoreObject(LONG count, LONG maximum) : count_(count), maximum_(maximum) {}
  [[nodiscard]] bool Signalled(const SimThread& /*waiter*/) const override { return count_ > 0; }
  bool Take(SimThread& thread) override;
  [[nodiscard]] bool can_be_awaited() const override { return true; }

  /// @return false, with nothing changed, when the count would pass its maximum.
  bool Release(LONG count, LONG& previous);

 private:
  LONG count_;
  const LONG maximum_;
};

}  // namespace sim
