// The host's one thread on which the light threads of a virtual world run, one at a time.
#pragma once

#include <functional>
#include <memory>
#include <thread>

#include "world/fiber.h"
#include "world/sim_thread.h"

namespace sim {

/// Who has the turn is the world's business; this is how it changes hands when one of the two is a
/// light thread. The world's lock is not held for any of it.
class Carrier {
 public:
  Carrier() = default;
  /// The light threads must have ended.
  ~Carrier();
  Carrier(const Carrier&) = delete;
  Carrier& operator=(const Carrier&) = delete;

  /// A light thread that runs `body` at its first turn; `body` must end with End.
  /// @throws std::system_error when the host has no memory, or no thread, for it.
  std::unique_ptr<Fiber> Make(std::function<void()> body);
  /// Gives a light thread its turn. For any other thread of the host.
  void Resume(Fiber& fiber);
  /// For a light thread, which runs on `self`: gives `next` its turn, nobody when it is null.
  /// Returns at the caller's own next turn.
  void PassOn(Fiber& self, SimThread* next);
  /// The same for one that ends.
  [[noreturn]] void End(std::unique_ptr<Fiber> self, SimThread* next);

 private:
  void Run();
  Fiber& Target(SimThread* next);
  void AfterSwitch();

  std::thread host_;
  Turn work_;
  bool stop_ = false;
  Fiber* base_ = nullptr;         ///< the host thread's own stack
  Fiber* resumed_ = nullptr;      ///< for whom work_ was given
  SimThread* to_wake_ = nullptr;  ///< a thread of the host that gets its turn from the base
  std::unique_ptr<Fiber> ended_;  ///< freed by whoever runs next
};

}  // namespace sim
