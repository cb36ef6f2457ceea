// What both worlds share: the thread records, wait queues, timers and the ways a thread ends.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "world/sim_thread.h"
#include "world/world.h"

namespace sim {

class WorldCore : public World {
 public:
  void Notify(WaitQueue& queue) override;
  std::uint64_t At(Micros when, std::function<void()> action) override;
  void Cancel(std::uint64_t action) override;
  SimThread& Spawn(Device& device, std::string name, std::function<std::uint32_t()> body,
                   bool suspended) override;
  void Resume(SimThread& thread) override;
  void Terminate(SimThread& thread, std::uint32_t exit_code) override;
  void EndThreads(const Device& device) override;
  [[nodiscard]] std::size_t LiveThreads(const Device& device) const override;
  [[nodiscard]] std::string Report() const override;

 protected:
  using World::World;

  /// Makes a blocked or suspended thread run again. Lock held.
  virtual void Wakeup(SimThread& thread) = 0;
  /// Gives a new thread what it runs on; ThreadMain is to be called there. Lock held.
  /// @throws std::system_error when the host has none.
  virtual void Equip(SimThread& thread);
  /// Returns when the new thread may take its first step, or was terminated before it. Lock held.
  virtual void AwaitFirstTurn(SimThread& thread, Lock& lock) = 0;
  /// The thread has ended and will not call again. Lock held.
  virtual void Ended(SimThread& thread) = 0;
  /// An action was put in. Lock held.
  virtual void ActionAdded() = 0;

  /// A spawned thread's whole life.
  void ThreadMain(SimThread& thread);

  /// To be called first in the derived destructor: ends all threads.
  void EndAllThreads();

  SimThread& NewThread(Device& device, std::string name);
  /// A record for the calling host thread, which plays it from now on.
  SimThread& NewAttached(Device& device, std::string name);
  [[nodiscard]] std::size_t AttachedThreads() const { return attached_; }
  static void SetCurrent(SimThread* thread);
  /// The calling simulated thread; ends the program when it is none of this world.
  SimThread& Caller(const char* what) const;
  void EnterQueues(SimThread& thread, const Queues& queues);
  static void LeaveQueues(SimThread& thread);
  /// Marks the thread as ended and tells everybody. Lock held.
  void Finish(SimThread& thread, std::uint32_t exit_code);
  /// Abandons the calling thread's stack up to its first frame. Simulator frames release what they
  /// hold, the lock too; the frames of product code do not, as on the device.
  [[noreturn]] static void Leave(SimThread& thread);
  [[noreturn]] void Die(const char* why) const;

  // Timers: threads with a deadline and actions, in the order in which they come due.
  void StartTimer(SimThread& thread, Micros due);
  void StopTimer(SimThread& thread);
  [[nodiscard]] const WorldTimers& timers() const { return timers_; }
  /// Takes the earliest timer out. Lock held; there is one.
  WorldTimer PopTimer();

 private:
  /// Returns when the body does, or is left by Leave.
  static void RunBody(SimThread& thread);
  void EndThreadsWhere(const std::function<bool(const SimThread&)>& chosen);
  void JoinEnded();

  std::vector<std::unique_ptr<SimThread>> threads_;
  std::vector<SimThread*> woken_;  ///< kept by Notify because its memory is used again
  std::vector<SimThread*> ended_;  ///< whose host threads are to be joined
  std::condition_variable thread_ended_;
  std::uint32_t next_thread_id_ = 0x100;
  std::size_t attached_ = 0;
  WorldTimers timers_;
  std::unordered_map<std::uint64_t, Micros> action_due_;
  std::uint64_t next_timer_ = 1;
};

}  // namespace sim
