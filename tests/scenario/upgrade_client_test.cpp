// Upgrades that an outside program starts: everything by HTTP, in one or several passes.
#include <gmock/gmock.h>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/upgrade_thread.h"
#include "product_support/jobs.h"
#include "scenario/scenario_test.h"

namespace {

using test::GetFile;
using test::PutFile;
using test::ReadLog;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::Optional;

class UpgradeClientTest : public test::ScenarioTest {
 protected:
  UpgradeClientTest() : UpgradeClientTest(WithFlash()) {}
  explicit UpgradeClientTest(const sim::Profile& profile) : ScenarioTest(profile) {}

  static sim::Profile WithFlash() {
    sim::Profile profile;
    profile.volumes = {{"\\Flash File Store", 1000000, true}};
    return profile;
  }

  static UpgradeConfig* NewJob() {
    auto* const job = new UpgradeConfig;
    job->SetBaseURL(test::kServerUrl);
    return job;
  }

  void Run(UpgradeConfig* job, std::int32_t mode = 1) {
    HANDLE const thread = StartUpgradeThread(job, mode);
    ASSERT_NE(thread, nullptr);
    CloseHandle(thread);
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  }
};

TEST_F(UpgradeClientTest, FetchesPackagesInfEntriesAndFiles) {
  server().Put("fw/os001.zip", "part one");
  server().Put("fw/os002.zip", "part two");
  server().Put("apps/job.inf", "\"*******\" \"x.cab\" \"\\Temp\\x.cab\"\n");
  server().Put("apps/x.cab", "cabinet");
  server().Put("misc/a.txt", "text");
  UpgradeConfig* const job = NewJob();
  test::AddPackage(*job, {2, "os", "\\Images\\", "fw/", "", ""});
  test::SetInf(*job, "apps/job.inf", "job.inf");
  job->AddDownloadFile(test::MakeFile({"misc/a.txt", "\\a.txt"}));

  Run(job);

  EXPECT_THAT(GetFile("\\Images\\os001.zip"), Optional(std::string("part one")));
  EXPECT_THAT(GetFile("\\Images\\os002.zip"), Optional(std::string("part two")));
  EXPECT_THAT(GetFile("\\Temp\\x.cab"), Optional(std::string("cabinet")));
  EXPECT_THAT(GetFile("\\a.txt"), Optional(std::string("text")));
  EXPECT_THAT(server().RequestedPaths(),
              ElementsAre("apps\\job.inf:1,2", "fw/os001.zip:2,5", "fw/os002.zip:3,5",
                          "apps\\job.inf:4,5", "apps\\x.cab:5,5", "misc/a.txt:6,5"));
  EXPECT_FALSE(server().Device().report->http_fallback);
  const std::string log = ReadLog();
  EXPECT_THAT(log, HasSubstr("UpgradeClient Mode..."));
  EXPECT_THAT(log, HasSubstr("Processing OS files...Server = !http://127.0.0.2!"));
  EXPECT_THAT(log, HasSubstr("Processing INF files\r\n"));
  EXPECT_THAT(log, HasSubstr("Processing misc files\r\n"));
}

TEST_F(UpgradeClientTest, ShowsItsPhases) {
  UpgradeConfig* const job = NewJob();
  Run(job);
  EXPECT_THAT(ShownLines(), Contains("Processing OS files"));
  EXPECT_THAT(ShownLines(), Contains("Processing INF files..."));
  EXPECT_THAT(ShownLines(), Contains("Processing misc files..."));
}

TEST_F(UpgradeClientTest, CountsThePassesOfAJobOverRestarts) {
  server().Put("fw/one.bin", "1");
  server().Put("fw/two.bin", "2");
  for (int pass = 1; pass <= 2; ++pass) {
    UpgradeConfig* const job = NewJob();
    test::SetMultiPass(*job);
    test::AddPackage(*job, {0, "one.bin", "\\", "fw/", "", "Pass=1"});
    test::AddPackage(*job, {0, "two.bin", "\\", "fw/", "", "Pass=2"});
    Run(job);
    EXPECT_TRUE(test::Exists("\\one.bin"));
    EXPECT_EQ(test::Exists("\\two.bin"), pass == 2);
    EXPECT_THAT(GetFile("\\kvoupgclnt.txt"), Optional(std::to_string(pass)));
    Restart();
  }
}

TEST_F(UpgradeClientTest, SavesNetworkParametersInTheFirstPassOfAFamilyThatBeginsWithSeven) {
  for (const bool shown : {true, false}) {
    UpgradeConfig* const job = NewJob();
    test::SetMultiPass(*job);
    test::SetFamily(*job, "7xx");
    Run(job);
    if (shown) {
      EXPECT_THAT(ShownLines(), Contains("Saving Network Parms..."));
    } else {
      EXPECT_THAT(GetFile("\\Flash File Store\\kvoupgclnt.txt"), Optional(std::string("2")));
    }
  }
}

TEST_F(UpgradeClientTest, DeletesThePassOfAnEarlierJobWhenAJobHasOnePass) {
  PutFile("\\kvoupgclnt.txt", "4");
  Run(NewJob());
  EXPECT_FALSE(test::Exists("\\kvoupgclnt.txt"));
}

TEST_F(UpgradeClientTest, PausesForTheEyeOnlyWhenThereIsAWindow) {
  UpgradeConfig* const job = NewJob();
  const auto begin = world().now();
  Run(job);
  const auto with_window = world().now() - begin;
  UpgradeConfig* const unseen = NewJob();
  unseen->SetShowGUI(0);
  const auto middle = world().now();
  Run(unseen);
  const auto without = world().now() - middle;
  EXPECT_GE(with_window - without, std::chrono::milliseconds(3500));
}

TEST_F(UpgradeClientTest, IsNotStartedWithoutAJob) {
  EXPECT_EQ(StartUpgradeThread(nullptr, 1), nullptr);
}

TEST_F(UpgradeClientTest, LeavesTheJobWithTheCallerWhenThereIsNoThread) {
  const test::Holdings before = test::HoldingsOf(device());
  UpgradeConfig* const job = NewJob();
  device().faults().Add({"CreateThread", 2, 1, 0});  // the first is the window's
  EXPECT_EQ(StartUpgradeThread(job, 1), nullptr);
  delete job;
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(test::HoldingsOf(device()), before);
  Run(NewJob());
}

/// Jobs that wait for one which asks for a file that the server does not have yet.
class WaitingJobsTest : public UpgradeClientTest {
 protected:
  WaitingJobsTest() : first_(NewJob()) {
    first_->AddDownloadFile(test::MakeFile({"late.bin", "\\late.bin"}));
  }

