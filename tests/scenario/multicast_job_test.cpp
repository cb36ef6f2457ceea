// Whole upgrades whose files come by multicast first: what did not arrive, or not whole, comes by
// HTTP.
#include <gmock/gmock.h>

#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "kernel/kernel.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "product_support/status_lines.h"
#include "report/window/window_state.h"
#include "scenario/scenario_test.h"
#include "server/multicast_run.h"
#include "tools/fleet/fleet.h"
#include "tools/virtual_multicast.h"

namespace {

using std::chrono::seconds;
using test::GetFile;
using test::HostJob;
using test::LogLinesWith;
using test::ReadLog;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Optional;

sim::Profile DeviceProfile() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  return profile;
}

class MulticastJobTest : public test::ScenarioTest {
 protected:
  MulticastJobTest() : ScenarioTest(DeviceProfile()) {
    network().SetDefaultLink(fleet::Plan::DefaultLink());
    job_.multicast = "-A=239.1.1.1 -P=7000 -HV=TQ52";
    job_.required_space = "100000";
  }
  ~MulticastJobTest() override { port_.reset(); }

  /// A file of the job, on the HTTP server, of `size` bytes.
  std::string AddToJob(const std::string& name, std::size_t size) {
    const std::string content = fleet::Noise(size, name.size() + size);
    const std::string crc = server().Put("files/" + name, content);
    job_.files.push_back({"files/" + name, "\\Data\\" + name, "*", crc});
    return content;
  }
  void AddToMulticast(const std::string& name, const std::string& content,
                      const std::string& masks = "") {
    files_.push_back(
        {"\\Data\\" + name, masks, 0x20, "2006-03-01 14:05:09", server::MemoryContent(content)});
  }
  /// The multicast server begins ten seconds after the job.
  void StartBoth() {
    server::MulticastOptions options;
    options.start.expected = 1;
    options.seed = 1;
    run_ = std::make_unique<server::MulticastRun>(options, files_);
    run_->SetListener(listener_);
    port_ =
        std::make_unique<tools::VirtualMulticast>(world(), sim::Endpoint{0x0A000002, 7001}, *run_);
    After(seconds(10), [this] { port_->Start(); });
    EXPECT_EQ(Start(job_), ICFG_OK);
  }
  void RunBoth() {
    StartBoth();
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  }

  HostJob job_;
  std::vector<server::MulticastFile> files_;
  server::MulticastListener listener_;
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<tools::VirtualMulticast> port_;
};

TEST_F(MulticastJobTest, NeedsNoHttpWhenEverythingArrives) {
  const std::string a = AddToJob("a.bin", 30000);
  const std::string b = AddToJob("b.bin", 70000);
  AddToMulticast("a.bin", a);
  AddToMulticast("b.bin", b);
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_THAT(GetFile("\\Data\\b.bin"), Optional(b));
  EXPECT_THAT(server().RequestedPaths(), IsEmpty());
  EXPECT_EQ(server().Device().report->bundle_rx, 0U);
  EXPECT_TRUE(server().Device().report->http_fallback);
  EXPECT_TRUE(run_->finished());
  EXPECT_EQ(run_->figures().files.back().Count(server::DeviceState::kProven), 1U);
}

TEST_F(MulticastJobTest, RepairsByHttpWhatIsMissingAndWhatIsSpoilt) {
  const std::string whole = AddToJob("whole.bin", 40000);
  const std::string missing = AddToJob("missing.bin", 5000);
  const std::string spoilt = AddToJob("spoilt.bin", 20000);
  std::string wrong = spoilt;
  wrong[12345] ^= 1;
  AddToMulticast("whole.bin", whole);
  AddToMulticast("spoilt.bin", wrong);
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\whole.bin"), Optional(whole));
  EXPECT_THAT(GetFile("\\Data\\missing.bin"), Optional(missing));
  EXPECT_THAT(GetFile("\\Data\\spoilt.bin"), Optional(spoilt));
  EXPECT_THAT(server().RequestedPaths(),
              ElementsAre("files/missing.bin:1,1", "files/spoilt.bin:2,1"));
  EXPECT_EQ(server().Device().report->bundle_rx, 25000U);
  EXPECT_TRUE(server().Device().report->http_fallback);
  EXPECT_EQ(server().Device().report->error, "");
}

