// One clock, one lock and all blocking of a simulated world.
//
// Two worlds stand behind this interface. The real one runs on the host's clock and threads. In the
// virtual one exactly one simulated thread runs at a time, it is left only at blocking calls, and
// when all threads are blocked the clock jumps to the next deadline; the same seed gives the same
// run, byte for byte. Nothing else in the simulator sleeps, waits or reads a clock.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <typeindex>
#include <vector>

struct pollfd;

namespace sim {

class Device;
class World;
struct SimThread;

/// Time since the world began.
using Micros = std::chrono::microseconds;

/// A point where simulated threads wait to be woken: every object that can make a thread runnable
/// owns one. Guarded by the world's lock; a thread may wait on several at once. Must not end while
/// threads wait on it.
class WaitQueue {
 public:
  WaitQueue() = default;
  ~WaitQueue();
  WaitQueue(const WaitQueue&) = delete;
  WaitQueue& operator=(const WaitQueue&) = delete;

 private:
  friend class WorldCore;
  std::vector<SimThread*> waiting_;
};

enum class Wake : std::uint8_t { kNotified, kTimeout };

/// What the simulated threads of a virtual world consist of. Both give the same runs.
enum class ThreadKind : std::uint8_t {
  kHost,   ///< threads of the host: debuggers and other tools see them
  kLight,  ///< stacks that take turns on one thread of the host: for thousands of threads
};

class World {
 public:
  using Lock = std::unique_lock<std::mutex>;
  using Queues = std::vector<WaitQueue*>;

  /// A world on the host's clock, threads and sockets.
  static std::unique_ptr<World> MakeReal();
  /// A world whose time costs nothing. `seed` decides everything that is random in it.
  static std::unique_ptr<World> MakeVirtual(std::uint64_t seed = 1,
                                            ThreadKind threads = ThreadKind::kHost);

  /// Terminates the simulated threads that are left, at their next blocking call, and joins them.
  virtual ~World();
  World(const World&) = delete;
  World& operator=(const World&) = delete;

  [[nodiscard]] virtual bool is_virtual() const = 0;
  [[nodiscard]] std::uint64_t seed() const { return seed_; }

  /// The lock that guards all simulated state which several threads share. Held for short
  /// stretches, never while product code runs.
  [[nodiscard]] Lock Acquire() { return Lock(mutex_); }

  [[nodiscard]] virtual Micros now() const = 0;

  /// Blocks the calling simulated thread until one of `queues` is notified or `deadline` passes
  /// (none: no limit). Gives up the lock meanwhile and holds it again on return. May return
  /// kNotified without cause: callers look at their condition again. Does not return when the
  /// thread is terminated meanwhile: its stack is abandoned, as on the device.
  virtual Wake Block(Lock& lock, const Queues& queues, std::optional<Micros> deadline) = 0;

  /// As Block, and also returns when one of the host's file descriptors is ready (revents say
  /// which). Real world only.
  virtual Wake BlockOnFiles(Lock& lock, pollfd* files, std::size_t count, const Queues& queues,
                            std::optional<Micros> deadline) = 0;

  /// Blocks until `ready()` holds. `ready` may have side effects (take what it waited for): it is
  /// asked with the lock held and not again once it has held.
  /// @return false when the deadline passed first.
  template <typename Predicate>
  bool WaitUntil(Lock& lock, const Queues& queues, std::optional<Micros> deadline,
                 Predicate ready) {
    while (!ready()) {
      if (Block(lock, queues, deadline) == Wake::kTimeout) return ready();
    }
    return true;
  }

  /// For calls that only look whether something has happened, and for waits that fail: lets others
  /// run, and a microsecond pass in a virtual world, so that a program which asks again without a
  /// pause does not stop the world. Like Block, does not return when the thread is terminated.
  virtual void Yield(Lock& lock) = 0;

  /// Makes every thread that waits on `queue` look at its condition again. Lock held.
  virtual void Notify(WaitQueue& queue) = 0;

  /// Runs `action` with the lock held when the clock reaches `when`; actions of one instant run in
  /// the order of these calls. Lock held. @return a number for Cancel.
  virtual std::uint64_t At(Micros when, std::function<void()> action) = 0;
  virtual void Cancel(std::uint64_t action) = 0;

  /// Starts a simulated thread of `device`. Lock held. The world owns the record; it stays valid
  /// until the world ends. A suspended thread waits for Resume.
  virtual SimThread& Spawn(Device& device, std::string name, std::function<std::uint32_t()> body,
                           bool suspended) = 0;
  virtual void Resume(SimThread& thread) = 0;
  /// Ends `thread` at its current or next blocking call (or before its first step). Lock held.
  virtual void Terminate(SimThread& thread, std::uint32_t exit_code) = 0;

  /// Makes the calling host thread a simulated thread of `device` until Detach. In a virtual world
  /// it waits for its turn. Attaching again, to another device too, nests: until the inner Detach
  /// the host thread plays the inner part only.
  virtual SimThread& Attach(Device& device, std::string name) = 0;
  virtual void Detach(SimThread& thread) = 0;

  /// Terminates all threads of `device` but the attached ones and waits until they are gone. Ends
  /// the program with a report when one of them never comes to a blocking call. Lock not held.
  virtual void EndThreads(const Device& device) = 0;
  /// Threads of `device` that have not ended, attached ones included. Lock held.
  [[nodiscard]] virtual std::size_t LiveThreads(const Device& device) const = 0;
  /// Every thread's name, state and API call, one a line: for whoever looks into a run that hangs.
  /// Lock held.
  [[nodiscard]] virtual std::string Report() const = 0;

  /// The simulated thread that is calling, null for a host thread that is not attached.
  static SimThread* Current();

  /// Uniform in [0, 2^64), from the world's seed. Lock held.
  std::uint64_t Random();
  /// Uniform in [0, 1). Lock held.
  double RandomUnit();

  /// The world's one `T`, made from the world at first use; it ends after the world's threads and
  /// actions. For what the devices of a world share, such as the network between them. Lock held.
  template <typename T>
  T& Shared() {
    std::shared_ptr<void>& slot = shared_[std::type_index(typeid(T))];
    if (slot == nullptr) slot = std::make_shared<T>(*this);
    return *static_cast<T*>(slot.get());
  }

 protected:
  explicit World(std::uint64_t seed);
  /// Ends what Shared made. For the derived destructors, once the threads are gone: it may still
  /// call the world.
  void EndShared();

 private:
  std::mutex mutex_;
  std::uint64_t seed_;
  std::uint64_t random_state_;
  std::map<std::type_index, std::shared_ptr<void>> shared_;
};

/// Attaches the calling host thread to a device for the length of a scope: a test's or tool's own
/// thread becomes the device's host program.
class AttachedThread {
 public:
  explicit AttachedThread(Device& device, std::string name = "host");
  ~AttachedThread();
  AttachedThread(const AttachedThread&) = delete;
  AttachedThread& operator=(const AttachedThread&) = delete;

 private:
  World& world_;
  SimThread* thread_;
};

}  // namespace sim
