// The end of "Upgrade": what is checked, in which order, and what a failure does.
#include "configlet/start_up_test.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "power/power.h"

namespace configlet {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

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

TEST_F(StartUpTest, DoesNotUpgradeUntestedWhenATestHasBeenLost) {
  StoreSystem(7);
  Fill();
  for (int i = 0; i < 8; ++i) FillTest("7", "");  // as many as a list begins with room for
  Begin("Registry");
  Set("Key", "Software\\None");
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  End("Registry");
  device().faults().Clear();
  ASSERT_EQ(job().RegistryTests().size(), 8U);
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

TEST_F(StartUpTest, DoesNothingWithoutAJob) {
  Begin("Upgrade");
  device().power().SetStatus(0, 4, 1);
  ForgetLog();

  EXPECT_EQ(EndUpgrade(), ICFG_OK);

  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(Log(), "");
  EXPECT_EQ(took().count(), 0);
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
