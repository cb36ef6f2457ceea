#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/kernel.h"
#include "ce/types.h"
#include "kernel/kernel.h"
#include "support/device_test.h"
#include "trace/trace.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace {

using sim::Micros;
using std::chrono::milliseconds;

class VirtualWorldTest : public DeviceTest {
 protected:
  [[nodiscard]] Micros now() { return world().now(); }

  void StartThread(std::function<void()> body) {
    const auto lock = world().Acquire();
    world().Spawn(
        device(), "thread",
        [body = std::move(body)] {
          body();
          return 0U;
        },
        false);
  }
};

TEST_F(VirtualWorldTest, LongSleepsCostNoTime) {
  Sleep(300000);
  EXPECT_EQ(now(), milliseconds(300000));
  EXPECT_EQ(GetTickCount(), 300000U);
}

TEST_F(VirtualWorldTest, AThreadRunsOnlyWhenTheRunningOneBlocks) {
  std::string order;
  StartThread([&] { order += 'b'; });
  order += 'a';
  Sleep(0);
  order += 'c';
  EXPECT_EQ(order, "abc");
}

TEST_F(VirtualWorldTest, SleepersWakeInTheOrderOfTheirDeadlines) {
  std::vector<DWORD> order;
  for (const DWORD ms : {30, 10, 20}) {
    StartThread([&order, ms] {
      Sleep(ms);
      order.push_back(ms);
    });
  }
  Sleep(100);
  EXPECT_EQ(order, (std::vector<DWORD>{10, 20, 30}));
}

TEST_F(VirtualWorldTest, SleepersOfOneInstantWakeInTheOrderInWhichTheyLayDown) {
  std::string order;
  for (const char name : {'x', 'y', 'z'}) {
    StartThread([&order, name] {
      Sleep(5);
      order += name;
    });
  }
  Sleep(6);
  EXPECT_EQ(order, "xyz");
}

TEST_F(VirtualWorldTest, SleepOfNothingYieldsAndLetsTimePass) {
  const Micros before = now();
  for (int i = 0; i < 10; ++i) Sleep(0);
  EXPECT_EQ(now() - before, Micros(10));
}

TEST_F(VirtualWorldTest, ActionsOfOneInstantRunInTheOrderInWhichTheyWerePutIn) {
  std::string order;
  {
    const auto lock = world().Acquire();
    world().At(milliseconds(2), [&] { order += '3'; });
    world().At(milliseconds(1), [&] { order += '1'; });
    world().At(milliseconds(1), [&] { order += '2'; });
    world().Cancel(world().At(milliseconds(1), [&] { order += 'x'; }));
  }
  Sleep(3);
  EXPECT_EQ(order, "123");
}

TEST_F(VirtualWorldTest, AProgramThatPollsTheTimeWithoutPauseSeesItPass) {
  const DWORD start = GetTickCount();
  while (GetTickCount() - start < 50) {
  }
  EXPECT_EQ(now(), milliseconds(50));
}

TEST_F(VirtualWorldTest, AProgramThatPollsForTheEndOfAThreadSeesIt) {
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void*) -> DWORD {
        Sleep(10);
        return 5;
      },
      nullptr, 0, nullptr);
  DWORD code = STILL_ACTIVE;
  int polls = 0;
  for (; code == STILL_ACTIVE; ++polls) ASSERT_TRUE(GetExitCodeThread(thread, &code));

  EXPECT_EQ(code, 5U);
  EXPECT_LE(polls, 10002) << "a microsecond passes with each look";
  EXPECT_TRUE(CloseHandle(thread));
}

TEST_F(VirtualWorldTest, ATerminatedThreadLeavesItsWait) {
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void*) -> DWORD {
        Sleep(INFINITE);
        return 1;
      },
      nullptr, 0, nullptr);
  Sleep(1);
  EXPECT_TRUE(TerminateThread(thread, 7));
  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  DWORD code = 0;
  EXPECT_TRUE(GetExitCodeThread(thread, &code));
  EXPECT_EQ(code, 7U);
  EXPECT_TRUE(CloseHandle(thread));
}

TEST_F(VirtualWorldTest, TerminationReleasesWhatTheSimulatorHoldsInTheAbandonedFrames) {
  bool released = false;
  struct Held {
    bool& released;
    ~Held() { released = true; }
  };
  sim::SimThread* thread = nullptr;
  StartThread([&] {
    thread = sim::World::Current();
    const Held held{released};
    auto lock = world().Acquire();
    world().Block(lock, {}, std::nullopt);
  });
  Sleep(1);
  {
    const auto lock = world().Acquire();
    world().Terminate(*thread, 0);
  }
  EXPECT_FALSE(released) << "it leaves when it is its turn";
  Sleep(1);
  EXPECT_TRUE(released);
}

