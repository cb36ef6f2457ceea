// What a job does to a device before its files arrive: tests, programs ended, files deleted.
#include <gmock/gmock.h>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_thread.h"
#include "process/processes.h"
#include "product_support/jobs.h"
#include "product_support/messages.h"
#include "scenario/scenario_test.h"

namespace {

using test::Exists;
using test::GetFile;
using test::LogLines;
using test::LogLinesWith;
using test::PutFile;
using test::ReadLog;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Optional;

/// A device with an old application, and a job that replaces it.
class PreparedDeviceTest : public test::ScenarioTest {
 protected:
  PreparedDeviceTest() : ScenarioTest(WithPrograms()) {
    StoreSystem(7);
    PutFile("\\Apps\\old.bin", "old");
    PutFile("\\Apps\\Data\\settings", "mine");
    PutFile("\\Apps\\Data\\cache", "old");
    const std::string crc = server().Put("files/new.bin", "new");
    job_.files = {{"files/new.bin", "\\Apps\\new.bin", "*", crc}};
    job_.stop = {"app.exe"};
    job_.cleared = {"\\Apps"};
    job_.saved = {"\\apps\\data\\SETTINGS"};
    job_.tests = {{"Software\\Orvenix", "System", "REG_DWORD", "GTE", "7", "needs system 7"}};
  }

  static sim::Profile WithPrograms() {
    sim::Profile profile;
    profile.processes = {{"app.exe"}, {"other.exe"}};
    return profile;
  }

  static void StoreSystem(DWORD number) {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                    nullptr, &key, nullptr);
    RegSetValueExW(key, TEXT("System"), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&number),
                   sizeof number);
    RegCloseKey(key);
  }

  std::vector<std::string> Running() {
    std::vector<std::string> names;
    for (const auto& entry : device().processes().List()) names.push_back(entry.name);
    return names;
  }

  void ExpectOldApplication() {
    EXPECT_THAT(Running(), ElementsAre("host.exe", "app.exe", "other.exe"));
    EXPECT_THAT(GetFile("\\Apps\\old.bin"), Optional(std::string("old")));
    EXPECT_THAT(GetFile("\\Apps\\Data\\cache"), Optional(std::string("old")));
    EXPECT_FALSE(Exists("\\Apps\\new.bin"));
    EXPECT_THAT(server().RequestedPaths(), IsEmpty());
  }

  void ExpectNewApplication() {
    EXPECT_THAT(Running(), ElementsAre("host.exe", "other.exe"));
    EXPECT_FALSE(Exists("\\Apps\\old.bin"));
    EXPECT_FALSE(Exists("\\Apps\\Data\\cache"));
    EXPECT_THAT(GetFile("\\Apps\\Data\\settings"), Optional(std::string("mine")));
    EXPECT_THAT(GetFile("\\Apps\\new.bin"), Optional(std::string("new")));
  }

  /// The same job as an outside caller makes it.
  UpgradeConfig* NewClientJob() {
    auto* const job = new UpgradeConfig;
    job->SetBaseURL(test::kServerUrl);
    for (const test::HostTest& t : job_.tests) {
      test::AddTest(*job, {"HKEY_LOCAL_MACHINE", t.key, t.value_name, t.type, t.operation, t.value,
                           t.message});
    }
    job->AddStopProcess("app.exe");
    job->AddFileDelete("\\Apps");
    job->AddFileSave("\\apps\\data\\SETTINGS");
    job->AddDownloadFile(test::MakeFile({"files/new.bin", "\\Apps\\new.bin"}));
    return job;
  }

  void RunAsClient(UpgradeConfig* job) {
    HANDLE const thread = StartUpgradeThread(job, 1);
    ASSERT_NE(thread, nullptr);
    CloseHandle(thread);
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  }

  test::HostJob job_;
};

TEST_F(PreparedDeviceTest, IsTestedAndCleanedBeforeTheUpgradeBegins) {
  EXPECT_EQ(Start(job_), ICFG_OK);
  EXPECT_FALSE(Exists("\\Apps\\old.bin")) << "by the host's own thread";
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectNewApplication();
  EXPECT_EQ(server().Device().report->error, "");
}

TEST_F(PreparedDeviceTest, IsLeftAsItIsWhenATestFails) {
  StoreSystem(6);
  const test::Holdings before = test::HoldingsOf(device());
  EXPECT_EQ(Start(job_), ICFG_TEST_FAILED);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectOldApplication();
  EXPECT_THAT(LogLinesWith("needs system 7"), Contains("needs system 7"));

  test::DropKeptJob();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  StoreSystem(7);
  EXPECT_EQ(Start(job_), ICFG_OK) << "the next attempt stands on its own";
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectNewApplication();
}

