#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/kernel.h"
#include "ce/types.h"
#include "support/device_test.h"
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

using VirtualWorldDeathTest = VirtualWorldTest;

TEST_F(VirtualWorldDeathTest, ReportsEveryThreadWhenNothingCanWakeOne) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  HANDLE event = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  EXPECT_DEATH(WaitForSingleObject(event, INFINITE),
               "every simulated thread waits and nothing can wake one at 0 us\n"
               "  [0-9]+ \"test\": waiting in WaitForSingleObject\n");
}

}  // namespace
