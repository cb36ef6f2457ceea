// Programs are ended and files deleted before new files arrive.
#include "upgrade/cleanup.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "process/processes.h"
#include "product_support/host.h"
#include "product_support/jobs.h"
#include "product_support/log_lines.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

using test::AttributesOf;
using test::Exists;
using test::PutFile;
using test::SetAttributesOf;
using ::testing::ElementsAre;

constexpr std::uint32_t kTemporary = FILE_ATTRIBUTE_TEMPORARY;

class CleanupTest : public DeviceTest {
 protected:
  explicit CleanupTest(const sim::Profile& profile = WithVolumes())
      : DeviceTest(profile), job_(std::make_unique<UpgradeConfig>()) {
    test::SetTypeAndFamily(*job_, "M", "R");
  }

  static sim::Profile WithVolumes() {
    sim::Profile profile;
    profile.volumes = {{"\\Flash File Store", 1000000, true},
                       {"\\TQ_FFS", 1000000, true},
                       {"\\Storage Card", 1000000, true}};
    profile.processes = {{"shell32.exe"}, {"Scanner.exe"}, {"Scanner.exe"}, {"sync.exe"}};
    return profile;
  }

  UpgradeConfig& job() { return *job_; }

  void Delete(const std::string& path) { DeletePath(path.c_str(), job()); }

  static void MakeRomFile(sim::Device& device, const std::string& path) {
    PutFile(path, "rom");
    const std::u16string wide(path.begin(), path.end());
    ASSERT_EQ(device.storage().SetAllAttributes(wide.c_str(), FILE_ATTRIBUTE_INROM), ERROR_SUCCESS);
  }

  /// The host's folder that is the device's root.
  std::filesystem::path Root() { return device().storage().HostPath(TEXT("\\")).value(); }

  /// A file that only a wide name can say.
  static void PutWide(const std::u16string& path) {
    HANDLE const file = CreateFileW(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                    FILE_ATTRIBUTE_NORMAL, nullptr);
    ASSERT_NE(file, INVALID_HANDLE_VALUE);
    CloseHandle(file);
  }
  static bool ExistsWide(const std::u16string& path) {
    return GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
  }

  std::vector<std::string> Running() {
    std::vector<std::string> names;
    for (const auto& entry : device().processes().List()) names.push_back(entry.name);
    return names;
  }

 private:
  std::unique_ptr<UpgradeConfig> job_;
};

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

TEST_F(CleanupTest, ManagesThousandsOfFiles) {
  constexpr int kFiles = 3000;
  for (int i = 0; i < kFiles; ++i) {
    PutFile("\\Temp\\d" + std::to_string(i % 60) + "\\file" + std::to_string(i) + ".bin", "x");
  }
  for (int i = 0; i < kFiles; i += 100) {
    job().AddFileSave(
        ("\\temp\\D" + std::to_string(i % 60) + "\\FILE" + std::to_string(i) + ".BIN").c_str());
  }

  Delete("\\");

  int left = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(Root())) {
    left += entry.is_regular_file() ? 1 : 0;
  }
  EXPECT_EQ(left, kFiles / 100);
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

// ---- volumes ----

TEST_F(CleanupTest, LeavesVolumesAloneButForTheFlashFileStore) {
  PutFile("\\Storage Card\\a.txt", "a");
  PutFile("\\TQ_FFS\\a.txt", "a");
  PutFile("\\Flash File Store\\a.txt", "a");
  PutFile("\\Temp\\Mounted\\a.txt", "a");
  SetAttributesOf("\\Temp\\Mounted", kTemporary);
  Delete("\\");
  EXPECT_TRUE(Exists("\\Storage Card\\a.txt"));
  EXPECT_TRUE(Exists("\\TQ_FFS\\a.txt"));
  EXPECT_FALSE(Exists("\\Flash File Store\\a.txt"));
  EXPECT_TRUE(Exists("\\Temp\\Mounted\\a.txt")) << "on any level";
}

TEST_F(CleanupTest, DeletesFilesThatAreTemporary) {
  PutFile("\\Temp\\a.txt", "a");
  SetAttributesOf("\\Temp\\a.txt", kTemporary);
  Delete("\\Temp");
  EXPECT_FALSE(Exists("\\Temp\\a.txt")) << "the same bit says nothing about a file";
}

