// Several threads hand over and end jobs at the same time.
#include <gtest/gtest.h>

#include <atomic>
#include <string>

#include "ce/kernel.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_thread.h"
#include "product_support/host.h"
#include "product_support/jobs.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/run_state/run_state.h"
#include "upgrade/turn.h"

namespace upgrade {
namespace {

class JobsThreadsTest : public RealDeviceTest {
 protected:
  static constexpr int kEnds = 4;
  static inline std::atomic<int> answered{0};

  /// A host that keeps ending "Upgrade", whatever that brings.
  static DWORD WINAPI KeepEndingUpgrade(void* /*unused*/) {
    for (int i = 0; i < kEnds; ++i) {
      const std::uint32_t result = IcfgEndGroup("Upgrade", 0, 0);
      EXPECT_TRUE(result == ICFG_OK || result == ICFG_NO_SPACE || result == ICFG_TEST_FAILED);
      answered.fetch_add(1);
    }
    return 0;
  }

  static DWORD WINAPI TakeTurns(void* /*unused*/) {
    for (started.fetch_add(1); started.load() < 2;) Sleep(1);
    for (int i = 0; i < 50;) {
      const std::uint32_t number = TakeNumber(nullptr, 0);
      if (number == 0) {
        Sleep(1);
        continue;
      }
      ++i;
      if (i % 5 == 0) {
        GiveNumberBack(number);
        continue;
      }
      AwaitTurn(number, INFINITE);
      EXPECT_EQ(inside.fetch_add(1), 0) << "one at a time";
      ++unguarded;
      Sleep(1);
      inside.fetch_sub(1);
      EndTurn(number);
    }
    return 0;
  }
  static inline std::atomic<int> started{0};
  static inline std::atomic<int> inside{0};
  static inline int unguarded = 0;  // whose turn it is may touch it without a lock

  static void RunOnTwoThreads(LPTHREAD_START_ROUTINE body) {
    HANDLE threads[2] = {};
    for (HANDLE& thread : threads) thread = CreateThread(nullptr, 0, body, nullptr, 0, nullptr);
    for (HANDLE thread : threads) {
      EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
      CloseHandle(thread);
    }
  }
};

TEST_F(JobsThreadsTest, TakeTurnsThatNeverOverlap) {
  RunOnTwoThreads(TakeTurns);
  EXPECT_EQ(unguarded, 80);
}

TEST_F(JobsThreadsTest, SurviveTwoHostsThatKeepEndingUpgrade) {
  test::PutFile("\\Temp\\a.txt", "a");
  test::HostJob job;
  job.base_url = "http://127.0.0.1:1";  // nobody answers there
  job.show_gui = false;
  job.stop = {"none.exe"};
  job.cleared = {"\\Temp"};
  const test::Holdings before = test::HoldingsOf(device());
  EXPECT_EQ(test::WalkJob(job), ICFG_OK);
  auto* const other = new UpgradeConfig;
  other->SetBaseURL("http://127.0.0.1:1");
  other->SetShowGUI(0);
  other->AddFileDelete("\\Temp");
  HANDLE const thread = StartUpgradeThread(other, 1);
  ASSERT_NE(thread, nullptr);
  CloseHandle(thread);

  RunOnTwoThreads(KeepEndingUpgrade);

  EXPECT_EQ(answered.load(), 2 * kEnds);
  EXPECT_TRUE(test::AwaitEndOfJobs(device(), 100));
  EXPECT_FALSE(UpgradeInProgress());
  EXPECT_FALSE(test::Exists("\\Temp\\a.txt"));
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  test::DropKeptJob();
  EXPECT_EQ(test::HoldingsOf(device()), before);
}

}  // namespace
}  // namespace upgrade
