// The phases that bring firmware packages, INF files and what they name, and count them beforehand.
#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "upgrade/engine/phases_test.h"
#include "upgrade/phases.h"

namespace upgrade {
namespace {

using std::chrono::seconds;
using test::Exists;
using test::GetFile;
using test::LogLinesWith;
using test::PutFile;
using test::ReadLog;
using test::StatusLines;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Optional;
// ---- firmware packages ----

class OsFilesTest : public PhasesTest {
 protected:
  void Add(const test::PackageOfJob& package) { test::AddPackage(job(), package); }
};

TEST_F(OsFilesTest, ShowAndLogTheServer) {
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_EQ(ReadLog(), "Server = !http://127.0.0.2!") << "without a line end";
  EXPECT_THAT(StatusLines(), ElementsAre("Server = !http://127.0.0.2!"));
}

TEST_F(OsFilesTest, ComeInNumberedParts) {
  server().Put("fw/os001.zip", "one");
  server().Put("fw/os002.zip", "two");
  Add({2, "os", "\\Images\\", "fw/", "-flash", ""});

  EXPECT_TRUE(FetchOsFiles(run()));

  EXPECT_THAT(GetFile("\\Images\\os001.zip"), Optional(std::string("one")));
  EXPECT_THAT(GetFile("\\Images\\os002.zip"), Optional(std::string("two")));
  EXPECT_STREQ(job().GetProcessParms(), " -flash") << "once, with a blank before it";
  EXPECT_THAT(StatusLines(), ElementsAre("Server = !http://127.0.0.2!", "\\Images\\os001.zip",
                                         "\\Images\\os002.zip"));
}

TEST_F(OsFilesTest, ComeWholeWithoutACount) {
  server().Put("fw/os.bin", "image");
  Add({0, "os.bin", "\\Images\\", "fw/", "", ""});
  Add({0, "", "\\Images\\", "fw/", "-never", ""});
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_THAT(GetFile("\\Images\\os.bin"), Optional(std::string("image")));
  EXPECT_STREQ(job().GetProcessParms(), "");
}

TEST_F(OsFilesTest, AreLeftOutWhenTheyBelongToAnotherPass) {
  server().Put("fw/one.bin", "1");
  server().Put("fw/two.bin", "2");
  Add({0, "one.bin", "\\", "fw/", "", "Pass=1"});
  Add({0, "two.bin", "\\", "fw/", "", "Pass=2"});
  test::SetMultiPass(job());
  run().pass = 2;
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_FALSE(Exists("\\one.bin"));
  EXPECT_TRUE(Exists("\\two.bin"));
}

TEST_F(OsFilesTest, ForACardAreLeftOutWithoutOne) {
  Add({0, "os.bin", "\\SDMMC Disk\\", "fw/", "-x", ""});
  Add({0, "os.bin", "\\Storage Card\\", "fw/", "-x", ""});
  Add({0, "os.bin", "\\SD Card\\", "fw/", "-x", ""});
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_THAT(server().received(), IsEmpty());
  EXPECT_STREQ(job().GetProcessParms(), "");

  server().Put("fw/os.bin", "image");
  run().storage_card = true;
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_EQ(server().received().size(), 3U);
}

TEST_F(OsFilesTest, InMemoryHaveTheMemoryDividedFirst) {
  Add({0, "os.bin", "RAM:", "fw/", "-x", ""});
  server().Put("fw/os.bin", "image");
  RunOutOfMemory();
  EXPECT_FALSE(FetchOsFiles(run()));
  EXPECT_EQ(device().faults().Count("SetSystemMemoryDivision"), 1U);
  EXPECT_STREQ(job().GetProcessParms(), " -x") << "although the fetch failed";
  EXPECT_THAT(LogLinesWith("Error getting file"), ElementsAre(HasSubstr("fw/os.bin")));
}

TEST_F(OsFilesTest, GoOnWithTheNextPartAfterAFailure) {
  server().Put("fw/os001.zip", "one");
  server().Put("fw/os002.zip", "two");
  Add({2, "os", "\\", "fw/", "", ""});
  device().faults().Add({"LocalAlloc", 3, 1, ERROR_OUTOFMEMORY});  // line, line, client
  EXPECT_TRUE(FetchOsFiles(run())) << "the last result counts";
  EXPECT_FALSE(Exists("\\os001.zip"));
  EXPECT_TRUE(Exists("\\os002.zip"));
  EXPECT_THAT(ReadLog(), HasSubstr("Error getting file fw/os001.zip\r\n"));
}

TEST_F(OsFilesTest, WithNamesThatDoNotFitArePassedOver) {
  Add({1, std::string(255, 'b'), "\\", std::string(255, 's'), "", ""});
  Add({0, std::string(255, 'b'), std::string(255, 'd'), "s", "", ""});
  Add({-5, "os", "\\", "fw/", "", ""});
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_THAT(server().received(), IsEmpty());
}

TEST_F(OsFilesTest, AddCommandLinesOnlyAsFarAsThereIsRoom) {
  server().Put("fw/os.bin", "image");
  for (int i = 0; i < 4; ++i) Add({0, "os.bin", "\\", "fw/", std::string(200, 'x'), ""});
  EXPECT_TRUE(FetchOsFiles(run()));
  EXPECT_LT(std::string(job().GetProcessParms()).size(), 260U);
}

// ---- the INF file ----

class InfTest : public PhasesTest {
 protected:
  void PutInf(const std::string& text) {
    server().Put("apps/inf/job.inf", text);
    test::SetInf(job(), "apps/inf/job.inf", "/Some/Folder/job.inf");
  }
};

TEST_F(InfTest, IsNothingWhenTheJobNamesNone) {
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 0U);
  EXPECT_THAT(server().received(), IsEmpty());
}

TEST_F(InfTest, LandsInTheRootAndIsCountedWithItsEntries) {
  PutInf("\"TQ52-A1\" \"x\" \"\\x\"\n\"MR4****\" \"y\" \"\\y\"\n\"*******\" \"z\" \"\\z\"\n");

  EXPECT_EQ(FetchInfFiles(run(), InfMode::kCountOnly), 3U) << "two entries and the file itself";

  EXPECT_TRUE(Exists("\\job.inf"));
  EXPECT_FALSE(Exists("\\x"));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("apps\\inf\\job.inf:1,1"));
  EXPECT_THAT(StatusLines(), ElementsAre("\\job.inf"));
}

