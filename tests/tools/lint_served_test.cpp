// What `orvenix job lint` finds where the server's files are at hand.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "server/scratch_folder.h"
#include "server/site.h"
#include "tools/file_text.h"
#include "tools/lint/lint.h"
#include "tools/lint_jobs.h"
#include "tools/package/package.h"

namespace tools {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr const char* kHello = "a.txt,\\a.txt,*,909783072,6\r\n";  // "hello\n"

/// A served folder with a list file and what its list names.
class LintServedTest : public ::testing::Test {
 protected:
  Findings LintList(const std::string& list, const std::string& crc = "", bool unlisted = false) {
    scratch_.Write("bundle.lst", list);
    server::Site site(scratch_.path());
    const std::string right = std::to_string(site.Open("bundle.lst")->crc32());
    return LintText(
        Upgrade(kServer + kStore +
                Group("FileList", Field("Source", "bundle.lst") + Field("Dest", "\\bundle.lst") +
                                      Field("CRC", crc.empty() ? right : crc)) +
                job_),
        &site, unlisted);
  }

  std::string job_;  ///< what is in the job besides
  ScratchFolder scratch_;
};

TEST_F(LintServedTest, FindsNothingInAListWhoseFilesAreServed) {
  scratch_.Write("a.txt", "hello\n");
  scratch_.Write("sub/empty", "");

  EXPECT_THAT(Ids(LintList(kHello, "", true)), ElementsAre("file-unlisted"));
  EXPECT_THAT(Ids(LintList(std::string(kHello) + "sub\\empty,\\e,*,1,0\r\n", "", true)), IsEmpty());
  EXPECT_THAT(Ids(LintList(kHello)), IsEmpty()) << "other files may lie in a served folder";
}

TEST_F(LintServedTest, ComparesTheListWithWhatIsServed) {
  scratch_.Write("a.txt", "hello\n");
  scratch_.Write("b.txt", "world\n");

  EXPECT_THAT(Ids(LintList(kHello, "5")), ElementsAre("list-crc"));
  EXPECT_THAT(Ids(LintList("c.txt,\\c,*,5,6\r\n")), ElementsAre("file-missing"));
  EXPECT_THAT(Ids(LintList("A.txt,\\a,*,909783072,6\r\n")), ElementsAre("file-missing"))
      << "letter case";
  EXPECT_THAT(Ids(LintList("b.txt,\\b,*,909783072,6\r\n")), ElementsAre("file-crc"));
  EXPECT_THAT(Ids(LintList("a.txt,\\a,*,909783072,5\r\n")),
              ElementsAre("file-size", "size-reserve"));
  EXPECT_THAT(Ids(LintList("a.txt,\\a,*,909783072,six\r\n")),
              ElementsAre("size-number", "file-size"));
  EXPECT_THAT(Ids(LintList(std::string(kHello) + "a.txt,\\b,*,909783072,6\r\n")),
              ElementsAre("size-short"));
  EXPECT_THAT(Ids(LintList("../a.txt,\\a,*,909783072,6\r\n")),
              ElementsAre("path-leading", "file-missing"));
}

TEST_F(LintServedTest, LooksIntoThePackageThatTheJobInstalls) {
  scratch_.Write("in/a.exe", "the program");
  PackageOptions options;
  options.folder = scratch_.path() / "in";
  options.cabinet = scratch_.path() / "p.cab";
  options.application = "A";
  options.provider = "B";
  options.destination = "\\Program Files\\A";
  MakePackage(options);
  const std::string good = ReadWholeFile(options.cabinet);
  const auto lint = [this](const std::string& cabinet) {
    scratch_.Write("p.cab", cabinet);
    server::Site site(scratch_.path());
    const auto served = site.Open("p.cab");
    return Ids(LintList("p.cab,\\P.cab,*," + std::to_string(served->crc32()) + "," +
                        std::to_string(served->size()) + "\r\n"));
  };
  const auto changed = [&good](const std::string& from, const std::string& to) {
    const std::size_t at = good.find(from);
    EXPECT_NE(at, std::string::npos) << from;
    return std::string(good).replace(at, to.size(), to);
  };

  EXPECT_THAT(lint("no cabinet"), Not(Contains("cabinet-broken"))) << "nothing installs it";
  job_ = Group("StartProcess",
               Field("Process", "\\Windows\\wceload.exe") + Field("Parameters", "/noui \\p.cab"));
  EXPECT_THAT(lint(good), Not(Contains(HasSubstr("cabinet"))));
  EXPECT_THAT(lint("no cabinet"), Contains("cabinet-broken"));
  EXPECT_THAT(lint(good.substr(0, 50)), Contains("cabinet-broken"));
  EXPECT_THAT(lint(changed("MSCE", "MSCF")), Contains("cabinet-compressed"));
  EXPECT_THAT(lint(changed("%CE1%", "%CX1%")), Contains("cabinet-macro"));
}

TEST_F(LintServedTest, FollowsTheFoldersThatAMulticastMakes) {
  scratch_.Write("a.txt", "hello\n");
  job_ = Group("MulticastClient", Field("Parameters", "-A=239.1.1.1 -P=7000 -HV=TQ52"));
  const auto line = [](const std::string& destination) {
    return "a.txt," + destination + ",*,909783072,6\r\n";
  };

  EXPECT_THAT(Ids(LintList(line("\\New\\a") + line("\\Temp\\New\\a"))), ElementsAre("size-short"));
  EXPECT_THAT(Ids(LintList(line("\\New\\sub\\a") + line("\\new\\a"))), ElementsAre("size-short"))
      << "short paths come first";
  const Findings deep = LintList(line("\\New\\sub\\a"));
  EXPECT_THAT(Ids(deep), ElementsAre("multicast-folder"));
  EXPECT_EQ(deep.all()[0].found, "\"\\New\\sub\\a\"");
}

TEST_F(LintServedTest, MissesTheTextOnlyWhereFilesAreForSomeDevices) {
  scratch_.Write("a.txt", "hello\n");
  job_ = Group("MulticastClient", Field("Parameters", "-A=239.1.1.1 -P=7000"));

  EXPECT_THAT(Ids(LintList(kHello)), IsEmpty());
  EXPECT_THAT(Ids(LintList("a.txt,\\a.txt,TQ5*,909783072,6\r\n")),
              ElementsAre("multicast-no-text"));
}

TEST_F(LintServedTest, ReadsTheListAsTheDeviceDoes) {
  scratch_.Write("a.txt", "hello\n");

  const Findings shifted = LintList(std::string(kHello) + "a.txt,\\b,,909783072,6\r\nx\r\n");
  EXPECT_THAT(Ids(shifted), ElementsAre("list-shift"));
  EXPECT_EQ(shifted.all()[0].where, "bundle.lst:2");
  EXPECT_THAT(Ids(LintList(std::string(kHello) + "a.txt,\\b,*,909783072\r\n")),
              ElementsAre("list-shift"));
  EXPECT_THAT(Ids(LintList(kHello + std::string("\0a.txt", 6))), ElementsAre("list-zero-byte"));
  EXPECT_THAT(Ids(LintList(kHello + std::string(260, 'p') + ",\\b,*,5,6\r\n")),
              ElementsAre("list-field-long"));
  EXPECT_THAT(Ids(LintList("\r\n\n" + std::string(kHello) + "\n")), IsEmpty());
  EXPECT_THAT(Ids(LintList(std::string(kHello) + "a.txt,\\A.TXT,*,909783072,0\r\n")),
              ElementsAre("duplicate-destination", "file-size"));
}

TEST_F(LintServedTest, MissesTheListItself) {
  server::Site site(scratch_.path());

  EXPECT_THAT(Ids(LintText(With(""), &site)), ElementsAre("list-missing"));
}

TEST_F(LintServedTest, TakesAnyBytesAsAList) {
  std::string bytes = kHello;
  for (int i = 0; i < 3000; ++i) bytes += static_cast<char>(i * 37 % 256);

  EXPECT_GE(LintList(bytes).all().size(), 1U);
  EXPECT_THAT(Ids(LintList("")), ElementsAre("size-reserve"));
}

}  // namespace
}  // namespace tools