TEST_F(VirtualWorldTest, AThreadThatIsReadyWhenItIsTerminatedLeavesAtItsTurn) {
  sim::WaitQueue queue;
  sim::SimThread* thread = nullptr;
  bool went_on = false;
  StartThread([&] {
    thread = sim::World::Current();
    auto lock = world().Acquire();
    world().Block(lock, {&queue}, std::nullopt);
    went_on = true;
  });
  Sleep(1);
  {
    const auto lock = world().Acquire();
    world().Notify(queue);
    world().Terminate(*thread, 3);
    world().Terminate(*thread, 4);
  }
  Sleep(1);
  EXPECT_FALSE(went_on);
  EXPECT_EQ(thread->exit_code, 3U) << "the first termination counts";
}

TEST_F(VirtualWorldTest, ASuspendedThreadStartsWhenItIsResumed) {
  bool ran = false;
  sim::SimThread* thread = nullptr;
  {
    const auto lock = world().Acquire();
    thread = &world().Spawn(
        device(), "late",
        [&] {
          ran = true;
          return 0U;
        },
        true);
  }
  Sleep(5);
  EXPECT_FALSE(ran);
  {
    const auto lock = world().Acquire();
    world().Resume(*thread);
    world().Resume(*thread);
  }
  Sleep(5);
  EXPECT_TRUE(ran);
}

TEST_F(VirtualWorldTest, AWaitForSeveralQueuesEndsByAnyOfThem) {
  sim::WaitQueue queues[3];
  for (sim::WaitQueue& queue : queues) {
    auto lock = world().Acquire();
    world().At(now() + milliseconds(1), [&] { world().Notify(queue); });
    EXPECT_EQ(world().Block(lock, {&queues[0], &queues[1], &queues[2]}, std::nullopt),
              sim::Wake::kNotified);
  }
  EXPECT_EQ(now(), milliseconds(3));
}

TEST_F(VirtualWorldTest, ANotificationBeforeTheWaitIsNotRemembered) {
  sim::WaitQueue queue;
  auto lock = world().Acquire();
  world().Notify(queue);
  EXPECT_EQ(world().Block(lock, {&queue}, now() + milliseconds(1)), sim::Wake::kTimeout);
}

TEST_F(VirtualWorldTest, AnActionMayPutInAnotherOneForTheSameInstant) {
  std::string order;
  {
    const auto lock = world().Acquire();
    world().At(milliseconds(1), [&] {
      order += 'a';
      world().At(milliseconds(0), [&] { order += 'b'; });
    });
  }
  Sleep(1);
  EXPECT_EQ(order, "ab");
  EXPECT_EQ(now(), milliseconds(1)) << "the clock never goes back";
}

TEST_F(VirtualWorldTest, AnActionMayStartAThread) {
  bool ran = false;
  {
    const auto lock = world().Acquire();
    world().At(milliseconds(1), [&] {
      world().Spawn(
          device(), "started",
          [&] {
            ran = true;
            return 0U;
          },
          false);
    });
  }
  Sleep(2);
  EXPECT_TRUE(ran);
}

TEST_F(VirtualWorldTest, AHostThreadPlaysSeveralDevicesInTurn) {
  const test::TemporaryFolder folder;
  sim::Device other(world(), sim::Profile{}, folder.path());
  SetLastError(1);
  {
    const sim::AttachedThread there(other, "inner");
    EXPECT_EQ(&sim::Device::Current("test"), &other);
    SetLastError(2);
    Sleep(10);
  }
  EXPECT_EQ(&sim::Device::Current("test"), &device());
  EXPECT_EQ(GetLastError(), 1U);
  EXPECT_EQ(now(), milliseconds(10)) << "one clock for all";
}

TEST_F(VirtualWorldTest, AnotherHostThreadTakesItsTurns) {
  std::string order;
  std::thread host([&] {
    const sim::AttachedThread program(device(), "second");
    order += 'b';
    Sleep(10);
    order += 'd';
  });
  // Its arrival is the host's business; from then on the order is the world's.
  while (device().kernel().LiveThreads() < 2) std::this_thread::yield();
  order += 'a';
  Sleep(5);
  order += 'c';
  Sleep(20);
  host.join();
  EXPECT_EQ(order, "abcd");
}

TEST_F(VirtualWorldTest, ADeviceThatGoesTakesOnlyItsOwnThreads) {
  const test::TemporaryFolder folder;
  auto other = std::make_unique<sim::Device>(world(), sim::Profile{}, folder.path());
  bool survived = false;
  StartThread([&] {
    Sleep(10);
    survived = true;
  });
  {
    const auto lock = world().Acquire();
    for (int i = 0; i < 3; ++i) {
      world().Spawn(
          *other, "doomed",
          [] {
            Sleep(INFINITE);
            return 0U;
          },
          false);
    }
  }
  Sleep(1);
  other.reset();
  Sleep(20);
  EXPECT_TRUE(survived);
}

TEST_F(VirtualWorldTest, TheWorldRunsOnWhenNoHostThreadIsAttached) {
  const test::TemporaryFolder folder;
  const auto resting = sim::World::MakeVirtual();
  sim::Device other(*resting, sim::Profile{}, folder.path());
  {
    const auto lock = resting->Acquire();
    resting->Spawn(
        other, "alone",
        [] {
          Sleep(1000);
          Sleep(INFINITE);
          return 0U;
        },
        false);
  }
  while (resting->now() < milliseconds(1000)) std::this_thread::yield();
}

