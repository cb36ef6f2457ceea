#include "storage/file_records.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>

#include "support/device_test.h"

namespace {

class FileRecordsTest : public ::testing::Test {
 protected:
  [[nodiscard]] std::filesystem::path file() const { return folder_.path() / "records"; }
  [[nodiscard]] std::string Text() const {
    std::ifstream in(file(), std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
  }
  void Append(const std::string& text) const {
    std::ofstream(file(), std::ios::binary | std::ios::app) << text;
  }

 private:
  test::TemporaryFolder folder_;
};

TEST_F(FileRecordsTest, KeepsWhatIsSet) {
  { sim::FileRecords(file()).Set("Windows/a b.exe", {0x21, 1, 2, 0x1C63D2F3A4B5C6D}); }

  const auto record = sim::FileRecords(file()).Find("Windows/a b.exe");

  ASSERT_TRUE(record);
  EXPECT_EQ(record->attributes, 0x21U);
  EXPECT_EQ(record->created, 1U);
  EXPECT_EQ(record->accessed, 2U);
  EXPECT_EQ(record->written, 0x1C63D2F3A4B5C6DU);
}

TEST_F(FileRecordsTest, KeepsEveryChangeAtOnce) {
  sim::FileRecords records(file());
  records.Set("a", {1, 0, 0, 0});
  records.Set("a/b", {2, 0, 0, 0});
  records.Set("ab", {3, 0, 0, 0});
  records.Rename("a", "c");
  records.Erase("ab");

  const sim::FileRecords other(file());  // as after a crash: the first is still there

  EXPECT_FALSE(other.Find("a"));
  EXPECT_FALSE(other.Find("a/b"));
  EXPECT_FALSE(other.Find("ab"));
  EXPECT_EQ(other.Find("c")->attributes, 1U);
  EXPECT_EQ(other.Find("c/b")->attributes, 2U);
}

TEST_F(FileRecordsTest, GathersNewerTimesUntilTheyAreFlushed) {
  sim::FileRecords records(file());
  records.Set("log", {1, 5, 5, 5});
  records.Set("log", {1, 5, 6, 6});
  records.Set("log", {1, 5, 7, 7});

  EXPECT_EQ(records.Find("log")->written, 7U);
  EXPECT_EQ(Text(), "S 1 5 5 5 log\n");
  records.Flush();
  EXPECT_EQ(Text(), "S 1 5 5 5 log\nS 1 5 7 7 log\n");
}

TEST_F(FileRecordsTest, WritesGatheredTimesAtTheEndAndWhenThereAreMany) {
  const int many = 200;
  {
    sim::FileRecords records(file());
    for (int i = 0; i < many; ++i) records.Set(std::to_string(i), {1, 5, 5, 5});
    for (int i = 0; i < many; ++i) records.Set(std::to_string(i), {1, 5, 6, 6});

    EXPECT_NE(Text().find("S 1 5 6 6 0\n"), std::string::npos);
  }

  const sim::FileRecords other(file());
  for (int i = 0; i < many; ++i) EXPECT_EQ(other.Find(std::to_string(i))->written, 6U);
}

TEST_F(FileRecordsTest, KeepsGatheredTimesThroughARename) {
  sim::FileRecords records(file());
  records.Set("a/b", {1, 5, 5, 5});
  records.Set("a/b", {1, 5, 6, 6});

  records.Rename("a", "c");

  const sim::FileRecords other(file());
  EXPECT_EQ(other.Find("c/b")->written, 6U);
  EXPECT_FALSE(other.Find("a/b"));
}

TEST_F(FileRecordsTest, DoesNotBringBackAnErasedFileByItsGatheredTimes) {
  {
    sim::FileRecords records(file());
    records.Set("a/b", {1, 5, 5, 5});
    records.Set("a/b", {1, 5, 6, 6});
    records.Erase("a");
  }

  EXPECT_FALSE(sim::FileRecords(file()).Find("a/b"));
}

TEST_F(FileRecordsTest, ErasesAndMovesWhatLiesBelowAndNotWhatOnlyBeginsAlike) {
  sim::FileRecords records(file());
  for (const char* path : {"a", "a/b", "a/b/c", "a.b", "ab"}) records.Set(path, {1, 0, 0, 0});

  records.Erase("a");

  EXPECT_FALSE(records.Find("a/b/c"));
  EXPECT_TRUE(records.Find("a.b"));
  EXPECT_TRUE(records.Find("ab"));
}

TEST_F(FileRecordsTest, PassesOverLinesThatAreNone) {
  Append(
      "S 1 0 0 0 good\nrubbish\nS\nS 1 2\nS 1 2 3 4\nS x 0 0 0 bad\nS 1 0 0 11111111111111111 bad\n"
      "R only one\nE \nS 2 0 0 0 also good\nS 3 0 0 0 cut of");

  const sim::FileRecords records(file());

  EXPECT_TRUE(records.Find("good"));
  EXPECT_TRUE(records.Find("also good"));
  EXPECT_FALSE(records.Find("bad"));
  EXPECT_FALSE(records.Find("cut of")) << "the end of this line was never written";
  EXPECT_EQ(Text(), "S 2 0 0 0 also good\nS 1 0 0 0 good\n");
}

TEST_F(FileRecordsTest, ForgetsWhatNoLongerExists) {
  sim::FileRecords records(file());
  records.Set("kept", {1, 0, 0, 0});
  records.Set("gone", {1, 0, 0, 0});

  records.Prune([](const std::string& path) { return path == "kept"; });

  EXPECT_EQ(Text(), "S 1 0 0 0 kept\n");
}

TEST_F(FileRecordsTest, DoesNotGrowWithoutEnd) {
  sim::FileRecords records(file());
  for (unsigned i = 0; i < 10'000; ++i) records.Set("a", {i, 0, 0, 0});

  EXPECT_LT(Text().size(), 40'000U);
  EXPECT_EQ(sim::FileRecords(file()).Find("a")->attributes, 9'999U);
}

TEST_F(FileRecordsTest, FollowsNoLink) {
  test::TemporaryFolder elsewhere;
  const std::filesystem::path target = elsewhere.path() / "target";
  std::ofstream(target) << "mine";
  std::filesystem::create_symlink(target, file());

  EXPECT_THROW(sim::FileRecords{file()}, std::runtime_error);

  std::ifstream in(target);
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}), "mine");
}

}  // namespace
