// The world on the host's clock, threads and files.
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <condition_variable>
#include <ctime>

#include "world/world_core.h"

namespace sim {
namespace {

using Clock = std::chrono::steady_clock;

/// Waits longer than this are cut and taken up again: far deadlines must not overflow the clock.
constexpr Micros kLongestWait = std::chrono::hours(24);

timespec ToTimespec(Micros wait) {
  const auto micros = wait.count() > 0 ? wait.count() : 0;
  timespec result{};
  result.tv_sec = static_cast<time_t>(micros / 1000000);
  result.tv_nsec = static_cast<decltype(result.tv_nsec)>(micros % 1000000 * 1000);
  return result;
}

class RealWorld final : public WorldCore {
 public:
  RealWorld() : WorldCore(1), start_(Clock::now()) {}
  ~RealWorld() override {
    EndAllThreads();
    StopService();
    EndShared();
  }

  [[nodiscard]] bool is_virtual() const override { return false; }
  [[nodiscard]] Micros now() const override {
    return std::chrono::duration_cast<Micros>(Clock::now() - start_);
  }

  Wake Block(Lock& lock, const Queues& queues, std::optional<Micros> deadline) override {
    SimThread& self = BeginBlock(queues, "Block");
    bool in_time = true;
    while (!self.notified && in_time) {
      if (deadline) {
        const Micros until = std::min(*deadline, now() + kLongestWait);
        const bool passed = self.wake.wait_until(lock, start_ + until) == std::cv_status::timeout;
        in_time = !passed || until < *deadline;
      } else {
        self.wake.wait(lock);
      }
    }
    EndBlock(self);
    return self.notified ? Wake::kNotified : Wake::kTimeout;
  }

  void Yield(Lock& /*lock*/) override {
    SimThread& self = Caller("Yield");
    if (self.terminate) Leave(self);
    std::this_thread::yield();
  }

  Wake BlockOnFiles(Lock& lock, pollfd* files, std::size_t count, const Queues& queues,
                    std::optional<Micros> deadline) override {
    SimThread& self = BeginBlock(queues, "BlockOnFiles");
    std::vector<pollfd> polled(files, files + count);
    polled.push_back(pollfd{WakeFile(self), POLLIN, 0});
    bool ready = false;
    bool in_time = true;
    self.polling = true;
    while (!self.notified && !ready && in_time) {
      lock.unlock();
      ready = Poll(polled, deadline) > 0;
      lock.lock();
      in_time = !deadline || now() < *deadline;
    }
    self.polling = false;
    if (polled.back().revents != 0) Drain(self.wake_file);
    for (std::size_t i = 0; i < count; ++i) files[i].revents = polled[i].revents;
    EndBlock(self);
    return self.notified || ready ? Wake::kNotified : Wake::kTimeout;
  }

  SimThread& Attach(Device& device, std::string name) override {
    const Lock lock = Acquire();
    SimThread& self = NewAttached(device, std::move(name));
    self.state = SimThread::State::kRunning;
    return self;
  }

  void Detach(SimThread& thread) override {
    const Lock lock = Acquire();
    if (&Caller("Detach") != &thread) Die("a thread was detached by another");
    SetCurrent(thread.outer);
    if (thread.wake_file >= 0) close(thread.wake_file);
    thread.wake_file = -1;
    Finish(thread, 0);
  }

 protected:
  void Wakeup(SimThread& thread) override {
    LeaveQueues(thread);
    thread.notified = true;
    if (thread.state == SimThread::State::kSuspended) thread.state = SimThread::State::kReady;
    thread.wake.notify_one();
    if (!thread.polling) return;
    const std::uint64_t one = 1;
    static_cast<void>(!write(thread.wake_file, &one, sizeof one));
  }

  void AwaitFirstTurn(SimThread& thread, Lock& lock) override {
    while (thread.state == SimThread::State::kSuspended) thread.wake.wait(lock);
    thread.state = SimThread::State::kRunning;
  }

  void Ended(SimThread& /*thread*/) override {}

  void ActionAdded() override {
    if (!service_.joinable()) service_ = std::thread([this] { Serve(); });
    service_wake_.notify_one();
  }

 private:
  SimThread& BeginBlock(const Queues& queues, const char* what) {
    SimThread& self = Caller(what);
    if (self.terminate) Leave(self);
    self.state = SimThread::State::kBlocked;
    self.notified = false;
    self.calls = 0;
    self.time_asked = 0;
    EnterQueues(self, queues);
    return self;
  }

  static void EndBlock(SimThread& self) {
    LeaveQueues(self);
    self.state = SimThread::State::kRunning;
    if (self.terminate) Leave(self);
  }

  [[nodiscard]] int WakeFile(SimThread& self) const {
    if (self.wake_file < 0) self.wake_file = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (self.wake_file < 0) Die("no event descriptor left");
    return self.wake_file;
  }

  static void Drain(int file) {
    std::uint64_t count = 0;
    static_cast<void>(!read(file, &count, sizeof count));
  }

  int Poll(std::vector<pollfd>& files, std::optional<Micros> deadline) const {
    timespec left{};
    if (deadline) left = ToTimespec(std::min(*deadline - now(), kLongestWait));
    const int found =
        ppoll(files.data(), static_cast<nfds_t>(files.size()), deadline ? &left : nullptr, nullptr);
    // A failed poll says nothing about the files; what it left in them must not be believed.
    if (found < 0) {
      for (pollfd& file : files) file.revents = 0;
    }
    return found;
  }

  /// Runs the actions as they come due.
  void Serve() {
    Lock lock = Acquire();
    while (!stop_service_) {
      if (timers().empty()) {
        service_wake_.wait(lock);
        continue;
      }
      const Micros due = timers().begin()->first.first;
      if (due > now()) {
        service_wake_.wait_until(lock, start_ + std::min(due, now() + kLongestWait));
        continue;
      }
      const WorldTimer timer = PopTimer();
      timer.action();
    }
  }

  void StopService() {
    {
      const Lock lock = Acquire();
      stop_service_ = true;
      service_wake_.notify_one();
    }
    if (service_.joinable()) service_.join();
  }

  const Clock::time_point start_;
  std::condition_variable service_wake_;
  bool stop_service_ = false;
  std::thread service_;
};

}  // namespace

std::unique_ptr<World> World::MakeReal() {
  return std::make_unique<RealWorld>();
}

}  // namespace sim
