#include "storage/folder_names.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "support/device_test.h"

namespace {

class FolderNamesTest : public ::testing::Test {
 protected:
  FolderNamesTest() : fd_(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    for (int i = 0; i < 100; ++i) Make("File " + std::to_string(i));
  }
  void Make(const std::string& name) const { std::ofstream(folder_.path() / name).put('x'); }
  /// The host's spelling of what is found, "" for nothing.
  std::string Find(std::u16string_view name) {
    const auto entry = names_.Find(fd_.get(), name);
    return entry ? entry->name : "";
  }
  [[nodiscard]] const std::filesystem::path& path() const { return folder_.path(); }
  sim::FolderNames& names() { return names_; }

 private:
  test::TemporaryFolder folder_;
  sim::UniqueFd fd_;
  sim::FolderNames names_;
};

TEST_F(FolderNamesTest, FindsNamesWithoutRegardToCase) {
  EXPECT_EQ(Find(u"file 7"), "File 7");
  EXPECT_EQ(Find(u"FILE 99"), "File 99");
  EXPECT_EQ(Find(u"file 100"), "");
  EXPECT_EQ(names().kept(), 1U) << "a hundred names are worth keeping";
}

TEST_F(FolderNamesTest, SeesAtOnceWhatAnybodyChanges) {
  EXPECT_EQ(Find(u"new"), "");

  Make("NEW");
  EXPECT_EQ(Find(u"new"), "NEW");
  std::filesystem::rename(path() / "NEW", path() / "Newer");
  EXPECT_EQ(Find(u"new"), "");
  EXPECT_EQ(Find(u"newer"), "Newer");
  std::filesystem::remove(path() / "Newer");
  EXPECT_EQ(Find(u"newer"), "");
  std::filesystem::create_directory(path() / "Folder");
  EXPECT_EQ(Find(u"folder"), "Folder");
}

TEST_F(FolderNamesTest, PrefersTheExactSpellingAndThenTheFirstInOrder) {
  Make("a.txt");
  Make("A.TXT");

  EXPECT_EQ(Find(u"a.txt"), "a.txt");
  EXPECT_EQ(Find(u"A.txt"), "A.TXT");
  std::filesystem::remove(path() / "A.TXT");
  EXPECT_EQ(Find(u"A.txt"), "a.txt");
}

TEST_F(FolderNamesTest, BeginsAnewWhenMoreHasChangedThanTheHostTells) {
  EXPECT_EQ(Find(u"late"), "");
  for (int i = 0; i < 9'000; ++i) {  // two events each; the host keeps 16,384
    Make("passing");
    std::filesystem::remove(path() / "passing");
  }
  Make("LATE");

  EXPECT_EQ(Find(u"late"), "LATE");
}

TEST_F(FolderNamesTest, ForgetsAFolderThatIsGone) {
  const std::filesystem::path inner = path() / "inner";
  std::filesystem::create_directory(inner);
  for (int i = 0; i < 100; ++i) std::ofstream(inner / std::to_string(i)).put('x');
  {
    const sim::UniqueFd fd(::open(inner.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    EXPECT_FALSE(names().Find(fd.get(), u"none"));
    EXPECT_EQ(names().kept(), 1U);
    std::filesystem::remove_all(inner);
    EXPECT_FALSE(names().Find(fd.get(), u"7"));
  }

  EXPECT_EQ(Find(u"file 7"), "File 7");

  EXPECT_EQ(names().kept(), 1U);
}

}  // namespace
