// Removing a folder with all it holds, and the walk that does it.
#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "device/file.h"
#include "device/tree_walk.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace device {
namespace {

using test::Exists;
using test::PutFile;
using test::SetAttributesOf;
using ::testing::ElementsAre;

class DirectoryTreeTest : public DeviceTest {
 protected:
  /// The host's folder that is the device's root.
  std::filesystem::path Root() { return device().storage().HostPath(TEXT("\\")).value(); }

  bool Remove(const std::string& pattern) { return file_.RemoveDirectoryTree(pattern.c_str()); }

  File file_;
};

TEST_F(DirectoryTreeTest, GoesWithItsReadOnlyFilesAndTheFolderItself) {
  PutFile("\\Temp\\one.txt", "1");
  PutFile("\\Temp\\Sub\\Deeper\\two.txt", "2");
  PutFile("\\Temp\\Sub\\three.txt", "3");
  SetAttributesOf("\\Temp\\Sub\\three.txt", FILE_ATTRIBUTE_READONLY);
  ASSERT_TRUE(file_.CreateDirectory("\\Temp\\Empty"));
  PutFile("\\Temporary.txt", "stays");

  EXPECT_TRUE(Remove("\\Temp\\*.*"));

  EXPECT_EQ(file_.last_error(), 0U);
  EXPECT_FALSE(Exists("\\Temp"));
  EXPECT_TRUE(Exists("\\Temporary.txt"));
}

TEST_F(DirectoryTreeTest, GoesWithItsReadOnlyFolders) {
  PutFile("\\Temp\\My.App\\two.txt", "2");
  SetAttributesOf("\\Temp\\My.App", FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN);
  SetAttributesOf("\\Temp", FILE_ATTRIBUTE_READONLY);
  EXPECT_TRUE(Remove("\\Temp\\*.*"));
  EXPECT_FALSE(Exists("\\Temp"));
}

TEST_F(DirectoryTreeTest, GoesWhenItIsEmpty) {
  ASSERT_TRUE(file_.CreateDirectory("\\Empty"));
  EXPECT_TRUE(Remove("\\Empty\\*.*"));
  EXPECT_FALSE(Exists("\\Empty"));
}

TEST_F(DirectoryTreeTest, IsNotRemovedWhenItIsNotThere) {
  EXPECT_FALSE(Remove("\\None\\*.*"));
  EXPECT_NE(file_.last_error(), 0U);
}

TEST_F(DirectoryTreeTest, StaysWithAFileThatCannotBeDeletedAndLosesTheOthers) {
  PutFile("\\Temp\\a.txt", "1");
  PutFile("\\Temp\\Sub\\b.txt", "2");
  PutFile("\\Temp\\Sub\\c.txt", "3");
  PutFile("\\Temp\\z.txt", "3");
  File holder;
  ASSERT_TRUE(holder.OpenForWriting("\\Temp\\Sub\\b.txt", true, 0));

  EXPECT_FALSE(Remove("\\Temp\\*.*"));

  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
  EXPECT_TRUE(Exists("\\Temp\\Sub\\b.txt"));
  EXPECT_FALSE(Exists("\\Temp\\Sub\\c.txt"));
  EXPECT_FALSE(Exists("\\Temp\\z.txt"));
}

TEST_F(DirectoryTreeTest, OfTheRootIsEmptiedAndItsRemovalFailsSilently) {
  PutFile("\\a.txt", "1");
  PutFile("\\Temp\\b.txt", "2");
  EXPECT_FALSE(Remove("\\*.*"));
  EXPECT_FALSE(Exists("\\a.txt"));
  EXPECT_FALSE(Exists("\\Temp"));
}

TEST_F(DirectoryTreeTest, IsLeftAloneWithoutAPattern) {
  PutFile("\\Temp\\a.txt", "1");
  EXPECT_FALSE(Remove("\\Temp"));
  EXPECT_FALSE(Remove("*.*"));
  EXPECT_FALSE(file_.RemoveDirectoryTree(nullptr));
  EXPECT_FALSE(Remove("\\Temp\\" + std::string(260, 'x') + "*.*"));
  EXPECT_FALSE(Remove("\\Temp\\*.*" + std::string(260, 'x')));
  EXPECT_TRUE(Exists("\\Temp\\a.txt"));
}

TEST_F(DirectoryTreeTest, LosesOnlyWhatMatchesAPatternOfItsOwnLevel) {
  PutFile("\\Temp\\a.txt", "1");
  PutFile("\\Temp\\a.bin", "1");
  EXPECT_FALSE(Remove("\\Temp\\*.txt"));
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
  EXPECT_TRUE(Exists("\\Temp\\a.bin"));
}

TEST_F(DirectoryTreeTest, OfAnyDepthGoesWithoutNeedingStack) {
  std::string path;
  for (int depth = 0; depth < 126; ++depth) path += "\\d";
  PutFile(path + "\\file", "x");
  EXPECT_TRUE(Remove("\\d\\*.*"));
  EXPECT_FALSE(Exists("\\d"));
}

TEST_F(DirectoryTreeTest, DeeperThanAnyPathIsRemovedAsFarAsPathsReach) {
  std::filesystem::path below = Root() / "Deep";
  for (int depth = 0; depth < 300; ++depth) {
    std::filesystem::create_directories(below);
    std::ofstream(below / "f") << "x";
    below /= "d";
  }
  EXPECT_FALSE(Remove("\\Deep\\*.*"));
  EXPECT_FALSE(Exists("\\Deep\\f"));
  EXPECT_TRUE(Exists("\\Deep\\d"));
}

/// A path of exactly `length` characters below a folder of 101.
std::string PathOf(std::size_t length) {
  const std::string folder = "\\" + std::string(100, 'f');
  return folder + "\\" + std::string(length - 102, 'n');
}

TEST_F(DirectoryTreeTest, TakesFilesOfTheGreatestLength) {
  for (const std::size_t length : {257U, 258U, 259U, 260U}) {
    const std::string folder = PathOf(200).substr(0, 101);
    std::filesystem::create_directories(Root() / folder.substr(1));
    std::ofstream(Root() / folder.substr(1) / PathOf(length).substr(102)) << "x";
    EXPECT_EQ(Remove(folder + "\\*.*"), length <= 259) << length;
    std::filesystem::remove_all(Root() / folder.substr(1));
  }
}

TEST_F(DirectoryTreeTest, SearchesFoldersWhoseEntriesHaveRoomAndTriesTheOthersAsTheyAre) {
  for (const std::size_t length : {254U, 255U, 256U, 257U, 259U, 260U}) {
    for (const bool empty : {true, false}) {
      const std::string folder = PathOf(200).substr(0, 101);
      const auto inner = Root() / folder.substr(1) / PathOf(length).substr(102);
      std::filesystem::create_directories(inner);
      if (!empty) std::ofstream(inner / "a") << "x";
      const bool goes = length <= 255 || (empty && length <= 259);
      EXPECT_EQ(Remove(folder + "\\*.*"), goes) << length << (empty ? " empty" : "");
      std::filesystem::remove_all(Root() / folder.substr(1));
    }
  }
}

TEST_F(DirectoryTreeTest, GoesWithNamesThatTheCodePageCannotSay) {
  ASSERT_TRUE(file_.CreateDirectory("\\Temp"));
  ASSERT_TRUE(CreateDirectoryW(u"\\Temp\\\u6587", nullptr));
  CloseHandle(CreateFileW(u"\\Temp\\\u6587\\\u4EF6.txt", GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                          FILE_ATTRIBUTE_NORMAL, nullptr));
  EXPECT_TRUE(Remove("\\Temp\\*.*"));
  EXPECT_FALSE(Exists("\\Temp"));
}

TEST_F(DirectoryTreeTest, NeverLeadsOutOfTheDevice) {
  const auto outside = folder() / "outside";
  std::filesystem::create_directories(outside);
  std::ofstream(outside / "precious.txt") << "x";
  PutFile("\\Temp\\a.txt", "a");
  std::filesystem::create_directory_symlink(outside, Root() / "Temp" / "Link");
  EXPECT_FALSE(Remove("\\Temp\\*.*"));
  EXPECT_FALSE(Remove("\\..\\..\\outside\\*.*"));
  EXPECT_FALSE(Remove("\\Temp\\Link\\*.*"));
  EXPECT_TRUE(std::filesystem::exists(outside / "precious.txt"));
  EXPECT_FALSE(Exists("\\Temp\\a.txt"));
}

TEST_F(DirectoryTreeTest, StaysWholeWithoutMemory) {
  PutFile("\\Temp\\Sub\\a.txt", "1");
  PutFile("\\Temp\\b.txt", "2");
  device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});
  EXPECT_FALSE(Remove("\\Temp\\*.*"));
  EXPECT_TRUE(Exists("\\Temp\\b.txt"));
  EXPECT_TRUE(Exists("\\Temp\\Sub\\a.txt"));
}