TEST_F(PreparedDeviceTest, LosesTheLogOfBeforeWhenTheWholeDeviceIsCleared) {
  job_.cleared = {"\\"};
  EXPECT_EQ(Start(job_), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectNewApplication();
  EXPECT_EQ(LogLines().front(), "Orvenix - CheckSpace");
}

TEST_F(PreparedDeviceTest, IsTestedCountedAndCleanedInThisOrderForAnOutsideCaller) {
  server().Put("files/job.inf", "\"*******\" \"x.cab\" \"\\x.cab\"\n");
  server().Put("files/x.cab", "cabinet");
  UpgradeConfig* const job = NewClientJob();
  test::SetInf(*job, "files/job.inf", "job.inf");
  job->AddFileDelete("\\job.inf");

  RunAsClient(job);

  ExpectNewApplication();
  EXPECT_THAT(ReadLog(), HasSubstr("UpgradeClient Mode...PerformTests - 1\r\n"));
  EXPECT_THAT(ShownLines(), Contains("Cleaning device..."));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("files\\job.inf:1,0", "files\\job.inf:2,3",
                                                     "files\\x.cab:3,3", "files/new.bin:4,3"))
      << "once to count, and once more since it has been deleted";
  EXPECT_THAT(GetFile("\\x.cab"), Optional(std::string("cabinet")));
  EXPECT_EQ(server().Device().report->error, "");
}

TEST_F(PreparedDeviceTest, FailsForAnOutsideCallerWhenATestFails) {
  StoreSystem(6);
  PutFile("\\kvoupgclnt.txt", "1");
  UpgradeConfig* const job = NewClientJob();
  test::SetMultiPass(*job);
  test::AddPackage(*job, {0, "os.bin", "RAM:", "fw/", "", "Pass=2,RAMAllocSize=5"});

  RunAsClient(job);

  ExpectOldApplication();
  EXPECT_FALSE(Exists("\\kvoupgclnt.txt")) << "the next job begins at its first pass";
  EXPECT_EQ(server().Device().report->error, "needs system 7") << "the report is sent all the same";
  EXPECT_FALSE(server().Device().report->http_fallback);
  EXPECT_THAT(ShownLines(), Contains("needs system 7"));
  EXPECT_THAT(ShownLines(), Contains("Upgrade Complete"));
  EXPECT_THAT(ShownLines(), Not(Contains("Cleaning device...")));
  const std::string log = ReadLog();
  EXPECT_THAT(log, HasSubstr("Orvenix - PerformTests - failed test\r\nneeds system 7\r\n"
                             "Orvenix - SendUpgradeComplete\r\n"));
  EXPECT_THAT(log, Not(HasSubstr("Processing OS files")));
  EXPECT_THAT(log, Not(HasSubstr("Local Upgrade Executing")));
  EXPECT_THAT(LogLines(), Contains("needs system 7").Times(2)) << "found, and at the end";
}

TEST_F(PreparedDeviceTest, FailsForAnOutsideCallerWhateverTheMessageOfTheTestSays) {
  StoreSystem(6);
  for (const std::string message : {"", "first\r\nsecond\r\n", "100%s"}) {
    const test::MessageRecord record(device());
    job_.tests.front().message = message;
    RunAsClient(NewClientJob());
    ExpectOldApplication();
    EXPECT_THAT(ShownLines(), Contains(message)) << message;
    EXPECT_EQ(record.Lines().back(),
              "TW_CLIENT: " + test::StatusText(1, "Upgrade Failed: " + message));
  }
}

TEST_F(PreparedDeviceTest, LosesWhatItHasFetchedWhenTheHostEndsTheSameUpgradeAgain) {
  EXPECT_EQ(Start(job_), ICFG_OK);
  for (int s = 0; s < 600 && !Exists("\\Apps\\new.bin"); ++s) Sleep(100);
  ASSERT_TRUE(Exists("\\Apps\\new.bin"));
  EXPECT_EQ(IcfgEndGroup("Upgrade", 0, 0), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_FALSE(Exists("\\Apps\\new.bin"));
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(PreparedDeviceTest, BeginsAtItsFirstPassForEverWhenItsPassStateIsCleared) {
  server().Put("fw/os1.bin", "first");
  server().Put("fw/os2.bin", "second");
  const auto run = [this](const char* saved) {
    UpgradeConfig* const job = NewClientJob();
    test::SetMultiPass(*job);
    test::AddPackage(*job, {0, "os1.bin", "\\", "fw/", "", "Pass=1"});
    test::AddPackage(*job, {0, "os2.bin", "\\", "fw/", "", "Pass=2"});
    job->AddFileDelete("\\");
    if (saved != nullptr) job->AddFileSave(saved);
    RunAsClient(job);
    return test::GetFile("\\kvoupgclnt.txt").value_or("none");
  };
  EXPECT_EQ(run(nullptr), "none");
  EXPECT_THAT(ShownLines(), Contains("Start, CurrentPass = 1"));
  EXPECT_EQ(run(nullptr), "none");
  EXPECT_THAT(ShownLines(), Not(Contains("Start, CurrentPass = 2")));
  EXPECT_EQ(run("\\kvoupgclnt.txt"), "1") << "unless the file is saved";
  EXPECT_EQ(run("\\kvoupgclnt.txt"), "2");
}

TEST_F(PreparedDeviceTest, IsNeitherTestedNorCleanedByTheThreadOfAHostsJob) {
  EXPECT_EQ(Start(job_), ICFG_OK);
  PutFile("\\Apps\\later", "x");
  StoreSystem(6);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_TRUE(Exists("\\Apps\\later"));
  EXPECT_THAT(LogLinesWith("PerformTests - "), ElementsAre("PerformTests - 1"));
}

}  // namespace
