// ce_loader: its command line, what it shows of a DLL and what it makes of one.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "ce_loader/toy_dll.h"
#include "loader/program/check.h"
#include "loader/program/command_line.h"
#include "loader/program/listing.h"

namespace {

using testing::HasSubstr;

struct Read {
  bool good;
  loader::CommandLine line;
  std::string complaint;
};

Read ReadWords(std::vector<const char*> words) {
  words.insert(words.begin(), "ce_loader");
  Read read;
  read.good = loader::ReadCommandLine(static_cast<int>(words.size()), words.data(), read.line,
                                      read.complaint);
  return read;
}

TEST(CommandLineTest, TellsTaskDllDeviceAndPlace) {
  const Read read = ReadWords({"--check", "--base", "0x20040000", "--misaligned", "--device",
                               "/tmp/a", "--profile", "b", "c.dll"});
  ASSERT_TRUE(read.good) << read.complaint;
  EXPECT_EQ(read.line.task, loader::Task::kCheck);
  EXPECT_EQ(read.line.dll, "c.dll");
  EXPECT_EQ(read.line.device, "/tmp/a");
  EXPECT_EQ(read.line.profile, "b");
  EXPECT_EQ(read.line.options.base, 0x20040000U);
  EXPECT_TRUE(read.line.options.misaligned);
  EXPECT_EQ(ReadWords({"--list", "c.dll", "--base", "65536"}).line.options.base, 65536U);
}

TEST(CommandLineTest, LeavesTheRestToTheEnvironment) {
  ASSERT_EQ(setenv("ORVENIX_CE_BASE", "0x30000000", 1), 0);
  ASSERT_EQ(setenv("ORVENIX_CE_MISALIGNED", "1", 1), 0);
  const Read read = ReadWords({"--check", "c.dll"});
  EXPECT_EQ(read.line.options.base, 0x30000000U);
  EXPECT_TRUE(read.line.options.misaligned);
  ASSERT_EQ(setenv("ORVENIX_CE_MISALIGNED", "0", 1), 0);
  EXPECT_FALSE(ReadWords({"--check", "c.dll"}).line.options.misaligned);
}

TEST(CommandLineTest, ComplainsInOneLine) {
  EXPECT_EQ(ReadWords({"--check"}).complaint, "no DLL is named");
  EXPECT_EQ(ReadWords({"--chek", "a.dll"}).complaint, "there is no option --chek");
  EXPECT_EQ(ReadWords({"--list", "a.dll", "b.dll"}).complaint, "there are two DLLs");
  EXPECT_EQ(ReadWords({"--check", "a.dll", "--device"}).complaint, "--device lacks its value");
  for (const char* const wrong : {"0x", "0xg", "12a", "-1", "0x100000000", ""}) {
    EXPECT_EQ(ReadWords({"--check", "--base", wrong, "a.dll"}).complaint, "--base needs an address")
        << wrong;
  }
  EXPECT_TRUE(ReadWords({}).good);
  EXPECT_EQ(ReadWords({"--help"}).line.task, loader::Task::kHelp);
}

TEST(ListingTest, ShowsWhatADllSaysOfItself) {
  std::ostringstream out;
  loader::List(elf2pe::ReadPe(test::ToyDll()), out);
  EXPECT_THAT(out.str(), testing::StartsWith("toy.dll: machine 0x1c0, base 0x10000000, "));
  EXPECT_THAT(out.str(), HasSubstr("  0x1000 r-x .text, "));
  EXPECT_THAT(out.str(), HasSubstr(" ToyAddEight\n"));
  EXPECT_THAT(out.str(), HasSubstr("\nimports from COREDLL.dll\n"));
  EXPECT_THAT(out.str(), HasSubstr(" NotOnAnyDevice (not on this device)\n"));
  EXPECT_THAT(out.str(), HasSubstr(" CreateThread\n"));
}

class CheckTest : public testing::Test {
 protected:
  CheckTest() {
    line_.dll = folder_.path() / "toy.dll";
    std::ofstream(line_.dll, std::ios::binary) << test::ToyDll();
  }

  test::TemporaryFolder folder_;
  loader::CommandLine line_;
};

TEST_F(CheckTest, SaysEachStepOfWhatItDoesWithADll) {
  std::ostringstream out;
  EXPECT_TRUE(loader::Check(line_, out));
  EXPECT_EQ(out.str(),
            "ok      loaded and attached\n"
            "ok      found 16 exports\n"
            "ok      detached and unloaded\n"
            "ok      0 blocks of memory left behind\n"
            "ok      0 handles left behind\n"
            "ok      0 wrong frees\n");
}

TEST_F(CheckTest, FailsWhereThereIsNoPlaceForIt) {
  line_.options.base = 0x1001;
  std::ostringstream out;
  EXPECT_FALSE(loader::Check(line_, out));
  EXPECT_EQ(out.str(), "FAILED  loaded and attached\n");
}

TEST_F(CheckTest, KeepsADeviceThatIsNamed) {
  line_.device = folder_.path() / "device";
  std::ostringstream out;
  EXPECT_TRUE(loader::Check(line_, out));
  EXPECT_TRUE(std::filesystem::exists(line_.device / "storage/toy.dll"));
  line_.profile = folder_.path() / "none.profile";
  EXPECT_THROW(static_cast<void>(loader::Check(line_, out)), std::runtime_error);
}

}  // namespace