TEST_F(DirectoryTreeTest, LeavesNothingOpenWhicheverCallFails) {
  std::uint64_t fired = 1;
  for (std::uint64_t nth = 1; fired > 0; ++nth) {
    ASSERT_LT(nth, 200U);
    PutFile("\\Temp\\a.txt", "1");
    PutFile("\\Temp\\Sub\\b.txt", "2");
    const std::size_t handles = device().kernel().OpenHandles();
    const std::size_t blocks = device().memory().live_blocks();
    const std::uint64_t fired_before = device().faults().fired();
    device().faults().Add({"*", nth, 1, 0});
    const bool removed = Remove("\\Temp\\*.*");
    fired = device().faults().fired() - fired_before;
    const std::string call = device().faults().last_fired();
    device().faults().Clear();
    EXPECT_EQ(removed, !Exists("\\Temp")) << call;
    EXPECT_EQ(device().kernel().OpenHandles(), handles) << call;
    EXPECT_EQ(device().memory().live_blocks(), blocks) << call;
  }
  EXPECT_FALSE(Exists("\\Temp"));
}

// ---- the walk itself ----

std::string Narrow(const WCHAR* text) {
  const std::u16string_view view = text;
  return {view.begin(), view.end()};
}

/// What a walk into all folders comes to: files as they are, folders with "/" where they begin and
/// "<" where they end.
std::vector<std::string> Steps(TreeWalk& walk) {
  std::vector<std::string> steps;
  for (;;) {
    switch (walk.Next()) {
      case TreeWalk::Step::kFile: steps.push_back(Narrow(walk.path())); break;
      case TreeWalk::Step::kFolder:
        steps.push_back(Narrow(walk.path()) + "/");
        walk.Enter();
        break;
      case TreeWalk::Step::kEndOfFolder: steps.push_back(Narrow(walk.path()) + "<"); break;
      case TreeWalk::Step::kEnd: return steps;
    }
  }
}

