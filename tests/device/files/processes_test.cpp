#include "process/processes.h"

#include <gtest/gtest.h>

#include <string>

#include "device/file.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
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

TEST_F(ProcessesTest, AreNotTakenForThoseWhoseNamesBeginAlike) {
  const std::string longest(259, 'p');
  device().processes().Add(std::u16string(longest.begin(), longest.end()));
  EXPECT_NE(file_.FindProcess(longest.c_str()), 0U);
  const std::string longer = longest + "q";
  EXPECT_EQ(file_.FindProcess(longer.c_str()), 0U);
  EXPECT_FALSE(file_.StopProcess(longer.c_str()));
  EXPECT_EQ(file_.RunProcess(longer.c_str(), "", INFINITE), 0xFFFFFFFFU);
  EXPECT_TRUE(file_.StopProcess(longest.c_str()));
}

TEST_F(ProcessesTest, AreNotRunWithParametersThatDoNotFit) {
  EXPECT_EQ(file_.RunProcess("quick.exe", std::string(300, 'x').c_str(), INFINITE), 0xFFFFFFFFU);
  EXPECT_TRUE(device().processes().Launches().empty());
  EXPECT_EQ(file_.RunProcess("quick.exe", std::string(299, 'x').c_str(), INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(device().processes().Launches().front().command_line, std::string(299, 'x'));
}

TEST_F(ProcessesTest, AreNotRunAndLeaveNothingOpenWhenTheStartFails) {
  const std::size_t before = device().kernel().OpenHandles();
  for (const char* call : {"CreateProcessW", "MultiByteToWideChar"}) {
    for (std::uint64_t nth = 1;; ++nth) {
      const std::uint64_t fired = device().faults().fired();
      device().faults().Add({call, nth, 1, ERROR_NOT_ENOUGH_MEMORY});
      const std::uint32_t result = file_.RunProcess("quick.exe", "-a", INFINITE);
      const bool has_failed = device().faults().fired() != fired;
      device().faults().Clear();
      EXPECT_EQ(result, has_failed ? 0xFFFFFFFFU : WAIT_OBJECT_0) << call << nth;
      EXPECT_EQ(device().kernel().OpenHandles(), before) << call << nth;
      if (!has_failed) break;
    }
  }
}

TEST_F(ProcessesTest, AreLetGoOfWhenTheyCannotBeWaitedFor) {
  const std::size_t before = device().kernel().OpenHandles();
  device().faults().Add({"WaitForSingleObject", 1, 1, ERROR_INVALID_HANDLE});
  EXPECT_EQ(file_.RunProcess("quick.exe", "-a", INFINITE), WAIT_FAILED);
  EXPECT_EQ(device().kernel().OpenHandles(), before) << "although the program still runs";
  EXPECT_EQ(device().processes().Launches().size(), 1U);
}

TEST_F(ProcessesTest, LeaveNoHandlesOpen) {
  const std::size_t before = device().kernel().OpenHandles();
  file_.RunProcess("quick.exe", "", 100);
  file_.StopProcess("Scanner.exe");
  device().faults().Add({"TerminateProcess", 1, 1, 0});
  file_.StopProcess("Scanner.exe");
  EXPECT_EQ(device().kernel().OpenHandles(), before);
}

}  // namespace
}  // namespace device
