// What the platform's process calls do, seen through the platform alone.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <vector>

#include "conformance/differences.h"
#include "conformance/target.h"
#include "conformance/wide_text.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;
using conformance::WideText;

constexpr DWORD kPoison = 0xBDBDBDBD;
constexpr BYTE kPoisonByte = 0xBD;

std::vector<WideText> RunningPrograms() {
  std::vector<WideText> names;
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS | TH32CS_SNAPNOHEAPS, 0);
  PROCESSENTRY32 entry = {};
  entry.dwSize = sizeof entry;
  for (BOOL more = Process32First(snapshot, &entry); more; more = Process32Next(snapshot, &entry)) {
    names.emplace_back(entry.szExeFile);
  }
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NO_MORE_FILES});
  CloseToolhelp32Snapshot(snapshot);
  return names;
}

TEST(CreateToolhelp32SnapshotTest, ListsTheCallingProcess) {
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  ASSERT_NE(snapshot, INVALID_HANDLE_VALUE);
  PROCESSENTRY32 entry = {};
  entry.dwSize = sizeof entry;
  bool found = false;
  for (BOOL more = Process32First(snapshot, &entry); more; more = Process32Next(snapshot, &entry)) {
    found = found || entry.th32ProcessID == GetCurrentProcessId();
  }
  EXPECT_TRUE(found);
  EXPECT_TRUE(CloseToolhelp32Snapshot(snapshot));
  EXPECT_FALSE(CloseToolhelp32Snapshot(snapshot)) << "closed already";
}

TEST(Process32FirstTest, RefusesARecordThatIsTooSmallAndWritesNothing) {
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  PROCESSENTRY32 entry;
  std::memset(&entry, kPoisonByte, sizeof entry);
  entry.dwSize = sizeof entry - 1;
  SetLastError(kPoison);

  EXPECT_FALSE(Process32First(snapshot, &entry));

  EXPECT_EQ(GetLastError(), DWORD{ERROR_INSUFFICIENT_BUFFER});
  EXPECT_EQ(entry.th32ProcessID, kPoison);
  CloseToolhelp32Snapshot(snapshot);
}

TEST(Process32FirstTest, FillsTheRecordAndNothingBehindIt) {
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  struct {
    PROCESSENTRY32 entry;
    std::array<BYTE, 8> behind;
  } guarded;
  std::memset(&guarded, kPoisonByte, sizeof guarded);
  guarded.entry.dwSize = sizeof guarded.entry;

  ASSERT_TRUE(Process32First(snapshot, &guarded.entry));

  EXPECT_EQ(guarded.entry.dwSize, sizeof guarded.entry);
  EXPECT_NE(guarded.entry.szExeFile[0], 0);
  for (const BYTE byte : guarded.behind) EXPECT_EQ(byte, kPoisonByte);
  CloseToolhelp32Snapshot(snapshot);
}

/// The record that some platforms insist on.
STARTUPINFOW Startup() {
  STARTUPINFOW startup = {};
  startup.cb = sizeof startup;
  return startup;
}

TEST(CreateProcessWTest, FailsForAProgramThatDoesNotExist) {
  STARTUPINFOW startup = Startup();
  PROCESS_INFORMATION information;
  std::memset(&information, kPoisonByte, sizeof information);
  SetLastError(kPoison);

  EXPECT_FALSE(CreateProcessW(TEXT("\\none.exe"), nullptr, nullptr, nullptr, FALSE, 0, nullptr,
                              nullptr, &startup, &information));

  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
  if (Differs(Difference::kNoProgram)) return;
  EXPECT_FALSE(CreateProcessW(nullptr, nullptr, nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                              &startup, &information));
}

TEST(CreateProcessWTest, GivesHandlesThatCanBeWaitedFor) {
  conformance::MakeProgram(TEXT("\\done.exe"));
  WCHAR command_line[] = TEXT("-x");
  STARTUPINFOW startup = Startup();
  PROCESS_INFORMATION information = {};

  ASSERT_TRUE(CreateProcessW(TEXT("\\done.exe"), command_line, nullptr, nullptr, FALSE, 0, nullptr,
                             nullptr, &startup, &information));

  EXPECT_NE(information.dwProcessId, GetCurrentProcessId());
  EXPECT_EQ(WaitForSingleObject(information.hProcess, INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(information.hThread, INFINITE), WAIT_OBJECT_0);
  DWORD exit_code = kPoison;
  EXPECT_TRUE(GetExitCodeProcess(information.hProcess, &exit_code));
  EXPECT_EQ(exit_code, 0U);
  EXPECT_TRUE(CloseHandle(information.hThread));
  EXPECT_TRUE(CloseHandle(information.hProcess));
  for (const WideText& name : RunningPrograms()) EXPECT_NE(name, TEXT("done.exe"));
}

TEST(OpenProcessTest, FailsForAnIdThatNobodyHas) {
  EXPECT_EQ(OpenProcess(PROCESS_TERMINATE, FALSE, 0xDEADBEEC), nullptr);
}

TEST(GetExitCodeProcessTest, FailsForWhatIsNoProcess) {
  DWORD exit_code = kPoison;

  EXPECT_FALSE(GetExitCodeProcess(nullptr, &exit_code));
  if (!Differs(Difference::kPseudoHandle)) {
    EXPECT_FALSE(GetExitCodeProcess(INVALID_HANDLE_VALUE, &exit_code));
  }

  EXPECT_EQ(exit_code, kPoison);
}

TEST(TerminateProcessTest, FailsForWhatIsNoProcess) {
  const HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  ASSERT_NE(event, nullptr);
  SetLastError(kPoison);

  EXPECT_FALSE(TerminateProcess(event, 1));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_HANDLE});
  EXPECT_TRUE(CloseHandle(event)) << "the handle is still good";

  EXPECT_FALSE(TerminateProcess(nullptr, 1));
}

}  // namespace