TEST_F(InfTest, FetchesItsEntriesFromItsOwnFolder) {
  PutInf("\"TQ52-A1\" \"C:\\build\\x.cab\" \"\\Temp\\x.cab\"\n");
  server().Put("apps/inf/x.cab", "cabinet");
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 2U);
  EXPECT_THAT(GetFile("\\Temp\\x.cab"), Optional(std::string("cabinet")));
  EXPECT_THAT(StatusLines(), ElementsAre("\\job.inf", "\\Temp\\x.cab"));
}

TEST_F(InfTest, GoesOnAfterAnEntryThatWouldReplaceTheFileItself) {
  const std::string text =
      "\"TQ52-A1\" \"y.cab\" \"\\job.inf\"\n\"TQ52-A1\" \"y.cab\" \"\\\\JOB.INF\"\n"
      "\"TQ52-A1\" \"x.cab\" \"\\x.cab\"\n";
  PutInf(text);
  server().Put("apps/inf/x.cab", "cabinet");
  server().Put("apps/inf/y.cab", "not the list any more");
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 4U);
  EXPECT_THAT(GetFile("\\job.inf"), Optional(text)) << "it is being read";
  EXPECT_THAT(GetFile("\\x.cab"), Optional(std::string("cabinet")));
}

TEST_F(InfTest, GoesOnWhenAnEntryIsNotOnTheServer) {
  PutInf("\"TQ52-A1\" \"none.cab\" \"\\none.cab\"\n\"TQ52-A1\" \"x.cab\" \"\\x.cab\"\n");
  server().Put("apps/inf/x.cab", "cabinet");
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 3U);
  EXPECT_FALSE(Exists("\\none.cab"));
  EXPECT_TRUE(Exists("\\x.cab"));
}

TEST_F(InfTest, ThatCannotBeFetchedCountsAlone) {
  PutInf("\"TQ52-A1\" \"x.cab\" \"\\x.cab\"\n");
  RunOutOfMemory();
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 1U);
  EXPECT_THAT(ReadLog(), HasSubstr("Error getting inf file \\job.inf\r\n"));
}