TEST_F(CleanupTest, EmptiesAVolumeThatIsNamed) {
  PutFile("\\Storage Card\\Sub\\a.txt", "a");
  Delete("\\Storage Card");
  EXPECT_FALSE(Exists("\\Storage Card\\Sub\\a.txt"));
}

TEST_F(CleanupTest, KnowsTheFlashFileStoreByTheBeginningOfItsNameInExactCase) {
  for (const char* folder : {"\\Temp\\Flash File Store2", "\\Temp\\flash file store"}) {
    PutFile(std::string(folder) + "\\a.txt", "a");
    SetAttributesOf(folder, kTemporary);
  }
  Delete("\\Temp");
  EXPECT_FALSE(Exists("\\Temp\\Flash File Store2\\a.txt"));
  EXPECT_TRUE(Exists("\\Temp\\flash file store\\a.txt"));
}

TEST_F(CleanupTest, TakesTheFlashFileStoreFromTheDevicesFamily) {
  struct Case {
    const char* type;
    const char* family;
    const char* configured;
    const char* emptied;
  };
  static constexpr Case kCases[] = {
      {"T", "Q", "", "\\TQ_FFS"},
      {"T", "M", "", "\\Flash File Store"},
      {"M", "Q", "", "\\Flash File Store"},
      {"", "", "", "\\Flash File Store"},
      {"T", "Q", "Storage", "\\Storage Card"},
      {"T", "Q", "\\TQ_FFS", "none: a name has no backslash"},
  };
  for (const Case& c : kCases) {
    test::SetTypeAndFamily(job(), c.type, c.family);
    job().SetFlashFileStore(c.configured);
    for (const char* folder : {"\\TQ_FFS", "\\Flash File Store", "\\Storage Card"}) {
      PutFile(std::string(folder) + "\\a.txt", "a");
    }
    Delete("\\");
    for (const std::string folder : {"\\TQ_FFS", "\\Flash File Store", "\\Storage Card"}) {
      EXPECT_EQ(Exists(folder + "\\a.txt"), folder != c.emptied)
          << c.type << c.family << " " << c.configured << " " << folder;
    }
  }
}

// ---- trees that no job has made ----

TEST_F(CleanupTest, DeletesFilesWhoseNamesTheCodePageCannotSay) {
  PutFile("\\Temp\\a.txt", "a");
  PutWide(u"\\Temp\\\u6587\u4EF6.txt");
  PutWide(u"\\Temp\\\u0100.txt");
  CreateDirectoryW(u"\\Temp\\\u6587", nullptr);
  PutWide(u"\\Temp\\\u6587\\b.txt");
  Delete("\\Temp");
  EXPECT_FALSE(ExistsWide(u"\\Temp\\\u6587\u4EF6.txt"));
  EXPECT_FALSE(ExistsWide(u"\\Temp\\\u0100.txt"));
  EXPECT_FALSE(ExistsWide(u"\\Temp\\\u6587\\b.txt"));
}

TEST_F(CleanupTest, TakesNoFileForOneOfASimilarName) {
  PutFile("\\Temp\\A.txt", "saved");
  PutWide(u"\\Temp\\\u0100.txt");  // some code pages make an A of it
  job().AddFileSave("\\Temp\\A.txt");
  Delete("\\Temp");
  EXPECT_TRUE(Exists("\\Temp\\A.txt"));
  EXPECT_FALSE(ExistsWide(u"\\Temp\\\u0100.txt"));
}

TEST_F(CleanupTest, DeletesPathsOfTheGreatestLengthAndNoLongerOnes) {
  const std::string folder = "\\" + std::string(200, 'f');
  const std::string longest = folder + "\\" + std::string(259 - 202, 'n');
  ASSERT_EQ(longest.size(), 259U);
  PutFile(longest, "a");
  const std::filesystem::path longer =
      Root() / folder.substr(1) / (std::string(259 - 202, 'n') + "x");
  std::ofstream(longer) << "cannot be named";

  Delete("\\");

  EXPECT_FALSE(Exists(longest));
  EXPECT_TRUE(std::filesystem::exists(longer));

  PutFile(longest, "a");
  Delete(folder + "\\" + std::string(259 - 202, 'n') + "x");
  Delete(longest + ".txt");
  EXPECT_TRUE(Exists(longest)) << "a path that is too long is not cut to another one";
}