TEST_F(VirtualWorldTest, AProgramsExitCodeComesBack) {
  EXPECT_EQ(test::RunProgram(device(),
                             [] {
                               Sleep(60000);
                               return 23U;
                             }),
            23U);
  EXPECT_EQ(now(), milliseconds(60000));
}

TEST_F(VirtualWorldTest, HundredsOfThreadsShareAWorld) {
  constexpr int kThreads = 400;
  int sum = 0;
  for (int i = 0; i < kThreads; ++i) {
    StartThread([&sum, i] {
      for (int j = 0; j < 5; ++j) Sleep(static_cast<DWORD>((i * 7 + j) % 50 + 1));
      ++sum;
    });
  }
  Sleep(1000);
  EXPECT_EQ(sum, kThreads);
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
}

/// Several threads that sleep, signal, wait, compete and end by chance, and what was traced.
std::vector<std::string> RunByChance(std::uint64_t seed,
                                     sim::ThreadKind kind = sim::ThreadKind::kHost) {
  const test::TemporaryFolder folder;
  const auto chance_world = sim::World::MakeVirtual(seed, kind);
  sim::Device machine(*chance_world, sim::Profile{}, folder.path());
  std::vector<std::string> lines;
  machine.trace().SetSink([&](std::string_view line) { lines.emplace_back(line); });
  const sim::AttachedThread host(machine);
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  HANDLE event = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  const auto random = [&](std::uint64_t below) {
    const auto lock = chance_world->Acquire();
    return static_cast<DWORD>(chance_world->Random() % below);
  };
  std::vector<sim::SimThread*> threads;
  for (int i = 0; i < 6; ++i) {
    const auto lock = chance_world->Acquire();
    threads.push_back(&chance_world->Spawn(
        machine, "worker",
        [&] {
          for (int step = 0; step < 40; ++step) {
            switch (random(5)) {
              case 0: Sleep(random(20)); break;
              case 1: SetEvent(event); break;
              case 2: WaitForSingleObject(event, random(30)); break;
              case 3: Sleep(0); break;
              default:
                EnterCriticalSection(&section);
                Sleep(random(3));
                LeaveCriticalSection(&section);
            }
          }
          return random(1000);
        },
        false));
  }
  Sleep(50);
  {
    const auto lock = chance_world->Acquire();
    chance_world->Terminate(*threads[0], 1);
  }
  Sleep(5000);
  lines.push_back(std::to_string(GetTickCount()));
  return lines;
}

TEST(VirtualWorldSeeds, EqualSeedsGiveEqualRuns) {
  const std::vector<std::string> first = RunByChance(7);
  EXPECT_GT(first.size(), 100U);
  EXPECT_EQ(first, RunByChance(7));
  EXPECT_NE(first, RunByChance(8));
}

TEST(VirtualWorldSeeds, LightThreadsGiveTheSameRun) {
  for (const std::uint64_t seed : {7U, 8U, 9U}) {
    EXPECT_EQ(RunByChance(seed), RunByChance(seed, sim::ThreadKind::kLight)) << seed;
  }
}

TEST(VirtualWorldSeeds, ChanceIsEven) {
  const auto world = sim::World::MakeVirtual(3);
  const auto lock = world->Acquire();
  int halves[2] = {0, 0};
  for (int i = 0; i < 10000; ++i) {
    const double unit = world->RandomUnit();
    ASSERT_GE(unit, 0.0);
    ASSERT_LT(unit, 1.0);
    ++halves[unit < 0.5 ? 0 : 1];
  }
  EXPECT_NEAR(halves[0], 5000, 200);
}

using VirtualWorldDeathTest = VirtualWorldTest;

TEST_F(VirtualWorldDeathTest, ReportsEveryThreadWhenNothingCanWakeOne) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  HANDLE event = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  EXPECT_DEATH(WaitForSingleObject(event, INFINITE),
               "every simulated thread waits and nothing can wake one at 0 us\n"
               "  [0-9]+ \"test\": waiting in WaitForSingleObject\n");
}

TEST_F(VirtualWorldDeathTest, EndsARunWhoseClockRunsAway) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(while (true) Sleep(1000000000), "the simulated clock ran away");
}

TEST_F(VirtualWorldDeathTest, EndsAThreadThatCallsForEverWithoutWaiting) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(while (true) GetLastError(), "\"test\" never waits, its last call is GetLastError");
}

TEST_F(VirtualWorldDeathTest, WaitsOnTheHostsFilesHaveNoPlaceHere) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        auto lock = world().Acquire();
        world().BlockOnFiles(lock, nullptr, 0, {}, std::nullopt);
      },
      "a wait on the host's files in a virtual world");
}

TEST_F(VirtualWorldDeathTest, AQueueMustNotGoWhileAThreadWaitsOnIt) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        auto queue = std::make_unique<sim::WaitQueue>();
        StartThread([&] {
          auto lock = world().Acquire();
          world().Block(lock, {queue.get()}, std::nullopt);
        });
        Sleep(1);
        queue.reset();
      },
      "a wait queue ended while thread \"thread\" waits on it");
}

}  // namespace