using TreeWalkTest = DirectoryTreeTest;

TEST_F(TreeWalkTest, GoesThroughFoldersInTheirPlaceInTheList) {
  PutFile("\\T\\a", "");
  PutFile("\\T\\m\\x", "");
  PutFile("\\T\\m\\y", "");
  PutFile("\\T\\z", "");
  TreeWalk walk;
  ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
  EXPECT_THAT(Steps(walk), ElementsAre("\\T\\a", "\\T\\m/", "\\T\\m\\x", "\\T\\m\\y", "\\T\\m<",
                                       "\\T\\z", "\\T<"));
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kEnd) << "and stays there";
}

TEST_F(TreeWalkTest, PassesOverFoldersThatNobodyEnters) {
  PutFile("\\T\\m\\x", "");
  PutFile("\\T\\z", "");
  TreeWalk walk;
  ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kFolder);
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kFile);
  EXPECT_EQ(Narrow(walk.path()), "\\T\\z");
}

TEST_F(TreeWalkTest, EndsAtOnceInAFolderThatIsNotThere) {
  TreeWalk walk;
  ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
  EXPECT_THAT(Steps(walk), ElementsAre("\\T<"));
}

TEST_F(TreeWalkTest, HoldsNoFolderOpenThatItHasLeft) {
  PutFile("\\T\\m\\x", "");
  const std::size_t handles = device().kernel().OpenHandles();
  TreeWalk walk;
  ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kFolder);
  walk.Enter();
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kFile);
  EXPECT_EQ(device().kernel().OpenHandles(), handles + 2);
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kEndOfFolder);
  EXPECT_EQ(device().kernel().OpenHandles(), handles + 1);
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kEndOfFolder);
  EXPECT_EQ(device().kernel().OpenHandles(), handles);
}

TEST_F(TreeWalkTest, BeginsAnewAndClosesWhatWasOpen) {
  PutFile("\\T\\m\\n\\x", "");
  const std::size_t handles = device().kernel().OpenHandles();
  {
    TreeWalk walk;
    for (int round = 0; round < 3; ++round) {
      ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
      EXPECT_EQ(walk.Next(), TreeWalk::Step::kFolder);
      walk.Enter();
      EXPECT_EQ(walk.Next(), TreeWalk::Step::kFolder);
      walk.Enter();
      EXPECT_EQ(device().kernel().OpenHandles(), handles + 3);
    }
    EXPECT_FALSE(walk.Begin(TEXT("\\T\\*.*"), {}));
    EXPECT_EQ(device().kernel().OpenHandles(), handles);
    EXPECT_EQ(walk.Next(), TreeWalk::Step::kEnd);
    ASSERT_TRUE(walk.Begin(TEXT("\\T\\*.*"), TEXT("\\T\\")));
  }
  EXPECT_EQ(device().kernel().OpenHandles(), handles);
}

TEST_F(TreeWalkTest, RefusesAPrefixThatIsTooLong) {
  TreeWalk walk;
  EXPECT_FALSE(walk.Begin(TEXT("\\T\\*.*"), std::u16string(260, 'x')));
  EXPECT_EQ(walk.Next(), TreeWalk::Step::kEnd);
}

}  // namespace
}  // namespace device
