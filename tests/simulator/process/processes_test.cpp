#include "process/processes.h"

#include <gtest/gtest.h>
#include <sys/types.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "device/device.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "process/host_program.h"
#include "storage/storage.h"
#include "support/device_test.h"
#include "world/world.h"

namespace {

constexpr DWORD kLong = 600'000;

sim::Profile DeviceWithPrograms() {
  sim::Profile profile;
  profile.processes = {{"Browser.exe"}, {"Shell.exe"}, {"Browser.exe"}};
  profile.programs["wait.exe"] = {"", 7, 5000};
  profile.programs["now.exe"] = {"", 3, 0};
  profile.programs["soon.exe"] = {"", 4, 20};
  profile.programs["write.exe"] = {
      "printf '%s' \"$ORVENIX_COMMAND_LINE\" > \"$ORVENIX_DEVICE/storage/out.txt\"; "
      "echo said; exit 9",
      0, 2000};
  profile.programs["read.exe"] = {"cat; exit 0", 0, 0};
  profile.programs["killed.exe"] = {"kill -TERM $$", 0, 0};
  profile.programs["endless.exe"] = {"echo $$ > \"$ORVENIX_DEVICE/pid\"; sleep 600 & sleep 600", 0,
                                     0};
  return profile;
}

PROCESS_INFORMATION Start(const WCHAR* program, std::u16string command_line = {}) {
  PROCESS_INFORMATION information = {};
  EXPECT_TRUE(CreateProcessW(program, command_line.data(), nullptr, nullptr, FALSE, 0, nullptr,
                             nullptr, nullptr, &information));
  return information;
}

DWORD ExitCode(HANDLE process) {
  DWORD code = 0;
  EXPECT_TRUE(GetExitCodeProcess(process, &code));
  return code;
}

std::string TextOf(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), {}};
}

class ProcessesTest : public DeviceTest {
 protected:
  ProcessesTest() : DeviceTest(DeviceWithPrograms()) {}
  [[nodiscard]] sim::Processes& processes() { return device().processes(); }
  [[nodiscard]] std::vector<std::string> Names() {
    std::vector<std::string> names;
    for (const auto& entry : processes().List()) names.push_back(entry.name);
    return names;
  }
};

TEST_F(ProcessesTest, BeginsWithItsOwnProgramAndWhatTheProfileLists) {
  EXPECT_EQ(Names(),
            (std::vector<std::string>{"host.exe", "Browser.exe", "Shell.exe", "Browser.exe"}));
}

TEST_F(ProcessesTest, ASnapshotStaysAsItWasTaken) {
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  const std::uint32_t shell = processes().List()[2].id;
  ASSERT_TRUE(processes().Remove(shell));
  processes().Add(u"Late.exe");
  PROCESSENTRY32 entry = {};
  entry.dwSize = sizeof entry;
  std::vector<std::u16string> names;
  for (BOOL more = Process32First(snapshot, &entry); more; more = Process32Next(snapshot, &entry)) {
    names.emplace_back(entry.szExeFile);
  }

  EXPECT_EQ(names, (std::vector<std::u16string>{u"host.exe", u"Browser.exe", u"Shell.exe",
                                                u"Browser.exe"}));
  EXPECT_TRUE(CloseToolhelp32Snapshot(snapshot));
}

TEST_F(ProcessesTest, NeverGivesAnIdTwice) {
  const std::uint32_t first = processes().Add(u"A.exe");
  ASSERT_TRUE(processes().Remove(first));

  EXPECT_NE(processes().Add(u"A.exe"), first);
  EXPECT_FALSE(processes().Remove(first));
}

TEST_F(ProcessesTest, TerminatesOnlyTheProcessOfTheId) {
  const std::uint32_t second = processes().List()[3].id;
  const HANDLE process = OpenProcess(PROCESS_TERMINATE, FALSE, second);
  ASSERT_NE(process, nullptr);
  EXPECT_EQ(ExitCode(process), STILL_ACTIVE);

  ASSERT_TRUE(TerminateProcess(process, 42));

  EXPECT_EQ(ExitCode(process), 42U);
  EXPECT_EQ(WaitForSingleObject(process, 0), WAIT_OBJECT_0);
  EXPECT_EQ(Names(), (std::vector<std::string>{"host.exe", "Browser.exe", "Shell.exe"}));
  EXPECT_FALSE(TerminateProcess(process, 1)) << "it has ended";
  EXPECT_EQ(GetLastError(), DWORD{ERROR_ACCESS_DENIED});
  EXPECT_TRUE(CloseHandle(process));
}

TEST_F(ProcessesTest, DoesNotTerminateItself) {
  const HANDLE process = OpenProcess(PROCESS_TERMINATE, FALSE, sim::Kernel::process_id());

  EXPECT_FALSE(TerminateProcess(process, 1));

  EXPECT_EQ(Names()[0], "host.exe");
  CloseHandle(process);
}