TEST_F(MulticastJobTest, FetchesByHttpAFileThatWasSpoiltAfterItHadCome) {
  const std::string first = AddToJob("first.bin", 20000);
  const std::string second = AddToJob("second.bin", 30000);
  AddToMulticast("first.bin", first);
  AddToMulticast("second.bin", second);
  listener_ = [this](const server::MulticastEvent& event) {
    const bool first_came = event.kind == server::MulticastEventKind::kFileEnded &&
                            event.file->device_path == "\\Data\\first.bin";
    if (!first_came) return;
    std::fstream file(device().folder() / "storage" / "Data" / "first.bin",
                      std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(12345).put('?').put('!');
    EXPECT_TRUE(file.good());
  };
  RunBoth();
  EXPECT_EQ(run_->figures().files[0].Count(server::DeviceState::kProven), 1U);
  EXPECT_THAT(GetFile("\\Data\\first.bin"), Optional(first));
  EXPECT_THAT(GetFile("\\Data\\second.bin"), Optional(second));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("files/first.bin:1,1"));
  EXPECT_EQ(server().Device().report->bundle_rx, 20000U);
  EXPECT_EQ(server().Device().report->error, "");
}

TEST_F(MulticastJobTest, TakesNoFileThatIsForOtherDevices) {
  const std::string mine = AddToJob("mine.bin", 10000);
  AddToMulticast("other.bin", std::string(9000, 'o'), "XX*");
  AddToMulticast("mine.bin", mine, "TQ5* MR4*");
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\mine.bin"), Optional(mine));
  EXPECT_FALSE(test::Exists("\\Data\\other.bin"));
  EXPECT_THAT(server().RequestedPaths(), IsEmpty());
}

TEST_F(MulticastJobTest, TakesItsListOfFilesByMulticast) {
  const std::string a = fleet::Noise(20000, 3);
  const std::string a_crc = server().Put("files/a.bin", a);
  const std::string list = "files/a.bin,\\Data\\a.bin,TQ5*," + a_crc + ",20000\r\n";
  const std::string list_crc = server().Put("files/list.txt", list);
  job_.list = test::HostFile{"files/list.txt", "\\Data\\list.txt", "*", list_crc};
  AddToMulticast("list.txt", list);
  AddToMulticast("a.bin", a);
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_THAT(server().RequestedPaths(), IsEmpty());
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - LoadFileList - multicast list file crc match\r\n"));
}

TEST_F(MulticastJobTest, FetchesAListOfFilesThatCameWrong) {
  const std::string list_crc = server().Put("files/list.txt", "");
  job_.list = test::HostFile{"files/list.txt", "\\Data\\list.txt", "*", list_crc};
  AddToMulticast("list.txt", "not,the,right,list,1\r\n");
  RunBoth();
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - LoadFileList - multicast list file crc mismatch, "
                                   "\\Data\\list.txt, "));
  ASSERT_FALSE(server().RequestedPaths().empty());
  EXPECT_EQ(server().RequestedPaths()[0], "files/list.txt:1,1");
}

TEST_F(MulticastJobTest, HoldsUnderLoss) {
  sim::LinkProfile link = fleet::Plan::DefaultLink();
  link.loss = 0.05;
  network().SetLinks(0x0A000001, 0x0A000002, link);
  const std::string a = AddToJob("a.bin", 100000);
  AddToMulticast("a.bin", a);
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
}

TEST_F(MulticastJobTest, GoesOnByHttpWhenTheMulticastServerIsCutOffInTheMiddle) {
  const std::string a = AddToJob("a.bin", 300000);
  const std::string b = AddToJob("b.bin", 5000);
  AddToMulticast("a.bin", a);
  AddToMulticast("b.bin", b);
  listener_ = [this](const server::MulticastEvent& event) {
    if (event.kind != server::MulticastEventKind::kStarted) return;
    network().At(world().now() + std::chrono::milliseconds(5), [this] {
      network().Stall(0x0A000001, 0x0A000002);
      network().Stall(0x0A000002, 0x0A000001);
    });
  };
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_THAT(GetFile("\\Data\\b.bin"), Optional(b));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("files/a.bin:1,1", "files/b.bin:2,1"));
  EXPECT_TRUE(run_->finished());
  EXPECT_EQ(run_->figures().files[0].Count(server::DeviceState::kDead), 1U);
}

