// Programs that are ended before files are deleted, and calls that fail on the way.
#include <gmock/gmock.h>

#include <string>

#include "ce/kernel.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "product_support/host.h"
#include "product_support/log_lines.h"
#include "upgrade/engine/cleanup_test.h"

namespace upgrade {
namespace {

using test::Exists;
using test::PutFile;
using test::SetAttributesOf;
using ::testing::ElementsAre;

// ---- programs ----

TEST_F(CleanupTest, StopsTheFirstProgramOfEachName) {
  job().AddStopProcess("Scanner.exe");
  job().AddStopProcess("sync.exe");
  CleanUpDevice(job());
  EXPECT_THAT(Running(), ElementsAre("host.exe", "shell32.exe", "Scanner.exe"));
  CleanUpDevice(job());
  EXPECT_THAT(Running(), ElementsAre("host.exe", "shell32.exe"));
}

TEST_F(CleanupTest, StopsTheProgramsInTheOrderOfTheList) {
  job().AddStopProcess("sync.exe");
  job().AddStopProcess("shell32.exe");
  device().faults().Add({"TerminateProcess", 2, 1, ERROR_ACCESS_DENIED});
  CleanUpDevice(job());
  EXPECT_THAT(Running(), ElementsAre("host.exe", "shell32.exe", "Scanner.exe", "Scanner.exe"));
}

TEST_F(CleanupTest, EndsAProgramWithTheCodeOfSuccess) {
  HANDLE const program = OpenProcess(0, FALSE, device().processes().List().back().id);
  ASSERT_NE(program, nullptr);
  job().AddStopProcess("sync.exe");
  CleanUpDevice(job());
  DWORD code = STILL_ACTIVE;
  EXPECT_TRUE(GetExitCodeProcess(program, &code));
  EXPECT_EQ(code, 0U);
  CloseHandle(program);
}

TEST_F(CleanupTest, StopsNoProgramOfAnotherLetterCaseOrALongerName) {
  job().AddStopProcess("SCANNER.EXE");
  job().AddStopProcess("Scanner");
  job().AddStopProcess("Scanner.exe2");
  job().AddStopProcess("");
  job().AddStopProcess(nullptr);
  CleanUpDevice(job());
  EXPECT_EQ(Running().size(), 5U);
}

TEST_F(CleanupTest, StopsNoProgramWhoseNameIsTheBeginningOfALongerOne) {
  const std::string name(259, 'p');
  device().processes().Add(std::u16string(name.begin(), name.end()));
  job().AddStopProcess((name + "q").c_str());
  CleanUpDevice(job());
  EXPECT_EQ(Running().size(), 6U);
  job().AddStopProcess(name.c_str());
  CleanUpDevice(job());
  EXPECT_EQ(Running().size(), 5U);
}

TEST_F(CleanupTest, DeletesFilesWhateverTheStopsAchieved) {
  PutFile("\\a.txt", "a");
  PutFile("\\b.txt", "a");
  for (const char* name : {"none.exe", "host.exe", "Scanner.exe"}) job().AddStopProcess(name);
  for (const char* path : {"\\none.txt", "\\a.txt", "\\None", "\\b.txt"}) job().AddFileDelete(path);
  device().faults().Add({"TerminateProcess", 2, 1, ERROR_ACCESS_DENIED});

  CleanUpDevice(job());

  EXPECT_EQ(Running().size(), 5U);
  EXPECT_FALSE(Exists("\\a.txt"));
  EXPECT_FALSE(Exists("\\b.txt"));
}

TEST_F(CleanupTest, StopsProgramsBeforeItDeletesFiles) {
  PutFile("\\a.txt", "a");
  job().AddStopProcess("Scanner.exe");
  job().AddFileDelete("\\a.txt");
  device().faults().Add({"TerminateProcess", 1, 1, 0});
  device().faults().Add({"DeleteFileW", 1, 1, 0});
  CleanUpDevice(job());
  EXPECT_EQ(device().faults().last_fired(), "DeleteFileW");
}

TEST_F(CleanupTest, SaysNothing) {
  PutFile("\\Temp\\a.txt", "a");
  job().AddStopProcess("Scanner.exe");
  job().AddFileDelete("\\Temp");
  CleanUpDevice(job());
  EXPECT_EQ(test::ReadLog(), "");
}

// ---- failures ----

TEST_F(CleanupTest, DeletesNothingOfAFolderWithoutMemory) {
  job().AddFileSave("\\Temp\\keep.txt");
  job().AddFileDelete("\\Temp");
  job().AddFileDelete("\\b.txt");
  for (const std::uint64_t spared : {0U, 1U, 2U}) {  // the work area, the save list's two blocks
    PutFile("\\Temp\\a.txt", "a");
    PutFile("\\b.txt", "b");
    device().faults().Add({"LocalAlloc", spared + 1, 0, ERROR_OUTOFMEMORY});
    CleanUpDevice(job());
    EXPECT_TRUE(device().faults().fired() > 0) << spared;
    device().faults().Clear();
    EXPECT_TRUE(Exists("\\Temp\\a.txt")) << spared;
    EXPECT_FALSE(Exists("\\b.txt")) << spared;
  }
}

TEST_F(CleanupTest, DeletesNothingOfAFolderWhenTheSaveListCannotBeConverted) {
  PutFile("\\Temp\\a.txt", "a");
  job().AddFileSave("\\Temp\\keep.txt");
  job().AddFileSave("\\Temp\\other.txt");
  job().AddFileDelete("\\Temp");
  for (const std::uint64_t nth : {2U, 3U}) {  // behind the folder's name
    device().faults().Add({"MultiByteToWideChar", nth, 1, 0});
    CleanUpDevice(job());
    device().faults().Clear();
    EXPECT_TRUE(Exists("\\Temp\\a.txt")) << nth;
  }
  CleanUpDevice(job());
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
}

TEST_F(CleanupTest, DeletesNoFileOfAFolderWhenThereWasNoMemoryForTheSaveList) {
  PutFile("\\Temp\\keep.txt", "a");
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\b.txt", "a");
  for (std::uint64_t nth = 1; nth <= 2; ++nth) {  // the entry's text, the list's room
    UpgradeConfig lost;
    device().faults().Add({"LocalAlloc", nth, 1, ERROR_OUTOFMEMORY});
    lost.AddFileSave("\\Temp\\keep.txt");
    device().faults().Clear();
    lost.AddFileDelete("\\Temp");
    lost.AddFileDelete("\\b.txt");
    CleanUpDevice(lost);
    EXPECT_TRUE(Exists("\\Temp\\keep.txt")) << nth;
    EXPECT_TRUE(Exists("\\Temp\\a.txt")) << nth;
    EXPECT_FALSE(Exists("\\b.txt")) << "a file that is named was never to be saved";
  }
}

TEST_F(CleanupTest, NeitherLosesASavedFileNorLeaksWhicheverCallFails) {
  job().AddStopProcess("none.exe");
  job().AddFileDelete("\\Temp");
  job().AddFileDelete("\\");
  job().AddFileSave("\\temp\\keep.txt");
  job().AddFileSave("\\temp\\sub\\keep.txt");
  std::uint64_t fired = 1;
  for (std::uint64_t nth = 1; fired > 0; ++nth) {
    ASSERT_LT(nth, 1000U);
    for (const char* path : {"\\Temp\\a.txt", "\\Temp\\keep.txt", "\\Temp\\Sub\\keep.txt",
                             "\\Temp\\Sub\\b.txt", "\\Storage Card\\c.txt", "\\z.txt"}) {
      PutFile(path, "x");
    }
    SetAttributesOf("\\Temp\\a.txt", FILE_ATTRIBUTE_READONLY);
    const test::Holdings before = test::HoldingsOf(device());
    const std::uint64_t fired_before = device().faults().fired();
    device().faults().Add({"*", nth, 1, 0});

    CleanUpDevice(job());

    fired = device().faults().fired() - fired_before;
    const std::string call = device().faults().last_fired();
    device().faults().Clear();
    EXPECT_TRUE(Exists("\\Temp\\keep.txt")) << nth << call;
    EXPECT_TRUE(Exists("\\Temp\\Sub\\keep.txt")) << nth << call;
    EXPECT_TRUE(Exists("\\Storage Card\\c.txt")) << nth << call;
    EXPECT_EQ(test::HoldingsOf(device()), before) << nth << call;
    EXPECT_EQ(device().memory().bad_frees(), 0U);
    if (Exists("\\Temp\\a.txt")) SetAttributesOf("\\Temp\\a.txt", FILE_ATTRIBUTE_NORMAL);
  }
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
  EXPECT_FALSE(Exists("\\Temp\\Sub\\b.txt"));
  EXPECT_FALSE(Exists("\\z.txt"));
}

}  // namespace
}  // namespace upgrade
