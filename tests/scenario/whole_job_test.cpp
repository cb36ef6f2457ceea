// Whole upgrades: what the host, the server, the screen and the device's folder see.
#include <gmock/gmock.h>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "power/power.h"
#include "product_support/status_lines.h"
#include "report/window/window_state.h"
#include "scenario/scenario_test.h"
#include "window/screen.h"

namespace {

using std::chrono::seconds;
using test::GetFile;
using test::HostJob;
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
using ::testing::StartsWith;

/// A job of four files: one right, one corrupt, one missing, one for other devices.
class WholeJobTest : public test::ScenarioTest {
 protected:
  WholeJobTest() {
    right_crc_ = server().Put("files/right.txt", "already right");
    corrupt_crc_ = server().Put("files/corrupt.bin", corrupt_);
    missing_crc_ = server().Put("files/missing.bin", missing_);
    PutFile("\\Data\\right.txt", "already right");
    PutFile("\\Data\\corrupt.bin", "damaged");
    job_.files = {{"files/right.txt", "\\Data\\right.txt", "*", right_crc_},
                  {"files/corrupt.bin", "\\Data\\corrupt.bin", "TQ5* MR4*", corrupt_crc_},
                  {"files/missing.bin", "\\New\\Deep\\missing.bin", "*", missing_crc_},
                  {"files/other.bin", "\\Data\\other.bin", "XX*", "7"}};
  }

  void ExpectAllFilesRight() {
    EXPECT_THAT(GetFile("\\Data\\right.txt"), Optional(std::string("already right")));
    EXPECT_THAT(GetFile("\\Data\\corrupt.bin"), Optional(corrupt_));
    EXPECT_THAT(GetFile("\\New\\Deep\\missing.bin"), Optional(missing_));
    EXPECT_FALSE(test::Exists("\\Data\\other.bin"));
  }

  const std::string corrupt_ = std::string(40000, 'c');
  const std::string missing_ = std::string(100, 'm');
  std::string right_crc_;
  std::string corrupt_crc_;
  std::string missing_crc_;
  HostJob job_;
};

TEST_F(WholeJobTest, RepairsTheDeviceAndReports) {
  IcfgInitialize();
  EXPECT_EQ(test::WalkJob(job_), ICFG_OK);
  EXPECT_EQ(test::EndJob(), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));

  ExpectAllFilesRight();
  EXPECT_THAT(server().RequestedPaths(),
              ElementsAre("files/corrupt.bin:1,1", "files/missing.bin:2,1"));
  const server::DeviceRecord& record = server().Device();
  EXPECT_EQ(record.report->bundle_rx, 40100U);
  EXPECT_TRUE(record.report->http_fallback);
  EXPECT_EQ(record.report->error, "");
  EXPECT_EQ(record.reports, 1U);
}

TEST_F(WholeJobTest, KeepsItsOwnBarWhenTheNextJobIsAnnounced) {
  job_.files = {{"late.bin", "\\late.bin", "*", test::CrcText("late")}};
  job_.required_space = "8";
  Start(job_);
  Sleep(20000);
  HostJob next;
  next.required_space = "1000000";
  EXPECT_EQ(Start(next), ICFG_OK) << "it waits for its turn";

  server().Put("late.bin", "late");
  while (GetFile("\\late.bin") != "late") Sleep(100);
  Sleep(1000);

  EXPECT_EQ(test::OverallProgress(), report::kBarUnits / 2) << "4 of 8 bytes";
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
}

TEST_F(WholeJobTest, ShowsItsStepsOnTheScreen) {
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(ShownLines(),
              ElementsAre("Upgrade Initialization...", "Validating files",
                          "Validating, \\Data\\right.txt", "Validating, \\Data\\corrupt.bin...",
                          "\\Data\\corrupt.bin", "Validating, \\New\\Deep\\missing...",
                          "\\New\\Deep\\missing.bin", "Upgrade Complete"))
      << "lines that are too long for the screen end in dots";
}

