// Files and folders of a delete list, and what a save list keeps of them.
#include "upgrade/engine/cleanup_test.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <string>
#include <vector>

#include "faults/faults.h"

namespace upgrade {
namespace {

using test::AttributesOf;
using test::Exists;
using test::PutFile;
using test::SetAttributesOf;

// ---- one file ----

TEST_F(CleanupTest, DeletesAFileThatIsNamed) {
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\Temp\\b.txt", "b");
  Delete("\\Temp\\a.txt");
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
  EXPECT_TRUE(Exists("\\Temp\\b.txt"));
}

TEST_F(CleanupTest, DeletesANamedFileThatIsAlsoToBeSaved) {
  PutFile("\\Temp\\a.txt", "a");
  job().AddFileSave("\\Temp\\a.txt");
  Delete("\\Temp\\a.txt");
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
}

TEST_F(CleanupTest, DeletesTheFilesThatAreNamedInTheirOrder) {
  PutFile("\\a.txt", "a");
  PutFile("\\b.txt", "b");
  job().AddFileDelete("\\b.txt");
  job().AddFileDelete("\\a.txt");
  device().faults().Add({"DeleteFileW", 2, 1, ERROR_SHARING_VIOLATION});
  CleanUpDevice(job());
  EXPECT_FALSE(Exists("\\b.txt"));
  EXPECT_TRUE(Exists("\\a.txt"));
}

TEST_F(CleanupTest, TakesAFileWithoutADotForAFileBelowAFolderWithOne) {
  PutFile("\\My.App\\noextension", "a");
  Delete("\\My.App\\noextension");
  EXPECT_FALSE(Exists("\\My.App\\noextension"));
}

TEST_F(CleanupTest, DeletesReadOnlyHiddenAndSystemFiles) {
  constexpr std::uint32_t kAll =
      FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM | kTemporary;
  for (const std::uint32_t mask :
       {std::uint32_t{FILE_ATTRIBUTE_READONLY}, kAll, std::uint32_t{FILE_ATTRIBUTE_HIDDEN}}) {
    PutFile("\\a.txt", "a");
    PutFile("\\Temp\\a.txt", "a");
    SetAttributesOf("\\a.txt", mask);
    SetAttributesOf("\\Temp\\a.txt", mask);
    Delete("\\a.txt");
    Delete("\\Temp");
    EXPECT_FALSE(Exists("\\a.txt")) << mask;
    EXPECT_FALSE(Exists("\\Temp\\a.txt")) << mask;
  }
}

TEST_F(CleanupTest, ClearsNoAttributesUnlessTheyAreInTheWay) {
  PutFile("\\Temp\\hidden.txt", "a");
  SetAttributesOf("\\Temp\\hidden.txt", FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_ARCHIVE);
  device().faults().Add({"DeleteFileW", 1, 0, ERROR_SHARING_VIOLATION});
  Delete("\\Temp");
  EXPECT_EQ(AttributesOf("\\Temp\\hidden.txt"), FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_ARCHIVE);
  EXPECT_EQ(device().faults().Count("DeleteFileW"), 1U) << "and asks once";
}

TEST_F(CleanupTest, KeepsOtherAttributesOfAReadOnlyFileThatCannotBeDeletedAtAll) {
  PutFile("\\a.txt", "a");
  SetAttributesOf("\\a.txt",
                  FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_SYSTEM | FILE_ATTRIBUTE_ARCHIVE);
  device().faults().Add({"DeleteFileW", 1, 0, ERROR_ACCESS_DENIED});
  Delete("\\a.txt");
  EXPECT_EQ(AttributesOf("\\a.txt"), std::uint32_t{FILE_ATTRIBUTE_ARCHIVE});
  EXPECT_EQ(device().faults().Count("DeleteFileW"), 2U) << "once more and then never again";
}

TEST_F(CleanupTest, PassesOverWhatIsNotThereOrCannotBeDeleted) {
  MakeRomFile(device(), "\\rom.txt");
  for (const char* path : {"\\none.txt", "\\None\\none.txt", "\\None", "\\rom.txt", "..", "\\..",
                           "\\Temp\\..\\x", "\\*.txt", "\\Te*", "\\a|b", "\\a.b|c"}) {
    Delete(path);
  }
  EXPECT_TRUE(Exists("\\rom.txt"));
}

TEST_F(CleanupTest, LooksForAFileBeforeItDeletesIt) {
  Delete("\\none.txt");
  EXPECT_EQ(device().faults().Count("DeleteFileW"), 0U);
}

TEST_F(CleanupTest, AsksForNothingWhenNothingIsNamed) {
  PutFile("\\a.txt", "a");
  const std::uint64_t before = device().faults().Count("*");
  DeletePath(nullptr, job());
  DeletePath("", job());
  EXPECT_EQ(device().faults().Count("*"), before);
  job().AddFileDelete("");
  job().AddFileDelete(nullptr);
  CleanUpDevice(job());
  EXPECT_TRUE(Exists("\\a.txt")) << "an empty entry is not the whole device";
}

// ---- a folder ----

TEST_F(CleanupTest, EmptiesAFolderAndAllBelowItAndLeavesTheFolders) {
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\Temp\\noextension", "a");
  PutFile("\\Temp\\Sub\\Deeper\\b.txt", "b");
  PutFile("\\Temp\\Sub\\c.txt", "c");
  PutFile("\\Temporary.txt", "stays");
  PutFile("\\Temporary\\d.txt", "stays");

  Delete("\\Temp");

  for (const char* path : {"\\Temp\\a.txt", "\\Temp\\noextension", "\\Temp\\Sub\\Deeper\\b.txt",
                           "\\Temp\\Sub\\c.txt"}) {
    EXPECT_FALSE(Exists(path)) << path;
  }
  EXPECT_TRUE(Exists("\\Temp\\Sub\\Deeper")) << "folders are never removed";
  EXPECT_TRUE(Exists("\\Temporary.txt"));
  EXPECT_TRUE(Exists("\\Temporary\\d.txt"));
}

TEST_F(CleanupTest, TakesAFileWithoutADotForAFolder) {
  PutFile("\\Temp\\noextension", "a");
  Delete("\\Temp\\noextension");
  EXPECT_TRUE(Exists("\\Temp\\noextension"));
}

TEST_F(CleanupTest, TakesAFolderWithADotForAFileAndNeverEmptiesIt) {
  PutFile("\\My.App\\a.txt", "a");
  PutFile("\\Temp\\My.App\\a.txt", "a");
  PutFile("\\Temp\\My.App\\Sub\\a.txt", "a");
  PutFile("\\Temp\\b.txt", "b");
  SetAttributesOf("\\My.App", FILE_ATTRIBUTE_READONLY);
  Delete("\\My.App");
  Delete("\\My.App\\Sub");
  Delete("\\Temp");
  EXPECT_TRUE(Exists("\\My.App\\a.txt"));
  EXPECT_TRUE((AttributesOf("\\My.App") & FILE_ATTRIBUTE_READONLY) != 0);
  EXPECT_TRUE(Exists("\\Temp\\My.App\\a.txt")) << "also not when it is met on the way";
  EXPECT_TRUE(Exists("\\Temp\\My.App\\Sub\\a.txt"));
  EXPECT_FALSE(Exists("\\Temp\\b.txt"));
}

TEST_F(CleanupTest, FindsAFolderInAnyLetterCaseAndWithManyBackslashes) {
  PutFile("\\Temp\\Sub\\a.txt", "a");
  Delete("\\TEMP\\\\sub");
  EXPECT_FALSE(Exists("\\Temp\\Sub\\a.txt"));
}

TEST_F(CleanupTest, GoesOnAfterAFileThatCannotBeDeleted) {
  for (const char* path : {"\\Temp\\a", "\\Temp\\b", "\\Temp\\c"}) PutFile(path, "x");
  HANDLE const open = CreateFileW(TEXT("\\Temp\\b"), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                  OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  Delete("\\Temp");
  EXPECT_FALSE(Exists("\\Temp\\a"));
  EXPECT_TRUE(Exists("\\Temp\\b"));
  EXPECT_FALSE(Exists("\\Temp\\c"));
  CloseHandle(open);
}

TEST_F(CleanupTest, LeavesFilesInRom) {
  MakeRomFile(device(), "\\Windows\\core.dll");
  PutFile("\\Windows\\own.dll", "own");
  Delete("\\Windows");
  EXPECT_TRUE(Exists("\\Windows\\core.dll"));
  EXPECT_FALSE(Exists("\\Windows\\own.dll"));
  EXPECT_EQ(device().faults().Count("DeleteFileW"), 1U) << "and does not even ask for them";
}

TEST_F(CleanupTest, ReadsALongSaveListOnceForThousandsOfFiles) {
  constexpr int kFiles = 3000;
  constexpr int kSaved = 1000;
  const auto name = [](int i) {
    return "d" + std::to_string(i % 60) + "\\file" + std::to_string(i) + ".bin";
  };
  for (int i = 0; i < kFiles; ++i) PutFile("\\Temp\\" + name(i), "x");
  for (int i = 0; i < kSaved; ++i) {
    job().AddFileSave(("\\TEMP\\" + name(i * (kFiles / kSaved))).c_str());
  }
  job().AddFileDelete("\\Temp");
  job().AddFileDelete("\\");

  CleanUpDevice(job());

  int left = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(Root())) {
    left += entry.is_regular_file() ? 1 : 0;
  }
  EXPECT_EQ(left, kSaved);
  for (int i = 0; i < kFiles; i += kFiles / kSaved) EXPECT_TRUE(Exists("\\Temp\\" + name(i))) << i;
  EXPECT_LE(device().faults().Count("MultiByteToWideChar"), kSaved + 10U);
  EXPECT_LE(device().faults().Count("CharLowerBuffW"), kSaved + kFiles + kSaved)
      << "once for an entry and once for a file that is met";
}

// ---- what is saved ----

TEST_F(CleanupTest, KeepsSavedFilesInWhateverLetterCase) {
  PutFile("\\Temp\\Keep.txt", "a");
  PutFile("\\Temp\\Sub\\keep.txt", "a");
  PutFile("\\Temp\\keep.txt.bak", "a");
  job().AddFileSave("\\TEMP\\keep.TXT");
  job().AddFileSave("\\Temp\\Sub\\keep.txt");
  Delete("\\Temp");
  EXPECT_TRUE(Exists("\\Temp\\Keep.txt"));
  EXPECT_TRUE(Exists("\\Temp\\Sub\\keep.txt"));
  EXPECT_FALSE(Exists("\\Temp\\keep.txt.bak")) << "whole paths are compared";
}

TEST_F(CleanupTest, ComparesTheLetterCaseOfAllLettersThatTheDeviceKnows) {
  PutWide(u"\\\u00C4rger.txt");
  job().AddFileSave("\\\xE4RGER.txt");
  Delete("\\");
  EXPECT_TRUE(ExistsWide(u"\\\u00C4rger.txt"));
}

TEST_F(CleanupTest, KeepsASavedFileOfTheRoot) {
  PutFile("\\keep.txt", "a");
  PutFile("\\other.txt", "a");
  job().AddFileSave("\\keep.txt");
  Delete("\\");
  EXPECT_TRUE(Exists("\\keep.txt"));
  EXPECT_FALSE(Exists("\\other.txt"));
}

TEST_F(CleanupTest, KeepsNothingOfAFolderNamedWithABackslashAtItsEnd) {
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\Temp\\Sub\\b.txt", "a");
  PutFile("\\Temp\\c.txt", "a");
  job().AddFileSave("\\Temp\\a.txt");
  job().AddFileSave("\\Temp\\Sub\\b.txt");
  job().AddFileSave("\\Temp\\\\c.txt");
  Delete("\\Temp\\");
  EXPECT_FALSE(Exists("\\Temp\\a.txt")) << "its path is \\Temp\\\\a.txt here";
  EXPECT_FALSE(Exists("\\Temp\\Sub\\b.txt"));
  EXPECT_TRUE(Exists("\\Temp\\c.txt"));
}

TEST_F(CleanupTest, KeepsNothingOfAFolderThatIsWrittenInAnotherWayThanTheSaveList) {
  for (const char* folder :
       {"\\Temp\\Sub\\", "\\Temp\\\\Sub", "\\\\Temp", "Temp", "Temp\\Sub", "\\\\"}) {
    PutFile("\\Temp\\Sub\\a.txt", "a");
    job().AddFileSave("\\Temp\\Sub\\a.txt");
    Delete(folder);
    EXPECT_FALSE(Exists("\\Temp\\Sub\\a.txt")) << folder;
  }
}

TEST_F(CleanupTest, FindsEachEntryOfASaveListInWhateverOrderTheyStand) {
  const std::vector<std::string> names = {"b", "a", "ab", "a b", "B.txt", "c", "aa", "bb", "ba"};
  for (const std::string& name : names) {
    PutFile("\\Temp\\" + name, "x");
    PutFile("\\Temp\\" + name + "x", "x");
    job().AddFileSave(("\\Temp\\" + name).c_str());
    job().AddFileSave(("\\Temp\\" + name).c_str());
  }
  Delete("\\Temp");
  for (const std::string& name : names) {
    EXPECT_TRUE(Exists("\\Temp\\" + name)) << name;
    EXPECT_FALSE(Exists("\\Temp\\" + name + "x")) << name;
  }
}

TEST_F(CleanupTest, KeepsASavedFileOfTheGreatestLength) {
  const std::string longest = "\\Temp\\" + std::string(259 - 6, 'n');
  PutFile(longest, "a");
  job().AddFileSave((longest + "n").c_str());
  Delete("\\Temp");
  EXPECT_FALSE(Exists(longest)) << "no entry is cut to another one";
  PutFile(longest, "a");
  job().AddFileSave(longest.c_str());
  Delete("\\Temp");
  EXPECT_TRUE(Exists(longest));
}

TEST_F(CleanupTest, SavesNothingForEntriesThatNameNoFile) {
  PutFile("\\Temp\\a.txt", "a");
  job().AddFileSave("");
  job().AddFileSave(nullptr);
  job().AddFileSave("\\Temp");
  job().AddFileSave("\\Temp\\*.*");
  job().AddFileSave(std::string(5000, 'x').c_str());
  Delete("\\Temp");
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
}

}  // namespace
}  // namespace upgrade
