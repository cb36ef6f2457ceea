// The end of "Upgrade".
#include <gmock/gmock.h>

#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "configlet/configlet_test.h"
#include "power/power.h"
#include "trace/trace.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

constexpr sim::Micros kPause = std::chrono::milliseconds(3000);

class StartUpTest : public ConfigletTest {
 protected:
  /// A job without files, for a device that has room.
  static void Fill(const char* required_space = "1") {
    Begin("Orvenix");
    Begin("Upgrade");
    Begin("Store");
    Set("Name", "\\");
    Set("RequiredSpace", required_space);
    End("Store");
    Set("ShowGUI", "false");
  }

  /// Adds a test of the value that StoreSystem stores.
  static void FillTest(const char* value, const char* message) {
    Begin("Registry");
    Set("Key", "Software\\Orvenix");
    Set("ValueName", "System");
    Set("Type", "REG_DWORD");
    Set("Operator", "EQ");
    Set("Value", value);
    Set("ErrorMsg", message);
    End("Registry");
  }
  static void StoreSystem(DWORD number) {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                    nullptr, &key, nullptr);
    RegSetValueExW(key, TEXT("System"), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&number),
                   sizeof number);
    RegCloseKey(key);
  }
  static void FillCleanup(const char* path, const char* action) {
    Begin("DiskCleanup");
    Begin("File");
    Set("Name", path);
    Set("Action", action);
    End("File");
    End("DiskCleanup");
  }

  /// Ends "Upgrade". @return its result; `took` is the time that it took.
  std::uint32_t EndUpgrade() {
    const sim::Micros start = world().now();
    const std::uint32_t result = End("Upgrade");
    took_ = world().now() - start;
    return result;
  }
  [[nodiscard]] sim::Micros took() const { return took_; }

  /// Lets the upgrade thread run to its end.
  static bool AwaitTheEnd() {
    for (int second = 0; second < 3600 && HasJob(); ++second) Sleep(1000);
    Sleep(10000);
    return !HasJob() && !upgrade::UpgradeInProgress();
  }

 private:
  sim::Micros took_{};
};

TEST_F(StartUpTest, StartsTheJobOnAThreadOfItsOwn) {
  Fill();
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_TRUE(upgrade::UpgradeInProgress()) << "until the thread is through";
  EXPECT_LT(took(), kPause);
  EXPECT_THAT(Log(), HasSubstr("Orvenix - CheckSpace\r\nOrvenix - CheckSpace, \\\r\n"
                               "Orvenix - SetTransferBytes\r\n"
                               "Orvenix - StartUpgradeThread\r\n"));
  EXPECT_TRUE(AwaitTheEnd());
  EXPECT_THAT(Log(), HasSubstr("Orvenix - UpgradeThread - Exiting\r\n"));
}

// ---- the order of the checks ----

TEST_F(StartUpTest, TestsCleansAndMeasuresInThisOrder) {
  Fill();
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_THAT(Log(), StartsWith("Orvenix - PerformTests\r\nPerformTests - 0\r\n"
                                "Orvenix - Cleanup\r\nOrvenix - CheckSpace\r\n"));
  EXPECT_TRUE(AwaitTheEnd());
}

TEST_F(StartUpTest, TouchesNothingWhenATestFails) {
  test::PutFile("\\Temp\\a.txt", "a");
  Fill();
  FillTest("7", "needs system 7");
  FillCleanup("\\Temp", "Delete");
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_TEST_FAILED);

  EXPECT_EQ(took(), kPause);
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_TRUE(HasJob());
  EXPECT_TRUE(test::Exists("\\Temp\\a.txt"));
  EXPECT_THAT(Log(), StartsWith("Orvenix - PerformTests\r\nPerformTests - 1\r\n"
                                "Orvenix - PerformTests - No such key\r\n"
                                "Orvenix - PerformTests - failed test\r\nneeds system 7\r\n"));
  EXPECT_THAT(Log(), Not(HasSubstr("Cleanup")));
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK) << "and a new attempt is accepted";
}

TEST_F(StartUpTest, FailsForATestWhoseTypeTheHostHasLeftOut) {
  StoreSystem(7);
  Fill();
  Begin("Registry");
  Set("Key", "Software\\Orvenix");
  Set("ValueName", "System");
  Set("Operator", "EQ");
  Set("Value", "7");
  End("Registry");
  EXPECT_EQ(EndUpgrade(), ICFG_TEST_FAILED);
}

