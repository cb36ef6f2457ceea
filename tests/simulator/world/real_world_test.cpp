#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <atomic>
#include <functional>
#include <utility>
#include <vector>

#include "ce/kernel.h"
#include "kernel/kernel.h"
#include "support/device_test.h"
#include "world/world.h"

namespace {

using sim::Micros;
using sim::Wake;
using std::chrono::milliseconds;

class RealWorldThreadsTest : public RealDeviceTest {
 protected:
  sim::SimThread& Start(std::function<void()> body) {
    const auto lock = world().Acquire();
    return world().Spawn(
        device(), "thread",
        [body = std::move(body)] {
          body();
          return 0U;
        },
        false);
  }

  void Join(sim::SimThread& thread) {
    auto lock = world().Acquire();
    world().WaitUntil(lock, {&thread.finished}, std::nullopt,
                      [&] { return thread.state == sim::SimThread::State::kFinished; });
  }

  void End(sim::SimThread& thread) {
    {
      const auto lock = world().Acquire();
      world().Terminate(thread, 9);
    }
    Join(thread);
  }
};

class Pipe {
 public:
  Pipe() { EXPECT_EQ(pipe(ends_), 0); }
  ~Pipe() {
    close(ends_[0]);
    close(ends_[1]);
  }
  Pipe(const Pipe&) = delete;
  Pipe& operator=(const Pipe&) = delete;
  [[nodiscard]] pollfd reading() const { return {ends_[0], POLLIN, 0}; }
  void Write() const { EXPECT_EQ(write(ends_[1], "x", 1), 1); }