TEST_F(CleanupTest, DeletesANamedFileOfTheGreatestLength) {
  const std::string folder = "\\" + std::string(200, 'f');
  const std::string longest = folder + "\\" + std::string(259 - 206, 'n') + ".txt";
  ASSERT_EQ(longest.size(), 259U);
  PutFile(longest, "a");
  Delete(longest);
  EXPECT_FALSE(Exists(longest));
}

TEST_F(CleanupTest, StopsWhereAFoldersPatternDoesNotFit) {
  // "\*.*" takes four characters: folders of 255 characters are searched, longer ones are not.
  const std::string base = "\\" + std::string(150, 'f');
  for (const std::size_t length : {255U, 256U, 257U, 258U, 259U}) {
    const std::string folder = base + "\\" + std::string(length - 152, 'g');
    ASSERT_EQ(folder.size(), length);
    std::filesystem::create_directories(Root() / base.substr(1) / folder.substr(152));
    std::ofstream(Root() / base.substr(1) / folder.substr(152) / "a") << "x";
    Delete(folder);
    Delete(base);
    EXPECT_EQ(std::filesystem::exists(Root() / base.substr(1) / folder.substr(152) / "a"),
              length > 255)
        << length;
  }
}

TEST_F(CleanupTest, WalksTreesDeeperThanAnyPath) {
  std::filesystem::path below = Root() / "Deep";
  for (int depth = 0; depth < 300; ++depth) {
    std::filesystem::create_directories(below);
    std::ofstream(below / "f") << "x";
    below /= "d";
  }
  PutFile("\\After\\a.txt", "a");

  Delete("\\");

  EXPECT_FALSE(Exists("\\Deep\\f"));
  std::string deepest = "\\Deep";
  while (deepest.size() + 2 <= 255) deepest += "\\d";
  EXPECT_TRUE(Exists(deepest));
  EXPECT_FALSE(Exists(deepest + "\\f"));
  EXPECT_FALSE(Exists("\\After\\a.txt")) << "and comes back from it";
  EXPECT_TRUE(std::filesystem::exists(Root() / "Deep"));
}

TEST_F(CleanupTest, NeverLeavesTheDevice) {
  const std::filesystem::path outside = folder() / "outside";
  std::filesystem::create_directories(outside);
  std::ofstream(outside / "precious") << "x";
  std::ofstream(outside / "precious.txt") << "x";
  std::filesystem::create_directory_symlink(outside, Root() / "Link");
  std::filesystem::create_symlink(outside / "precious.txt", Root() / "link.txt");
  PutFile("\\Temp\\a.txt", "a");

  for (const char* path : {"\\", "\\Link", "\\link.txt", "\\Link\\precious.txt", "..\\outside",
                           "\\..\\..\\outside\\precious.txt", "\\Temp\\..\\..\\..\\outside"}) {
    Delete(path);
  }

  EXPECT_TRUE(std::filesystem::exists(outside / "precious"));
  EXPECT_TRUE(std::filesystem::exists(outside / "precious.txt"));
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
}

// ---- programs ----

TEST_F(CleanupTest, StopsTheFirstProgramOfEachName) {
  job().AddStopProcess("Scanner.exe");
  job().AddStopProcess("sync.exe");
  CleanUpDevice(job());
  EXPECT_THAT(Running(), ElementsAre("host.exe", "shell32.exe", "Scanner.exe"));
  CleanUpDevice(job());
  EXPECT_THAT(Running(), ElementsAre("host.exe", "shell32.exe"));
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
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\b.txt", "b");
  job().AddFileDelete("\\Temp");
  job().AddFileDelete("\\b.txt");
  device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});
  CleanUpDevice(job());
  EXPECT_TRUE(Exists("\\Temp\\a.txt"));
  EXPECT_FALSE(Exists("\\b.txt"));
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
