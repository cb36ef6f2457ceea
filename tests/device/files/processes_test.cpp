#include <gtest/gtest.h>

#include "device/file.h"
#include "faults/faults.h"
#include "support/device_test.h"

namespace device {
namespace {

class ProcessesTest : public DeviceTest {
 protected:
  static sim::Profile WithPrograms() {
    sim::Profile profile;
    profile.processes = {{"shell32.exe"}, {"Scanner.exe"}, {"Scanner.exe"}};
    sim::ProgramProfile quick;
    quick.exit_code = 3;
    quick.run_ms = 500;
    profile.programs["quick.exe"] = quick;
    return profile;
  }
  ProcessesTest() : DeviceTest(WithPrograms()) {}

  File file_;
};

TEST_F(ProcessesTest, AreFoundByTheirExactNames) {
  EXPECT_NE(file_.FindProcess("Scanner.exe"), 0U);
  EXPECT_EQ(file_.FindProcess("scanner.exe"), 0U) << "letter case counts";
  EXPECT_EQ(file_.FindProcess("Scanner"), 0U);
  EXPECT_EQ(file_.FindProcess(""), 0U);
  EXPECT_EQ(file_.FindProcess(nullptr), 0U);
}

TEST_F(ProcessesTest, StopOneAtATime) {
  const std::uint32_t first = file_.FindProcess("Scanner.exe");
  EXPECT_TRUE(file_.StopProcess("Scanner.exe"));
  const std::uint32_t second = file_.FindProcess("Scanner.exe");
  EXPECT_NE(second, 0U);
  EXPECT_NE(second, first);
  EXPECT_TRUE(file_.StopProcess("Scanner.exe"));
  EXPECT_FALSE(file_.StopProcess("Scanner.exe"));
}

TEST_F(ProcessesTest, DoNotStopWhenThePlatformRefuses) {
  device().faults().Add({"OpenProcess", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(file_.StopProcess("Scanner.exe"));
  device().faults().Add({"TerminateProcess", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(file_.StopProcess("Scanner.exe"));
  device().faults().Add({"CreateToolhelp32Snapshot", 1, 1, ERROR_GEN_FAILURE});
  EXPECT_FALSE(file_.StopProcess("Scanner.exe"));
  EXPECT_NE(file_.FindProcess("Scanner.exe"), 0U);
}

TEST_F(ProcessesTest, AreRunAndWaitedFor) {
  EXPECT_EQ(file_.RunProcess("quick.exe", "-a b", INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(file_.RunProcess("quick.exe", nullptr, 100), static_cast<std::uint32_t>(WAIT_TIMEOUT));
}

TEST_F(ProcessesTest, GiveAllBitsSetWhenNothingWasRun) {
  EXPECT_EQ(file_.RunProcess("", "-a", INFINITE), 0xFFFFFFFFU);
  EXPECT_EQ(file_.RunProcess(nullptr, nullptr, INFINITE), 0xFFFFFFFFU);
  EXPECT_EQ(file_.RunProcess("unknown.exe", "", INFINITE), 0xFFFFFFFFU);
}

}  // namespace
}  // namespace device