 private:
  int ends_[2] = {-1, -1};
};

TEST_F(RealWorldThreadsTest, ASleepTakesAtLeastItsTime) {
  const Micros before = world().now();
  Sleep(5);
  EXPECT_GE(world().now() - before, milliseconds(5));
}

TEST_F(RealWorldThreadsTest, ANotifiedThreadReturnsBeforeItsDeadline) {
  sim::WaitQueue queue;
  bool ready = false;
  Start([&] {
    const auto lock = world().Acquire();
    ready = true;
    world().Notify(queue);
  });
  auto lock = world().Acquire();
  EXPECT_TRUE(world().WaitUntil(lock, {&queue}, world().now() + std::chrono::hours(1),
                                [&] { return ready; }));
}

TEST_F(RealWorldThreadsTest, AWaitEndsAtItsDeadline) {
  sim::WaitQueue queue;
  auto lock = world().Acquire();
  const Micros deadline = world().now() + milliseconds(5);
  EXPECT_FALSE(world().WaitUntil(lock, {&queue}, deadline, [] { return false; }));
  EXPECT_GE(world().now(), deadline);
}

TEST_F(RealWorldThreadsTest, ActionsRunInTheOrderOfTheirTimesUnlessCancelled) {
  std::vector<int> order;
  sim::WaitQueue queue;
  auto lock = world().Acquire();
  const Micros start = world().now();
  world().At(start + milliseconds(4), [&] {
    order.push_back(2);
    world().Notify(queue);
  });
  world().At(start + milliseconds(2), [&] { order.push_back(1); });
  world().Cancel(world().At(start + milliseconds(1), [&] { order.push_back(0); }));
  world().WaitUntil(lock, {&queue}, std::nullopt, [&] { return order.size() == 2; });
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST_F(RealWorldThreadsTest, AWaitOnFilesEndsWhenOneIsReady) {
  const Pipe pipe;
  pipe.Write();
  pollfd file = pipe.reading();
  auto lock = world().Acquire();
  EXPECT_EQ(world().BlockOnFiles(lock, &file, 1, {}, std::nullopt), Wake::kNotified);
  EXPECT_EQ(file.revents, POLLIN);
}

TEST_F(RealWorldThreadsTest, AWaitOnFilesEndsAtItsDeadline) {
  const Pipe pipe;
  pollfd file = pipe.reading();
  auto lock = world().Acquire();
  EXPECT_EQ(world().BlockOnFiles(lock, &file, 1, {}, world().now() + milliseconds(2)),
            Wake::kTimeout);
  EXPECT_EQ(file.revents, 0);
}

TEST_F(RealWorldThreadsTest, AWaitOnFilesEndsByNotification) {
  const Pipe pipe;
  sim::WaitQueue queue;
  bool ready = false;
  Start([&] {
    const auto lock = world().Acquire();
    ready = true;
    world().Notify(queue);
  });
  pollfd file = pipe.reading();
  auto lock = world().Acquire();
  while (!ready) {
    EXPECT_EQ(world().BlockOnFiles(lock, &file, 1, {&queue}, std::nullopt), Wake::kNotified);
  }
  // The notification is used up: the next wait runs to its deadline.
  EXPECT_EQ(world().BlockOnFiles(lock, &file, 1, {&queue}, world().now() + milliseconds(1)),
            Wake::kTimeout);
}

TEST_F(RealWorldThreadsTest, EveryKindOfWaitEndsByTermination) {
  const Pipe pipe;
  const std::function<void()> kinds[] = {[] { Sleep(INFINITE); },
                                         [&] {
                                           pollfd file = pipe.reading();
                                           auto lock = world().Acquire();
                                           while (true)
                                             world().BlockOnFiles(lock, &file, 1, {}, std::nullopt);
                                         },
                                         [&] {
                                           HANDLE event =
                                               CreateEventW(nullptr, FALSE, FALSE, nullptr);
                                           WaitForSingleObject(event, INFINITE);
                                         }};
  std::vector<sim::SimThread*> threads;
  for (const auto& kind : kinds) threads.push_back(&Start(kind));
  Sleep(2);
  for (sim::SimThread* thread : threads) {
    End(*thread);
    EXPECT_EQ(thread->exit_code, 9U);
  }
}

TEST_F(RealWorldThreadsTest, TerminationNeverInterruptsARunningThread) {
  std::atomic<bool> started{false};
  std::atomic<bool> go{false};
  std::atomic<int> steps{0};
  sim::SimThread& thread = Start([&] {
    started = true;
    while (!go) std::this_thread::yield();
    ++steps;
    Sleep(0);
    ++steps;
  });
  while (!started) std::this_thread::yield();
  {
    const auto lock = world().Acquire();
    world().Terminate(thread, 1);
  }
  go = true;
  Join(thread);
  EXPECT_EQ(steps, 1) << "it went on to its next blocking call, and no further";
}

TEST_F(RealWorldThreadsTest, ThreadsThatShareACriticalSectionCountRight) {
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  int count = 0;
  std::vector<sim::SimThread*> threads;
  for (int i = 0; i < 4; ++i) {
    threads.push_back(&Start([&] {
      for (int j = 0; j < 500; ++j) {
        EnterCriticalSection(&section);
        ++count;
        LeaveCriticalSection(&section);
      }
    }));
  }
  for (sim::SimThread* thread : threads) Join(*thread);
  EXPECT_EQ(count, 2000);
  DeleteCriticalSection(&section);
}

TEST_F(RealWorldThreadsTest, ThreadsPlayPingPongWithEvents) {
  HANDLE ping = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  HANDLE pong = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  int rallies = 0;
  sim::SimThread& partner = Start([&] {
    while (WaitForSingleObject(ping, INFINITE) == WAIT_OBJECT_0) {
      ++rallies;
      SetEvent(pong);
    }
  });
  for (int i = 0; i < 300; ++i) {
    SetEvent(ping);
    ASSERT_EQ(WaitForSingleObject(pong, INFINITE), WAIT_OBJECT_0);
  }
  EXPECT_EQ(rallies, 300);
  CloseHandle(pong);
  End(partner);
}

TEST_F(RealWorldThreadsTest, TwoHostThreadsAreProgramsOfOneDevice) {
  DWORD other = 0;
  std::thread host([&] {
    const sim::AttachedThread program(device(), "second");
    other = GetCurrentThreadId();
    SetLastError(77);
  });
  SetLastError(5);
  host.join();
  EXPECT_NE(other, GetCurrentThreadId());
  EXPECT_EQ(GetLastError(), 5U);
}

TEST_F(RealWorldThreadsTest, ADeviceEndsItsThreadsBeforeItGoes) {
  for (int i = 0; i < 8; ++i) Start([] { Sleep(INFINITE); });
  Restart();
  EXPECT_EQ(device().kernel().LiveThreads(), 1U) << "the test's own";
}

}  // namespace
