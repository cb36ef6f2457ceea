// What the simulator knows of one simulated thread.
#pragma once

#include <semaphore.h>

#include <atomic>
#include <condition_variable>
#include <csetjmp>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "world/fiber.h"
#include "world/world.h"

namespace sim {

/// What a thread of the virtual world waits for: its turn, given once for each time it is awaited.
/// A semaphore, because a condition variable would wake the thread only to wait for the lock.
class Turn {
 public:
  Turn() { sem_init(&given_, 0, 0); }
  ~Turn() { sem_destroy(&given_); }
  Turn(const Turn&) = delete;
  Turn& operator=(const Turn&) = delete;
  void Give() { sem_post(&given_); }
  void Await() {
    while (sem_wait(&given_) != 0) {
    }
  }

 private:
  sem_t given_;
};

/// Told, with the lock held, when a thread ends that it was registered with.
class ThreadEndListener {
 public:
  virtual ~ThreadEndListener() = default;
  virtual void ThreadEnded(SimThread& thread) = 0;
};

/// What a world does at some time to come.
struct WorldTimer {
  SimThread* thread = nullptr;  ///< its wait ends; null: an action
  std::function<void()> action;
};
/// By due time and, within it, by the order in which they were set.
using WorldTimers = std::map<std::pair<Micros, std::uint64_t>, WorldTimer>;

struct SimThread {
  enum class State : std::uint8_t { kSuspended, kReady, kRunning, kBlocked, kFinished };

  std::uint32_t id = 0;
  World* world = nullptr;
  Device* device = nullptr;
  std::string name;
  std::uint32_t last_error = 0;     ///< of this thread only; needs no lock
  std::uint32_t exit_code = 0x103;  ///< "still active" until the thread has ended
  State state = State::kReady;
  bool terminate = false;
  bool attached = false;                   ///< a host thread that joined; it cannot be terminated
  bool leaving = false;                    ///< its stack is being abandoned
  std::atomic<const char*> call{nullptr};  ///< the API call it is in
  std::uint32_t calls = 0;                 ///< API calls since it last waited
  std::uint32_t time_asked = 0;            ///< GetTickCount calls among them
  WaitQueue finished;                      ///< notified when the thread has ended
  /// Who else is told of the end, in this order. An entry leaves the list when it ends itself.
  std::vector<ThreadEndListener*> end_listeners;

  // The world's own bookkeeping.
  SimThread* outer = nullptr;  ///< the part that the host thread played when it attached again
  std::uint32_t code_to_leave_with = 0;  ///< when it is terminated
  std::uint32_t code_of_body = 0;        ///< when it is not; no lock needed
  Turn turn;                             ///< in the virtual world
  std::condition_variable wake;          ///< in the real one
  bool notified = false;
  bool timed_out = false;
  bool polling = false;
  int wake_file = -1;  ///< event descriptor that interrupts a wait on host files
  std::vector<WaitQueue*> waits_on;
  Micros timer_due{};
  std::uint64_t timer_number = 0;  ///< 0: no timer runs
  WorldTimers::iterator timer;     ///< of the one that runs
  WorldTimers::node_type spare_timer;
  std::jmp_buf way_out;  ///< to the thread's first frame, for termination
  void* first_frame = nullptr;
  std::function<std::uint32_t()> body;
  std::thread host;              ///< not of a light thread, nor of an attached one
  std::unique_ptr<Fiber> fiber;  ///< of a light thread that has not ended
  Fiber* runs_on = nullptr;      ///< null: a thread of the host
};

}  // namespace sim