TEST_F(ProcessesTest, RunsABuiltInForItsTimeOnTheWorldsClock) {
  const PROCESS_INFORMATION started = Start(TEXT("\\Windows\\WAIT.exe"));
  const auto begin = world().now();
  EXPECT_EQ(Names().back(), "WAIT.exe");

  EXPECT_EQ(WaitForSingleObject(started.hProcess, 4999), WAIT_TIMEOUT);
  EXPECT_EQ(ExitCode(started.hProcess), STILL_ACTIVE);
  EXPECT_EQ(WaitForSingleObject(started.hProcess, INFINITE), WAIT_OBJECT_0);

  EXPECT_EQ(world().now() - begin, std::chrono::seconds(5));
  EXPECT_EQ(ExitCode(started.hProcess), 7U);
  EXPECT_NE(Names().back(), "WAIT.exe");
  CloseHandle(started.hProcess);
  CloseHandle(started.hThread);
}

TEST_F(ProcessesTest, LetsTimePassForAProgramThatPollsForTheEndOfAnother) {
  const PROCESS_INFORMATION started = Start(TEXT("soon.exe"));
  int polls = 1;
  while (ExitCode(started.hProcess) == STILL_ACTIVE) ++polls;

  EXPECT_EQ(ExitCode(started.hProcess), 4U);
  EXPECT_LE(polls, 20002) << "a microsecond passes with each look";
}

TEST_F(ProcessesTest, TerminatesABuiltInBeforeItsTime) {
  const PROCESS_INFORMATION started = Start(TEXT("wait.exe"));

  ASSERT_TRUE(TerminateProcess(started.hProcess, 1));
  Sleep(10'000);

  EXPECT_EQ(ExitCode(started.hProcess), 1U) << "not the one it would have ended with";
}

TEST_F(ProcessesTest, RunsAHostCommandWithTheDevicesFolderAndTheCommandLine) {
  const PROCESS_INFORMATION started = Start(TEXT("\\write.exe"), u"/delete \"a b\" $HOME `x`");
  const auto begin = world().now();

  EXPECT_EQ(WaitForSingleObject(started.hProcess, kLong), WAIT_OBJECT_0);

  EXPECT_EQ(ExitCode(started.hProcess), 9U);
  EXPECT_EQ(world().now() - begin, std::chrono::seconds(2)) << "the profile's time";
  EXPECT_EQ(TextOf(device().folder() / "storage" / "out.txt"), "/delete \"a b\" $HOME `x`");
  EXPECT_EQ(TextOf(device().folder() / "programs.log"), "said\n");
  EXPECT_NE(GetFileAttributesW(TEXT("\\out.txt")), INVALID_FILE_ATTRIBUTES);
}

TEST_F(ProcessesTest, CountsTheRoomThatAHostCommandHasTaken) {
  ULARGE_INTEGER before = {};
  ULARGE_INTEGER after = {};
  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\"), &before, nullptr, nullptr));

  const PROCESS_INFORMATION started = Start(TEXT("\\write.exe"), u"12345");
  WaitForSingleObject(started.hProcess, INFINITE);

  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\"), &after, nullptr, nullptr));
  EXPECT_EQ(before.QuadPart - after.QuadPart, 5U);
}

TEST_F(ProcessesTest, AHostCommandHasNothingToRead) {
  const PROCESS_INFORMATION started = Start(TEXT("read.exe"));

  EXPECT_EQ(WaitForSingleObject(started.hProcess, kLong), WAIT_OBJECT_0);
  EXPECT_EQ(ExitCode(started.hProcess), 0U);
}

TEST_F(ProcessesTest, AHostCommandsSignalShowsInItsExitCode) {
  const PROCESS_INFORMATION started = Start(TEXT("killed.exe"));

  EXPECT_EQ(WaitForSingleObject(started.hProcess, kLong), WAIT_OBJECT_0);
  EXPECT_EQ(ExitCode(started.hProcess), 128U + SIGTERM);
}

TEST_F(ProcessesTest, FindsProgramsInTheStorageOrInTheProfile) {
  PROCESS_INFORMATION information = {};
  const auto start = [&information](const WCHAR* program) {
    return CreateProcessW(program, nullptr, nullptr, nullptr, FALSE, 0, nullptr, nullptr, nullptr,
                          &information);
  };
  EXPECT_FALSE(start(TEXT("\\other.exe")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\Windows"), nullptr));
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\Windows\\folder.exe"), nullptr));
  CloseHandle(CreateFileW(TEXT("\\Windows\\Other.exe"), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0,
                          nullptr));

  EXPECT_TRUE(start(TEXT("\\Windows\\OTHER.exe")));
  EXPECT_TRUE(start(TEXT("other.exe"))) << "the system's folder is looked through";
  EXPECT_FALSE(start(TEXT("\\other.exe")));
  EXPECT_FALSE(start(TEXT("folder.exe")));
  EXPECT_FALSE(start(TEXT("")));
  EXPECT_FALSE(start(TEXT("\\..\\sh")));
  EXPECT_TRUE(start(TEXT("now.exe"))) << "the profile names it";
}

TEST_F(ProcessesTest, KeepsARecordOfWhatWasStarted) {
  Start(TEXT("\\Windows\\now.exe"), u"-a \x3B1");
  Start(TEXT("wait.exe"));

  const auto launches = processes().Launches();
  ASSERT_EQ(launches.size(), 2U);
  EXPECT_EQ(launches[0].program, "\\Windows\\now.exe");
  EXPECT_EQ(launches[0].command_line, "-a \xCE\xB1");
  EXPECT_EQ(launches[1].program, "wait.exe");
  EXPECT_EQ(launches[1].command_line, "");
}

TEST_F(ProcessesTest, RefusesWhatTheDeviceDoesNotHave) {
  PROCESS_INFORMATION information = {};
  EXPECT_FALSE(CreateProcessW(TEXT("now.exe"), nullptr, nullptr, nullptr, TRUE, 0, nullptr, nullptr,
                              nullptr, &information));
  EXPECT_FALSE(CreateProcessW(TEXT("now.exe"), nullptr, nullptr, nullptr, FALSE, 0, nullptr,
                              TEXT("\\"), nullptr, &information));
  EXPECT_FALSE(CreateProcessW(TEXT("now.exe"), nullptr, nullptr, nullptr, FALSE, CREATE_SUSPENDED,
                              nullptr, nullptr, nullptr, &information));
  EXPECT_TRUE(processes().Launches().empty());
}

TEST_F(ProcessesTest, LeavesNoHandleWhenNobodyWantsOne) {
  const std::size_t before = device().kernel().OpenHandles();

  EXPECT_TRUE(CreateProcessW(TEXT("now.exe"), nullptr, nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                             nullptr, nullptr));

  EXPECT_EQ(device().kernel().OpenHandles(), before);
}

TEST_F(ProcessesTest, FailsOnOrder) {
  device().faults().Add({"CreateProcessW", 1, 1, ERROR_OUTOFMEMORY});
  device().faults().Add({"CreateToolhelp32Snapshot", 1, 1, 0});
  PROCESS_INFORMATION information = {};

  EXPECT_FALSE(CreateProcessW(TEXT("now.exe"), nullptr, nullptr, nullptr, FALSE, 0, nullptr,
                              nullptr, nullptr, &information));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_OUTOFMEMORY});
  EXPECT_EQ(CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0), INVALID_HANDLE_VALUE);
}

