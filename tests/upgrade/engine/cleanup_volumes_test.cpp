// Volumes that are mounted on a device, and trees that no job has made.
#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "upgrade/engine/cleanup_test.h"

namespace upgrade {
namespace {

using test::Exists;
using test::PutFile;
using test::SetAttributesOf;

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

TEST_F(CleanupTest, NeverEntersAFlashFileStoreWithADotInItsName) {
  PutFile("\\Temp\\Flash.Store\\a.txt", "a");
  SetAttributesOf("\\Temp\\Flash.Store", kTemporary);
  job().SetFlashFileStore("Flash.Store");
  Delete("\\Temp");
  EXPECT_TRUE(Exists("\\Temp\\Flash.Store\\a.txt"));
}

TEST_F(CleanupTest, EmptiesAWholeDeviceButForRomVolumesAndSavedFiles) {
  constexpr const char* kStay[] = {"\\Windows\\core.dll", "\\Storage Card\\Sub\\a.txt",
                                   "\\TQ_FFS\\a.txt",     "\\Flash File Store\\Data\\keep.txt",
                                   "\\keep.txt",          "\\Apps\\My.App\\a.txt"};
  constexpr const char* kGo[] = {"\\Windows\\own.dll",
                                 "\\Flash File Store\\a.txt",
                                 "\\Flash File Store\\Data\\a.txt",
                                 "\\Flash File Store\\Data\\keep.txt2",
                                 "\\other.txt",
                                 "\\Apps\\Sub\\Sub\\keep.txt",
                                 "\\Apps\\noextension"};
  for (const char* path : kStay) PutFile(path, "x");
  for (const char* path : kGo) PutFile(path, "x");
  MakeRomFile(device(), "\\Windows\\core.dll");
  job().AddFileSave("\\KEEP.TXT");
  job().AddFileSave("\\Flash File Store\\data\\keep.txt");
  Delete("\\");
  for (const char* path : kStay) EXPECT_TRUE(Exists(path)) << path;
  for (const char* path : kGo) EXPECT_FALSE(Exists(path)) << path;
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

}  // namespace
}  // namespace upgrade
