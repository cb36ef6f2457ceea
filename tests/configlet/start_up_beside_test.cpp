// The end of "Upgrade" while something else goes on: a running upgrade, another thread of the host,
// or a client that calls from inside its callback.
#include <gmock/gmock.h>

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>

#include "ce/errors.h"
#include "configlet/start_up_test.h"
#include "trace/trace.h"

namespace configlet {
namespace {

using ::testing::HasSubstr;

TEST_F(StartUpTest, LeavesNothingBehind) {
  const std::size_t handles = OpenHandles();
  Fill();
  EndUpgrade();
  ASSERT_TRUE(AwaitTheEnd());

  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_EQ(OpenHandles(), handles + 1) << "the mutex that marks the upgrade client";
}

TEST_F(StartUpTest, RefusesANewUpgradeUntilTheOldOneIsThrough) {
  Fill();
  EndUpgrade();

  EXPECT_EQ(Begin("Orvenix"), ICFG_OK) << "a new walk may begin";
  UpgradeConfig* const second = &job();
  EXPECT_EQ(Begin("Upgrade"), ICFG_UPGRADE_RUNNING);
  while (upgrade::UpgradeInProgress()) Sleep(1000);

  EXPECT_EQ(Begin("Upgrade"), ICFG_OK);
  Sleep(60000);
  EXPECT_EQ(&job(), second) << "the end of the first job takes only its own pointers away";
}

TEST_F(StartUpTest, DoesNotAskOtherProgramsWhetherTheyUpgrade) {
  HANDLE event = CreateEventW(nullptr, FALSE, FALSE, TEXT("TW_UPGRADE_IN_PROGRESS"));
  ASSERT_NE(event, nullptr);

  Fill();
  EXPECT_TRUE(upgrade::UpgradeInProgress()) << "begun, although another program has the event";
  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_TRUE(AwaitTheEnd());
  CloseHandle(event);
}

TEST_F(StartUpTest, RunsAlsoWhenUpgradeWasNeverBegun) {
  Fill();
  upgrade::EndUpgrade();  // as if "Upgrade" had not been begun

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK) << "although a job runs";
  while (HasJob()) Sleep(1000);
}

TEST_F(StartUpTest, SurvivesTheSameJobTwice) {
  Fill();

  EXPECT_EQ(EndUpgrade(), ICFG_OK);
  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_TRUE(AwaitTheEnd());
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(StartUpTest, TakesFieldsAndGroupsWhileTheThreadRunsAndAfterIt) {
  Fill();
  Begin("Download");
  Begin("File");
  End("File");
  EndUpgrade();
  for (int i = 0; i < 40; ++i) {
    EXPECT_EQ(Set("BaseURL", "http://late/"), ICFG_OK);
    EXPECT_EQ(Set("CRC", "1"), ICFG_OK);
    EXPECT_EQ(End("File"), ICFG_OK);
    Sleep(1000);
  }
  EXPECT_TRUE(AwaitTheEnd());
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(StartUpTest, LeavesARunningJobsListsAlone) {
  Fill();
  Begin("Download");
  for (int i = 0; i < 8; ++i) {
    Begin("File");
    Set("Source", "absent");
    Set("MCTMask", "*");
    Set("CRC", "1");
    End("File");
  }
  const UpgradeConfig* const started = &job();
  EndUpgrade();
  Sleep(5000);  // the thread is within the list: nobody answers it

  for (int i = 0; i < 20; ++i) EXPECT_EQ(End("File"), ICFG_OK);

  EXPECT_EQ(started->DownloadFiles().size(), 8U);
  EXPECT_TRUE(upgrade::UpgradeInProgress());
}

TEST_F(StartUpTest, FailsInNothingWhenTheJobEndsMeanwhile) {
  // Another thread that was started with the same job frees it at one of these calls.
  for (const char* call : {"GetSystemPowerStatusEx", "fclose"}) {
    Fill();
    UpgradeConfig* const ending = &job();
    const std::string wanted = "\"call\":\"" + std::string(call) + '"';
    device().trace().SetSink([&wanted](std::string_view line) {
      if (line.find(wanted) != std::string_view::npos) TheWalk().job = nullptr;
    });

    EXPECT_EQ(EndUpgrade(), ICFG_OK) << call;

    device().trace().SetSink({});
    EXPECT_EQ(took().count(), 0) << call;
    EXPECT_FALSE(HasJob()) << call;
    EXPECT_FALSE(upgrade::UpgradeInProgress()) << call;
    delete ending;
  }
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(StartUpTest, TouchesAndStartsNoOtherJobThanTheOneWhoseGroupHasEnded) {
  test::PutFile("\\Precious\\a.txt", "a");
  for (int nth = 1;; ++nth) {
    Fill();
    UpgradeConfig* const ending = &job();
    auto* const half_filled = new UpgradeConfig;
    half_filled->AddFileDelete("\\Precious");
    int lines = 0;
    bool started = false;
    // Another thread of the host begins a job when the n-th line is written.
    device().trace().SetSink([&](std::string_view line) {
      started = started || line.find("\"call\":\"CreateThread\"") != std::string_view::npos;
      if (started || line.find("\"call\":\"fclose\"") == std::string_view::npos) return;
      if (++lines != nth) return;
      TheWalk().job = half_filled;
      ++TheWalk().jobs;
    });

    EXPECT_EQ(EndUpgrade(), ICFG_OK) << nth;

    device().trace().SetSink({});
    EXPECT_TRUE(test::Exists("\\Precious\\a.txt")) << nth;
    if (started) {
      EXPECT_GT(nth, 6) << "a line for each check, and one more for the thread";
      delete half_filled;
      EXPECT_TRUE(AwaitTheEnd());
      break;
    }
    EXPECT_EQ(&job(), half_filled) << nth;
    EXPECT_FALSE(TheWalk().job_started) << nth;
    EXPECT_FALSE(upgrade::UpgradeInProgress()) << nth;
    delete half_filled;
    delete ending;
    TheWalk().job = nullptr;
  }
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(StartUpTest, IsOverWhenThereIsNoThreadToBeHad) {
  Fill();
  device().faults().Add({"CreateThread", 1, 0, ERROR_NOT_ENOUGH_MEMORY});

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_TRUE(HasJob()) << "the job stays with the walk";
  device().faults().Clear();
  EXPECT_EQ(EndUpgrade(), ICFG_OK);
  EXPECT_TRUE(AwaitTheEnd());
}

TEST_F(StartUpTest, ClearsTheFlagOfAnUpgradeThatRunsWhenAnotherFails) {
  Fill();
  EndUpgrade();
  Begin("Orvenix");
  ASSERT_TRUE(upgrade::UpgradeInProgress());

  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);

  EXPECT_FALSE(upgrade::UpgradeInProgress());
  Sleep(60000);
}

// ---- a client that calls from inside its callback ----

class CallbackTest : public StartUpTest {
 protected:
  /// Lets the client do this inside its first callback, and ends a job whose test fails.
  std::uint32_t FailWith(std::function<void()> action) {
    action_ = std::move(action);
    table_.set_data = Receive;
    IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(this), &table_);
    Fill();
    FillTest("7", "needs system 7");
    return EndUpgrade();
  }
  [[nodiscard]] int received() const { return received_; }

 private:
  static int Receive(std::uintptr_t context, const char* text, std::int32_t /*length*/,
                     const IcfgCallbacks* /*table*/) {
    auto& test = *reinterpret_cast<CallbackTest*>(context);
    if (test.received_++ > 0) return 0;
    EXPECT_THAT(text, HasSubstr("Upgrade Failed: needs system 7"));
    test.action_();
    return 0;
  }

  IcfgCallbacks table_ = {};
  std::function<void()> action_;
  int received_ = 0;
};

TEST_F(CallbackTest, MayBeginANewJobThatIsLeftAlone) {
  test::PutFile("\\Temp\\a.txt", "a");
  const UpgradeConfig* begun = nullptr;
  EXPECT_EQ(FailWith([&begun] {
              Begin("Orvenix");
              FillCleanup("\\Temp", "Delete");
              begun = &job();
            }),
            ICFG_TEST_FAILED);
  EXPECT_EQ(&job(), begun);
  EXPECT_TRUE(test::Exists("\\Temp\\a.txt"));
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(received(), 1);
}

TEST_F(CallbackTest, IsRefusedANewUpgradeAsTheFailedOneHasNotEnded) {
  std::uint32_t result = ICFG_OK;
  EXPECT_EQ(FailWith([&result] { result = Begin("Upgrade"); }), ICFG_TEST_FAILED);
  EXPECT_EQ(result, ICFG_UPGRADE_RUNNING);
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK);
}

TEST_F(CallbackTest, MayEndTheSameUpgradeThere) {
  std::uint32_t result = ICFG_OK;
  EXPECT_EQ(FailWith([&result] { result = End("Upgrade"); }), ICFG_TEST_FAILED);
  EXPECT_EQ(result, ICFG_TEST_FAILED);
  EXPECT_EQ(took(), 2 * kPause);
  EXPECT_EQ(received(), 2);
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_TRUE(HasJob());
}

TEST_F(CallbackTest, MayStartTheSameUpgradeThere) {
  std::uint32_t result = ICFG_TEST_FAILED;
  EXPECT_EQ(FailWith([&result] {
              StoreSystem(7);
              result = End("Upgrade");
            }),
            ICFG_TEST_FAILED);
  EXPECT_EQ(result, ICFG_OK);
  EXPECT_TRUE(AwaitTheEnd());
  EXPECT_EQ(received(), 3) << "the begin and the end of the one that was started";
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

}  // namespace
}  // namespace configlet
