// What the simulator knows of one simulated thread.
#pragma once

#include <csetjmp>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "world/world.h"

namespace sim {

struct SimThread {
  enum class State : std::uint8_t { kSuspended, kReady, kRunning, kBlocked, kFinished };

  std::uint32_t id = 0;
  Device* device = nullptr;
  std::string name;
  std::uint32_t last_error = 0;  ///< of this thread only; needs no lock
  std::uint32_t exit_code = 0x103;
  State state = State::kReady;
  bool terminate = false;
  bool attached = false;  ///< a host thread that joined; it cannot be terminated
  WaitQueue finished;     ///< notified when the thread has ended

  // The world's own bookkeeping.
  std::condition_variable wake;
  bool notified = false;
  bool timed_out = false;
  int wake_file = -1;  ///< event descriptor that interrupts a wait on host files
  std::vector<WaitQueue*> waits_on;
  std::jmp_buf way_out;  ///< to the thread's first frame, for termination
  std::function<std::uint32_t()> body;
  std::thread host;
};

}  // namespace sim