TEST_F(StartUpTest, CleansTheDeviceBeforeItMeasuresTheRoom) {
  StoreSystem(7);
  test::PutFile("\\Temp\\a.bin", std::string(1000000, 'a'));
  ULARGE_INTEGER free_bytes = {};
  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\"), nullptr, nullptr, &free_bytes));
  MEMORYSTATUS memory = {};
  memory.dwLength = sizeof memory;
  GlobalMemoryStatus(&memory);
  Fill(std::to_string(free_bytes.QuadPart + memory.dwAvailPhys + 500000).c_str());
  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);

  FillTest("7", "");
  FillCleanup("\\Temp", "Delete");
  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_FALSE(test::Exists("\\Temp\\a.bin"));
  EXPECT_TRUE(AwaitTheEnd());
}

TEST_F(StartUpTest, CleansTheDeviceAlsoWhenThereIsNoRoomThen) {
  test::PutFile("\\Temp\\a.bin", "a");
  Fill("2000000000");
  FillCleanup("\\Temp\\a.bin", "Delete");
  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);
  EXPECT_FALSE(test::Exists("\\Temp\\a.bin"));
}

TEST_F(StartUpTest, NeitherTestsNorCleansWithoutPower) {
  test::PutFile("\\Temp\\a.bin", "a");
  Fill();
  FillTest("7", "");
  FillCleanup("\\Temp\\a.bin", "Delete");
  device().power().SetStatus(0, 4, 1);
  ForgetLog();
  EXPECT_EQ(EndUpgrade(), ICFG_NO_POWER);
  EXPECT_TRUE(test::Exists("\\Temp\\a.bin"));
  EXPECT_THAT(Log(), Not(HasSubstr("PerformTests")));
}

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

TEST_F(StartUpTest, DoesNothingWithoutAJob) {
  Begin("Upgrade");
  device().power().SetStatus(0, 4, 1);
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(Log(), "");
  EXPECT_EQ(took().count(), 0);
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

// ---- power ----

struct PowerCase {
  std::uint8_t ac_line;
  std::uint8_t battery_flag;
  bool met;
  const char* why;
};

TEST_F(StartUpTest, NeedsTheLineOrABatteryThatIsNotCritical) {
  static constexpr PowerCase kCases[] = {
      {1, 4, true, "on line, whatever the battery says"},
      {1, 128, true, "on line, whatever the battery says"},
      {0, 1, true, "high"},
      {0, 2, true, "low"},
      {0, 8, true, "charging"},
      {255, 1, true, "line unknown, battery high"},
      {0, 9, false, "high and charging at once: compared whole"},
      {0, 10, false, "low and charging at once"},
      {0, 4, false, "critical"},
      {0, 128, false, "no battery"},
      {0, 255, false, "unknown"},
      {0, 0, false, "between high and low"},
      {255, 255, false, "nothing known"},
      {2, 4, false, "on line is exactly 1"},
  };
  for (const PowerCase& c : kCases) {
    device().power().SetStatus(c.ac_line, c.battery_flag, 50);
    Fill("4000000000");  // no room: power alone decides which code comes
    ForgetLog();

    EXPECT_EQ(EndUpgrade(), c.met ? ICFG_NO_SPACE : ICFG_NO_POWER)
        << int{c.ac_line} << '/' << int{c.battery_flag} << ": " << c.why;

    EXPECT_EQ(took(), kPause);
    EXPECT_FALSE(upgrade::UpgradeInProgress());
    EXPECT_EQ(Log().find("CheckSpace") != std::string::npos, c.met);
    delete &job();
    TheWalk().job = nullptr;
  }
}

TEST_F(StartUpTest, CountsAPowerStatusThatCannotBeReadAsUnmet) {
  Fill();
  device().faults().Add({"GetSystemPowerStatusEx", 1, 1, 0});

  EXPECT_EQ(EndUpgrade(), ICFG_NO_POWER);
  EXPECT_EQ(took(), kPause);
}

// ---- space ----

TEST_F(StartUpTest, NeedsRoom) {
  Fill("2000000000");
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);

  EXPECT_EQ(took(), kPause);
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_TRUE(HasJob());
  EXPECT_THAT(Log(), Not(HasSubstr("SetTransferBytes")));
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK) << "and a new attempt is accepted";
}

TEST_F(StartUpTest, HasNoRoomForAJobWithoutRequirements) {
  Begin("Orvenix");
  Begin("Upgrade");

  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);
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

// ---- syslog ----

TEST_F(StartUpTest, SetsUpSyslogBetweenPowerAndSpace) {
  Fill("4000000000");
  Set("Address", "127.0.0.2");
  Set("Port", "514");
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_NO_SPACE);

  EXPECT_EQ(Log(), "") << "the lines from the space check on go to the server";
}

TEST_F(StartUpTest, KeepsTheFormerLogWhenPowerIsMissing) {
  Fill();
  Set("Address", "127.0.0.2");
  Set("Port", "514");
  device().power().SetStatus(0, 4, 1);
  EndUpgrade();
  ForgetLog();

  Begin("Syslog");

  EXPECT_EQ(Log(), "IcfgBeginGroup - Syslog\r\n");
}

}  // namespace
}  // namespace configlet