/// The log without what sending a message writes.
std::string WithoutMessages(std::string log) {
  for (const char* name : {"Orvenix - SetRWIStatus", "Orvenix - SendDeviceEvent"}) {
    const std::string begin = std::string(name) + " - entering\r\n";
    const std::string last = name == std::string("Orvenix - SetRWIStatus")
                                 ? "Orvenix - SetRWIStatus - send msg lapi write\r\n"
                                 : "</DevInfo>\r\n";
    for (std::size_t at = log.find(begin); at != std::string::npos; at = log.find(begin)) {
      log.erase(at, log.find(last, at) + last.size() - at);
    }
  }
  return log;
}

TEST_F(WholeJobTest, LogsItsStepsInOrder) {
  job_.files.resize(1);
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  const std::string log = WithoutMessages(ReadLog());
  const std::size_t start = log.find("Orvenix - StartUpgradeThread\r\n");
  ASSERT_NE(start, std::string::npos);
  const std::string_view report_begin = "Orvenix - SendUpgradeComplete - Entering\r\n";
  const std::size_t report = log.find(report_begin);
  ASSERT_NE(report, std::string::npos);
  EXPECT_EQ(log.substr(start, report - start),
            "Orvenix - StartUpgradeThread\r\n"
            "Orvenix thread - Started\r\n"
            "Orvenix - CretaeUpgradeInProgressEvent - Success\r\n"
            "Orvenix - UpgradeThread - InitRAM\r\n"
            "Multicast Fallback Mode...Orvenix - UpgradeThread - Validate Files\r\n"
            "Orvenix - ValidateFiles - Entering\r\n"
            "Orvenix - ValidateFiles - LoadFileList\r\n"
            "Orvenix - ValidateFiles - check file !\\Data\\right.txt!\r\n"
            "Orvenix - Rename settings file\r\n"
            "Orvenix - SendUpgradeComplete\r\n");
  const std::string report_end = "Orvenix - SendUpgradeComplete - Exiting\r\n";
  EXPECT_EQ(log.substr(log.find(report_end)), report_end +
                                                  "Local Upgrade Executing\r\n"
                                                  "Orvenix - StartUpgrade - Entering\r\n"
                                                  "Orvenix - StartUpgrade - Exiting\r\n"
                                                  "Orvenix - UpgradeThread - Exiting\r\n"
                                                  "Orvenix - DeleteUpgradeInProgressEvent\r\n"
                                                  "CloseTransferHandle");
}

TEST_F(WholeJobTest, SendsExactlyTheseBytes) {
  job_.files.erase(job_.files.begin(), job_.files.begin() + 2);
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ASSERT_EQ(server().received().size(), 2U);
  const server::Identity& identity = server().Device().identity;
  EXPECT_EQ(server().received()[0],
            "GET files/missing.bin:1,1 HTTP/1.1\r\nHost: 2.0.0.127\r\n"
            "User-Agent: UpgradeClient\r\nAccept: */*\r\nConnection: Keep-Alive\r\n"
            "Type: " +
                identity.type + "\r\nFamily: " + identity.family + "\r\nModel: " + identity.model +
                "\r\nSerialNum: " + identity.serial + "\r\nCore-name: " + identity.core_name +
                "\r\nBundle-rx: 0\r\nHTTP-fallback: 1\r\nCache-Control: no-cache\r\n\r\n");
  EXPECT_EQ(server().received()[1],
            "GET HTTP/1.1\r\nCore-name: " + identity.core_name +
                "\r\nBundle-rx: 100\r\nHTTP-fallback: 1\r\nBundle-transfer: COMPLETE\r\n\r\n");
}

TEST_F(WholeJobTest, ReportsNoBytesWhenNothingWasMissing) {
  job_.files.resize(1);
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(server().Device().report->bundle_rx, 0U);
  EXPECT_TRUE(server().Device().report->http_fallback);
  EXPECT_EQ(server().received().size(), 1U);
}

