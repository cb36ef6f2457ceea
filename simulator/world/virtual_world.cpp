// The world whose time costs nothing.
//
// One thread holds the baton and runs; it passes it on only where it blocks. Who is next is decided
// by queues alone, never by the host, and so a run is a function of its seed.
#include <atomic>
#include <deque>
#include <utility>

#include "world/carrier.h"
#include "world/world_core.h"

namespace sim {
namespace {

/// Far beyond any upgrade: a thread that retries for ever would otherwise keep a test busy for
/// ever, because nothing it waits for takes any of the host's time.
constexpr Micros kEndOfTime = std::chrono::hours(24 * 60);

class VirtualWorld final : public WorldCore {
 public:
  VirtualWorld(std::uint64_t seed, ThreadKind threads)
      : WorldCore(seed), light_(threads == ThreadKind::kLight) {}
  ~VirtualWorld() override {
    EndAllThreads();
    EndShared();
  }

  [[nodiscard]] bool is_virtual() const override { return true; }
  [[nodiscard]] Micros now() const override {
    return Micros(now_us_.load(std::memory_order_relaxed));
  }

  Wake Block(Lock& lock, const Queues& queues, std::optional<Micros> deadline) override {
    SimThread& self = Caller("Block");
    if (self.terminate) Leave(self);
    self.state = SimThread::State::kBlocked;
    self.timed_out = false;
    self.calls = 0;
    self.time_asked = 0;
    EnterQueues(self, queues);
    if (deadline) StartTimer(self, *deadline);
    SimThread* const next = PassBaton();
    if (next != &self) {
      // The next thread is woken with the lock free: it needs it at once.
      lock.unlock();
      HandOver(self, next);
      lock.lock();
    }
    if (self.terminate) Leave(self);
    return self.timed_out ? Wake::kTimeout : Wake::kNotified;
  }

  void Yield(Lock& lock) override { Block(lock, {}, now() + Micros(1)); }

  Wake BlockOnFiles(Lock& /*lock*/, pollfd* /*files*/, std::size_t /*count*/,
                    const Queues& /*queues*/, std::optional<Micros> /*deadline*/) override {
    Die("a wait on the host's files in a virtual world");
  }

  SimThread& Attach(Device& device, std::string name) override {
    Lock lock = Acquire();
    SimThread& self = NewAttached(device, std::move(name));
    if (self.outer != nullptr && self.outer == running_) {
      self.outer->state = SimThread::State::kBlocked;
      self.state = SimThread::State::kRunning;
      running_ = &self;
    } else {
      MakeReady(self);
      AwaitBaton(self, lock);
    }
    return self;
  }

  void Detach(SimThread& thread) override {
    const Lock lock = Acquire();
    if (&Caller("Detach") != &thread) Die("a thread was detached by another");
    SetCurrent(thread.outer);
    Finish(thread, 0);
    if (thread.outer != nullptr && thread.outer->world == this) {
      running_ = thread.outer;
      running_->state = SimThread::State::kRunning;
    } else {
      GiveTurn(PassBaton());
    }
  }

 protected:
  void Wakeup(SimThread& thread) override {
    LeaveQueues(thread);
    StopTimer(thread);
    MakeReady(thread);
  }

  void Equip(SimThread& thread) override {
    if (!light_) return WorldCore::Equip(thread);
    thread.fiber = carrier_.Make([this, &thread] {
      ThreadMain(thread);
      carrier_.End(std::move(thread.fiber), std::exchange(after_end_, nullptr));
    });
    thread.runs_on = thread.fiber.get();
  }

  void AwaitFirstTurn(SimThread& thread, Lock& lock) override {
    // A light thread's first step is its first turn.
    if (thread.runs_on == nullptr) AwaitBaton(thread, lock);
  }

  void Ended(SimThread& thread) override {
    SimThread* const next = PassBaton();
    if (thread.runs_on == nullptr) {
      GiveTurn(next);
    } else {
      after_end_ = next;
    }
  }

  // The clock moves only when a thread gives up the baton.
  void ActionAdded() override {}

 private:
  void MakeReady(SimThread& thread) {
    thread.state = SimThread::State::kReady;
    ready_.push_back(&thread);
    if (running_ == nullptr && !passing_) GiveTurn(PassBaton());
  }

  static void AwaitBaton(SimThread& self, Lock& lock) {
    lock.unlock();
    self.turn.Await();
    lock.lock();
  }

  void GiveTurn(SimThread* thread) {
    if (thread == nullptr) return;
    if (thread->runs_on != nullptr) {
      carrier_.Resume(*thread->runs_on);
    } else {
      thread->turn.Give();
    }
  }

  /// Gives `next` its turn and waits for the caller's own.
  void HandOver(SimThread& self, SimThread* next) {
    if (self.runs_on == nullptr) {
      GiveTurn(next);
      self.turn.Await();
    } else {
      carrier_.PassOn(*self.runs_on, next);
      SetCurrent(&self);
    }
  }

  /// Decides who runs next, and moves the clock while nobody is ready.
  /// @return who it is, not woken yet; null when the world rests.
  SimThread* PassBaton() {
    running_ = nullptr;
    passing_ = true;
    while (ready_.empty() && !timers().empty()) AdvanceClock();
    passing_ = false;
    if (ready_.empty()) {
      DieWhenStuck();
      return nullptr;
    }
    running_ = ready_.front();
    ready_.pop_front();
    running_->state = SimThread::State::kRunning;
    return running_;
  }

  /// To the earliest timer; everything due by then happens, in order.
  void AdvanceClock() {
    const Micros due = timers().begin()->first.first;
    if (due > now()) now_us_.store(due.count(), std::memory_order_relaxed);
    if (due > kEndOfTime) Die("the simulated clock ran away");
    while (!timers().empty() && timers().begin()->first.first <= now()) {
      const WorldTimer timer = PopTimer();
      if (timer.thread != nullptr) {
        timer.thread->timed_out = true;
        Wakeup(*timer.thread);
      } else {
        timer.action();
      }
    }
  }

  /// With no host thread attached a world may rest: one can still attach, or end it.
  void DieWhenStuck() const {
    if (AttachedThreads() > 0) Die("every simulated thread waits and nothing can wake one");
  }

  const bool light_;
  SimThread* after_end_ = nullptr;  ///< whose turn it is when a light thread has ended
  Carrier carrier_;                 ///< of the light threads
  std::atomic<std::int64_t> now_us_{0};
  SimThread* running_ = nullptr;
  bool passing_ = false;
  std::deque<SimThread*> ready_;
};

}  // namespace

std::unique_ptr<World> World::MakeVirtual(std::uint64_t seed, ThreadKind threads) {
  return std::make_unique<VirtualWorld>(seed, threads);
}

}  // namespace sim