TEST_F(ProcessesTest, SurvivesARestartWithABuiltInStillRunning) {
  Start(TEXT("wait.exe"));

  Restart();
  Sleep(10'000);

  EXPECT_EQ(Names().size(), 4U);
}

class ProcessesThreadsTest : public RealDeviceTest {
 protected:
  ProcessesThreadsTest() : RealDeviceTest(DeviceWithPrograms()) {}

  /// The host's number of the running "endless.exe".
  pid_t HostPid() {
    const std::filesystem::path file = device().folder() / "pid";
    while (TextOf(file).find('\n') == std::string::npos) Sleep(10);
    return std::stoi(TextOf(file));
  }
};

TEST_F(ProcessesThreadsTest, SignalsTheEndOfAHostCommand) {
  const PROCESS_INFORMATION started = Start(TEXT("write.exe"), u"x");

  EXPECT_EQ(WaitForSingleObject(started.hProcess, INFINITE), WAIT_OBJECT_0);

  EXPECT_EQ(ExitCode(started.hProcess), 9U);
  CloseHandle(started.hProcess);
  CloseHandle(started.hThread);
  const PROCESS_INFORMATION again = Start(TEXT("read.exe"));
  EXPECT_EQ(WaitForSingleObject(again.hThread, INFINITE), WAIT_OBJECT_0);
}

TEST_F(ProcessesThreadsTest, TerminatesAHostCommandWithAllThatItStarted) {
  const PROCESS_INFORMATION started = Start(TEXT("endless.exe"));
  const pid_t pid = HostPid();
  EXPECT_EQ(::kill(-pid, 0), 0);

  ASSERT_TRUE(TerminateProcess(started.hProcess, 5));

  EXPECT_EQ(WaitForSingleObject(started.hProcess, INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(ExitCode(started.hProcess), 5U);
}

TEST_F(ProcessesThreadsTest, LeavesNoHostCommandBehindWhenTheDeviceEnds) {
  Start(TEXT("endless.exe"));
  const pid_t pid = HostPid();

  Restart();

  // The leader has been reaped with the device; whoever else was in the group has been killed and
  // is the host's to reap.
  EXPECT_EQ(::kill(pid, 0), -1);
  EXPECT_EQ(errno, ESRCH);
}

TEST(HostProgramTest, IsKilledAtItsLimit) {
  test::TemporaryFolder folder;
  const auto program =
      sim::HostProgram::Start({"sleep 600", "", folder.path(), std::chrono::milliseconds(1)});
  ASSERT_NE(program, nullptr);

  EXPECT_EQ(program->Wait(), sim::HostProgram::kTimedOut);
}

}  // namespace