TEST_F(WholeJobTest, LeavesNothingBehind) {
  const test::Holdings before = test::HoldingsOf(device());
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  EXPECT_FALSE(test::Exists("\\kvoupgclnt.txt"));
}

TEST_F(WholeJobTest, KeepsTheDeviceAwakeWhileItRuns) {
  server().Remove("files/missing.bin");
  After(seconds(100), [this] { server().Put("files/missing.bin", missing_); });
  Start(job_);
  Sleep(50000);
  EXPECT_THAT(device().kernel().NamedObjects(), Contains("TW_UPGRADE_IN_PROGRESS"));
  ASSERT_EQ(device().power().Held().size(), 1U);
  EXPECT_EQ(device().power().Held()[0].device, u"BKL1:");
  EXPECT_EQ(device().power().Held()[0].state, D0);
  EXPECT_EQ(device().power().IdleTimerResets(), 4U) << "at 0, 15, 30 and 45 seconds";
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(device().power().Held(), IsEmpty());
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, ShowsNoWindowWhenTheJobSaysSo) {
  job_.show_gui = false;
  server().Remove("files/missing.bin");
  After(seconds(30), [this] { server().Put("files/missing.bin", missing_); });
  Start(job_);
  Sleep(10000);
  for (const sim::WindowInfo& window : device().screen().Windows()) {
    EXPECT_FALSE(window.visible);
  }
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, RefusesASecondUpgradeWhileOneRuns) {
  server().Remove("files/missing.bin");
  After(seconds(60), [this] { server().Put("files/missing.bin", missing_); });
  Start(job_);
  Sleep(5000);
  EXPECT_EQ(test::WalkJob(job_), ICFG_UPGRADE_RUNNING);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_EQ(server().Device().reports, 1U);
}

TEST_F(WholeJobTest, RunsTwiceInOneProcess) {
  const test::Holdings before = test::HoldingsOf(device());
  for (int round = 0; round < 2; ++round) {
    PutFile("\\Data\\corrupt.bin", "damaged again");
    EXPECT_EQ(Start(job_), ICFG_OK);
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
    ExpectAllFilesRight();
    EXPECT_EQ(server().Device().report->bundle_rx, round == 0 ? 40100U : 40000U);
  }
  EXPECT_EQ(server().Device().reports, 2U);
  EXPECT_EQ(test::HoldingsOf(device()), before);
}

