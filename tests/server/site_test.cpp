#include "server/site.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <string>

#include "server/scratch_folder.h"

namespace server {
namespace {

struct PathCase {
  std::string path;
  bool safe;
  const char* why;
};

TEST(IsSafePathTest, AcceptsOnlyPathsThatStayWhereTheyBegin) {
  const PathCase kCases[] = {
      {"a", true, "a name"},
      {"apps/big file.bin", true, "blanks are welcome"},
      {"a/b/c", true, "folders"},
      {"..a/b..c/...", true, "dots within a name"},
      {"100% sure?&=#", true, "no character means anything here"},
      {"", false, "nothing"},
      {"..", false, "the parent"},
      {"../a", false, "the parent"},
      {"a/../b", false, "the parent, even if it would stay inside"},
      {"a/..", false, "the parent at the end"},
      {".", false, "the folder itself"},
      {"a/./b", false, "the folder itself"},
      {"/etc/passwd", false, "absolute"},
      {"a//b", false, "an empty segment"},
      {"a/", false, "an empty segment at the end"},
      {"C:/a", false, "a drive"},
      {"a/b:stream", false, "a colon anywhere"},
      {"a\\..\\b", false, "a backslash is not for here"},
      {"a\nb", false, "a control character"},
      {std::string("a\0b", 3), false, "a zero hides the rest from the system"},
      {std::string(1024, 'a'), true, "the longest"},
      {std::string(1025, 'a'), false, "too long"},
  };
  for (const PathCase& c : kCases) EXPECT_EQ(IsSafePath(c.path), c.safe) << c.path << ": " << c.why;
}

class SiteTest : public ::testing::Test {
 protected:
  ScratchFolder scratch_;
  Site site_{scratch_.path() / "root"};
};

TEST_F(SiteTest, TellsSizeAttributesTimeAndChecksum) {
  const auto path = scratch_.Write("root/dir/check me.txt", "123456789");
  struct timespec times[2] = {{1141221909, 0}, {1141221909, 0}};
  ASSERT_EQ(::utimensat(AT_FDCWD, path.c_str(), times, 0), 0);

  const auto file = site_.Open("dir/check me.txt");

  ASSERT_NE(file, nullptr);
  EXPECT_EQ(file->size(), 9U);
  EXPECT_EQ(file->attributes(), 32U);
  EXPECT_EQ(file->modified(), 1141221909);
  EXPECT_EQ(file->crc32(), 0xCBF43926U) << "the check value of this CRC";
}

TEST_F(SiteTest, GivesAnEmptyFileTheChecksumZero) {
  scratch_.Write("root/empty", "");

  const auto file = site_.Open("empty");

  ASSERT_NE(file, nullptr);
  EXPECT_EQ(file->size(), 0U);
  EXPECT_EQ(file->crc32(), 0U);
}

TEST_F(SiteTest, GivesEachFileItsOwnAttributesOrThoseOfAll) {
  scratch_.Write("root/a", "a");
  scratch_.Write("root/b", "b");
  site_.SetAttributes("", kAttributeArchive | kAttributeHidden);
  site_.SetAttributes("b", kAttributeReadOnly);

  EXPECT_EQ(site_.Open("a")->attributes(), 34U);
  EXPECT_EQ(site_.Open("b")->attributes(), 1U);
}

TEST_F(SiteTest, SeesThatAFileHasChanged) {
  scratch_.Write("root/a", "one");
  const std::uint32_t first = site_.Open("a")->crc32();

  scratch_.Write("root/a", "three");

  EXPECT_NE(site_.Open("a")->crc32(), first);
  EXPECT_EQ(site_.Open("a")->size(), 5U);
}

TEST_F(SiteTest, OpensNothingOutsideItsFolder) {
  scratch_.Write("root/inside", "i");
  scratch_.Write("outside", "o");

  EXPECT_EQ(site_.Open("../outside"), nullptr);
  EXPECT_EQ(site_.Open((scratch_.path() / "outside").string()), nullptr);
}

TEST_F(SiteTest, FollowsNoSymbolicLinkAnywhereInAPath) {
  scratch_.Write("outside/secret", "s");
  scratch_.Write("root/real/file", "f");
  std::filesystem::create_symlink(scratch_.path() / "outside", scratch_.path() / "root/folder");
  std::filesystem::create_symlink(scratch_.path() / "outside/secret",
                                  scratch_.path() / "root/file");
  std::filesystem::create_symlink("real", scratch_.path() / "root/inner");

  EXPECT_EQ(site_.Open("folder/secret"), nullptr);
  EXPECT_EQ(site_.Open("file"), nullptr);
  EXPECT_EQ(site_.Open("inner/file"), nullptr) << "a link that stays inside is no exception";
  EXPECT_NE(site_.Open("real/file"), nullptr);
}

TEST_F(SiteTest, ServesRegularFilesOnlyAndNeverWaitsForAPipe) {
  scratch_.Write("root/dir/file", "f");
  ASSERT_EQ(::mkfifo((scratch_.path() / "root/pipe").c_str(), 0600), 0);

  EXPECT_EQ(site_.Open("dir"), nullptr);
  EXPECT_EQ(site_.Open("pipe"), nullptr);
  EXPECT_EQ(site_.Open("missing"), nullptr);
  EXPECT_EQ(site_.Open("dir/file/more"), nullptr);
}

TEST_F(SiteTest, RefusesAFileThatADeviceCouldNotCount) {
  const auto path = scratch_.Write("root/huge", "");
  std::filesystem::resize_file(path, std::uintmax_t{1} << 32U);

  EXPECT_EQ(site_.Open("huge"), nullptr);
}

TEST_F(SiteTest, CountsWhatThereIsToServe) {
  scratch_.Write("root/a", "12345");
  scratch_.Write("root/deep/er/b", "123");
  scratch_.Write("outside", "o");
  std::filesystem::create_symlink(scratch_.path() / "outside", scratch_.path() / "root/link");

  const Site::Inventory inventory = site_.Warm();

  EXPECT_EQ(inventory.files, 2U);
  EXPECT_EQ(inventory.bytes, 8U);
}

}  // namespace
}  // namespace server