/// As when two servers were started from two bundles, with one group.
TEST_F(MulticastJobTest, EndsWithItsOwnFilesThoughASecondServerSendsOthersByTheSameNames) {
  const std::string a = AddToJob("a.bin", 30000);
  const std::string b = AddToJob("b.bin", 40000);
  AddToMulticast("a.bin", a);
  AddToMulticast("b.bin", b);
  std::vector<server::MulticastFile> others = files_;
  others[0].content = server::MemoryContent(fleet::Noise(30000, 1));
  others[1].content = server::MemoryContent(fleet::Noise(35000, 2));
  server::MulticastOptions options;
  options.start.expected = 1;
  options.seed = 2;
  server::MulticastRun second(options, others);
  tools::VirtualMulticast port(world(), sim::Endpoint{0x0A000003, 7001}, second);
  After(seconds(9), [&port] { port.Start(); });
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_THAT(GetFile("\\Data\\b.bin"), Optional(b));
  EXPECT_EQ(server().Device().report->error, "");
  EXPECT_FALSE(server().RequestedPaths().empty());
}

TEST_F(MulticastJobTest, FallsBackToHttpWhenNoServerAnnouncesAnything) {
  const std::string a = AddToJob("a.bin", 1000);
  EXPECT_EQ(Start(job_), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_GE(world().now(), std::chrono::minutes(5));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("files/a.bin:1,1"));
}

TEST_F(MulticastJobTest, FallsBackToHttpAtOnceWhenTheCommandLineIsWrong) {
  job_.multicast = "-X=1";
  const std::string a = AddToJob("a.bin", 1000);
  EXPECT_EQ(Start(job_), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
  EXPECT_LT(world().now(), std::chrono::minutes(1));
}

TEST_F(MulticastJobTest, SaysItsStepsOnScreenAndInTheLog) {
  const std::string a = AddToJob("a.bin", 30000);
  AddToMulticast("a.bin", a);
  RunBoth();
  EXPECT_THAT(ShownLines(),
              ElementsAre("Upgrade Initialization...", "Starting FileXfer", "\\Data\\a.bin",
                          "Validating files", "Validating, \\Data\\a.bin", "Upgrade Complete"));
  const std::string log = ReadLog();
  std::size_t at = 0;
  for (const char* line : {"Orvenix - UpgradeThread - InitRAM\r\n",
                           "Orvenix - UpgradeThread - StartMulticastClient\r\n"
                           "Orvenix - StartMulticastClient - mc.Start, "
                           "!-A=239.1.1.1 -P=7000 -HV=TQ52 -UA=127.0.0.1 -UP=5655!\r\n",
                           "Orvenix - StartMulticastClient - Exiting\r\n"
                           "Multicast complete - main logic...Multicast Fallback Mode..."
                           "Orvenix - UpgradeThread - Validate Files\r\n"}) {
    const std::size_t found = log.find(line, at);
    ASSERT_NE(found, std::string::npos) << line;
    at = found;
  }
}

TEST_F(MulticastJobTest, ShowsItsProgress) {
  const std::string a = AddToJob("a.bin", 50000);
  AddToMulticast("a.bin", a);
  job_.required_space = "100000";
  StartBoth();
  while (LogLinesWith("StartMulticastClient - Exiting").empty()) Sleep(50);
  EXPECT_EQ(test::OverallProgress(), report::kBarUnits / 2);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
}

TEST_F(MulticastJobTest, LeavesNothingBehind) {
  const test::Holdings before = test::HoldingsOf(device());
  const std::string a = AddToJob("a.bin", 30000);
  AddToMulticast("a.bin", a);
  RunBoth();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(MulticastJobTest, SurvivesStrangersOnItsPorts) {
  const std::string a = AddToJob("a.bin", 60000);
  AddToMulticast("a.bin", a);
  sim::VirtualPort stranger(world(), {0x0A000063, 4000},
                            [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {});
  for (std::uint32_t i = 0; i < 2000; ++i) {
    const std::string rubbish = fleet::Noise(i % 700, i);
    network().At(world().now() + sim::Micros(5000 * i), [&stranger, rubbish, i] {
      const sim::Address to = i % 3 == 0 ? 0xEF010101 : 0x0A000001;
      stranger.Send({to, static_cast<std::uint16_t>(i % 3 == 1 ? 5655 : 7000)}, rubbish);
    });
  }
  RunBoth();
  EXPECT_THAT(GetFile("\\Data\\a.bin"), Optional(a));
}

}  // namespace