TEST_F(WholeJobTest, RunsAJobThatIsHandedOverWhileTheLastIsPuttingThingsAway) {
  const test::Holdings before = test::HoldingsOf(device());
  Start(job_);
  while (test::WalkJob(job_) != ICFG_OK) {
    test::DropKeptJob();
    Sleep(100);
  }
  EXPECT_GT(device().kernel().LiveThreads(), 1U) << "the first thread has not ended";
  PutFile("\\Data\\corrupt.bin", "damaged again");
  EXPECT_EQ(test::EndJob(), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_EQ(server().Device().reports, 2U);
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_THAT(LogLinesWith("Orvenix thread - Started"), ::testing::SizeIs(2));
  EXPECT_THAT(LogLinesWith("event - error"), IsEmpty());
}

TEST_F(WholeJobTest, RunsAJobOnceThoughItsGroupWasEndedTwice) {
  const test::Holdings before = test::HoldingsOf(device());
  Start(job_);
  EXPECT_EQ(IcfgEndGroup("Upgrade", 0, 0), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_EQ(server().Device().reports, 1U);
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(WholeJobTest, RunsASecondJobAfterALongOne) {
  const test::Holdings before = test::HoldingsOf(device());
  server().Remove("files/missing.bin");
  After(seconds(120), [this] { server().Put("files/missing.bin", missing_); });
  Start(job_);
  Sleep(1000);
  HostJob second = job_;
  const std::string crc = server().Put("files/second.bin", "second");
  second.files = {{"files/second.bin", "\\second.bin", "*", crc}};
  EXPECT_EQ(test::WalkJob(second), ICFG_UPGRADE_RUNNING);
  EXPECT_EQ(test::EndJob(), ICFG_OK) << "a host that ends a refused group starts its job";
  EXPECT_FALSE(test::Exists("\\second.bin"));
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_THAT(GetFile("\\second.bin"), Optional(std::string("second")));
  EXPECT_EQ(server().Device().reports, 2U);
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(WholeJobTest, TakesFilesFromAListFile) {
  const std::string list = "files/corrupt.bin,\\Data\\corrupt.bin,TQ5*," + corrupt_crc_ +
                           ",40000\r\nfiles/missing.bin,\\New\\Deep\\missing.bin,*," +
                           missing_crc_ + ",100\r\n";
  const std::string list_crc = server().Put("files/list.txt", list);
  job_.files.clear();
  job_.list = test::HostFile{"files/list.txt", "\\list.txt", "*", list_crc};
  EXPECT_EQ(Start(job_), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_THAT(GetFile("\\list.txt"), Optional(list));
}

TEST_F(WholeJobTest, AppliesRenames) {
  const std::string crc = server().Put("files/settings.xml", "settings");
  job_.files = {{"files/settings.xml", "\\settings.xml.rename", "*", crc}};
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(GetFile("\\settings.xml"), Optional(std::string("settings")));
}

TEST_F(WholeJobTest, GoesOnWithoutItsEventItsLightAndItsKeepAwakeThread) {
  device().faults().Add({"CreateEventW", 1, 1, ERROR_ACCESS_DENIED});
  device().faults().Add({"SetPowerRequirement", 1, 1, ERROR_NOT_SUPPORTED});
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - CretaeUpgradeInProgressEvent - error, 5\r\n"));
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("SetPowerRequirement failed: 32\n"));
}

TEST_F(WholeJobTest, SaysWhenTheLightCannotBeReleased) {
  device().faults().Add({"ReleasePowerRequirement", 1, 1, ERROR_INVALID_HANDLE});
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("ReleasePowerRequirement failed: 6\n"));
}

// ---- servers that misbehave ----

TEST_F(WholeJobTest, SurvivesConnectionsThatAreResetInTheMiddle) {
  for (std::uint64_t nth = 1; nth <= 3; ++nth) {
    network().AddFault({test::kServerAddress, sim::kLocalHost, 5000 * nth,
                        sim::StreamFaultKind::kReset, sim::Micros{0}, nth});
  }
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, SurvivesConnectionsThatEndInTheMiddle) {
  network().AddFault(
      {test::kServerAddress, sim::kLocalHost, 100, sim::StreamFaultKind::kEnd, sim::Micros{0}, 1});
  network().AddFault({test::kServerAddress, sim::kLocalHost, 20000, sim::StreamFaultKind::kEnd,
                      sim::Micros{0}, 2});
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, SurvivesAServerThatStalls) {
  network().AddFault(
      {test::kServerAddress, sim::kLocalHost, 20000, sim::StreamFaultKind::kStall, seconds(50), 1});
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, SurvivesAServerThatAnswersRubbish) {
  server().TreatNext(5, test::AnswerWith(std::string(2000, '\xFF'), test::Afterwards::kEnd));
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  ExpectAllFilesRight();
}

TEST_F(WholeJobTest, SurvivesAServerThatIsAwayForAnHour) {
  network().SetHost(test::kServerAddress, sim::HostState::kSilent);
  After(seconds(3600), [this] { network().SetHost(test::kServerAddress, sim::HostState::kUp); });
  Start(job_);
  ASSERT_TRUE(test::AwaitEndOfJobs(device(), 8000));
  ExpectAllFilesRight();
}

}  // namespace