  static HANDLE Start(UpgradeConfig* job) { return StartUpgradeThread(job, 1); }
  static void Hand(UpgradeConfig* job) {
    HANDLE const thread = Start(job);
    ASSERT_NE(thread, nullptr);
    CloseHandle(thread);
  }
  void HandFirst() {
    Hand(first_);
    Sleep(5000);  // its thread is at its first file now and makes no threads any more
  }
  void LetTheFirstEnd() { server().Put("late.bin", "late"); }

  /// A job that leaves a trace.
  static UpgradeConfig* NewDeletingJob(const std::string& path) {
    PutFile(path, "x");
    UpgradeConfig* const job = NewJob();
    job->AddFileDelete(path.c_str());
    return job;
  }

 private:
  UpgradeConfig* const first_;
};

TEST_F(WaitingJobsTest, RunOneAfterTheOtherAndTheNinthIsRefused) {
  const test::Holdings before = test::HoldingsOf(device());
  HandFirst();
  for (int i = 2; i <= 8; ++i) Hand(NewDeletingJob("\\" + std::to_string(i) + ".txt"));
  UpgradeConfig* const ninth = NewDeletingJob("\\9.txt");
  EXPECT_EQ(Start(ninth), nullptr);
  EXPECT_TRUE(test::Exists("\\2.txt")) << "the first still runs";

  LetTheFirstEnd();
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));

  for (int i = 2; i <= 8; ++i) EXPECT_FALSE(test::Exists("\\" + std::to_string(i) + ".txt")) << i;
  EXPECT_TRUE(test::Exists("\\9.txt"));
  Run(ninth);  // it stayed with the caller, who may try again
  EXPECT_FALSE(test::Exists("\\9.txt"));
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_LE(test::HoldingsOf(device()).handles, before.handles);
}

TEST_F(WaitingJobsTest, AreNotHeldUpByOneThatGotNoThread) {
  HandFirst();
  UpgradeConfig* const second = NewDeletingJob("\\2.txt");
  device().faults().Add({"CreateThread", 1, 1, ERROR_NOT_ENOUGH_MEMORY});
  EXPECT_EQ(Start(second), nullptr);
  Hand(NewDeletingJob("\\3.txt"));

  LetTheFirstEnd();
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));

  EXPECT_TRUE(test::Exists("\\2.txt"));
  EXPECT_FALSE(test::Exists("\\3.txt"));
  Run(second);
  EXPECT_FALSE(test::Exists("\\2.txt"));
}

}  // namespace