TEST_F(InfTest, TriesAnEntryOnceMoreAfterAPathError) {
  PutInf("\"TQ52-A1\" \"x.cab\" \"\\Temp\\x.cab\"\n");
  server().Put("apps/inf/x.cab", "cabinet");
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kCountOnly), 2U);
  const std::uint64_t before = device().faults().Count("LocalAlloc");
  EXPECT_EQ(FetchInfFiles(run(), InfMode::kCountOnly), 2U);
  const std::uint64_t for_inf = device().faults().Count("LocalAlloc") - before;
  // The next allocations are the entry's status line and its buffer.
  for (const auto& [error, comes] : std::vector<std::pair<std::uint32_t, bool>>{
           {ERROR_PATH_NOT_FOUND, true}, {ERROR_BAD_PATHNAME, true}, {ERROR_OUTOFMEMORY, false}}) {
    device().faults().Clear();
    device().faults().Add({"LocalAlloc", for_inf + 2, 1, error});
    EXPECT_EQ(FetchInfFiles(run(), InfMode::kFetch), 2U);
    EXPECT_EQ(Exists("\\Temp\\x.cab"), comes) << error;
    device::File().DeleteFile("\\Temp\\x.cab", nullptr);
  }
}

// ---- other files ----

using MiscTest = PhasesTest;

TEST_F(MiscTest, FilesAreFetchedWhetherOrNotTheyAreThere) {
  PutFile("\\a.bin", "old");
  server().Put("a.bin", "new");
  job().AddDownloadFile(test::MakeFile({"a.bin", "\\a.bin", "XX", "0"}));
  job().AddDownloadFile(nullptr);
  EXPECT_TRUE(FetchMiscFiles(run()));
  EXPECT_THAT(GetFile("\\a.bin"), Optional(std::string("new")));
  EXPECT_THAT(StatusLines(), ElementsAre("\\a.bin"));
}

TEST_F(MiscTest, FailuresAreLoggedAndTheLastResultCounts) {
  job().AddDownloadFile(test::MakeFile({"dir/a.bin", "\\a.bin"}));
  RunOutOfMemory();
  EXPECT_FALSE(FetchMiscFiles(run()));
  EXPECT_THAT(ReadLog(), HasSubstr("Error getting some file dir/a.bin\r\n"));
}

TEST_F(MiscTest, NothingToFetchIsASuccess) {
  EXPECT_TRUE(FetchMiscFiles(run()));
}

// ---- counting ----

using CountTest = PhasesTest;

TEST_F(CountTest, TakesPackagesOfNegativeCountForNothingAndWrapsBehindHugeOnes) {
  test::AddPackage(job(), {-1, "a", "\\", "fw/", "", ""});
  test::AddPackage(job(), {-2147483647 - 1, "b", "\\", "fw/", "", ""});
  test::AddPackage(job(), {2147483647, "c", "\\", "fw/", "", ""});
  test::AddPackage(job(), {2147483647, "d", "\\", "fw/", "", ""});
  test::AddPackage(job(), {3, "e", "\\", "fw/", "", ""});
  CountFiles(run());
  EXPECT_EQ(run().files_to_fetch, 1U);
}

TEST_F(CountTest, AddsPartsInfEntriesAndFilesOfThisPass) {
  test::SetMultiPass(job());
  run().pass = 2;
  test::AddPackage(job(), {3, "os", "\\", "fw/", "", "Pass=2"});
  test::AddPackage(job(), {0, "x", "\\", "fw/", "", "Pass=2"});
  test::AddPackage(job(), {7, "y", "\\", "fw/", "", "Pass=1"});
  job().AddDownloadFile(test::MakeFile({"a", "\\a"}));
  job().AddDownloadFile(test::MakeFile({"b", "\\b"}));
  server().Put("job.inf", "\"TQ52-A1\" \"x\" \"\\x\"\n");
  test::SetInf(job(), "job.inf", "job.inf");

  CountFiles(run());

  EXPECT_EQ(run().files_to_fetch, 3U + 1U + 2U + 2U);
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("job.inf:1,4"))
      << "the packages are counted before the INF file is fetched";
}

}  // namespace
}  // namespace upgrade
