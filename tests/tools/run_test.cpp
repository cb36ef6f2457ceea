// Whole jobs on simulated devices, through the program alone: bundle, server, device, run.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <sstream>

#include "tools/exit_codes.h"
#include "tools/program.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

std::vector<nlohmann::json> Events(const std::string& output) {
  std::vector<nlohmann::json> events;
  std::istringstream in(output);
  for (std::string line; std::getline(in, line);) events.push_back(nlohmann::json::parse(line));
  return events;
}

/// "KIND to RECEIVER: STATE or CODE" of each message, in order.
std::vector<std::string> Messages(const std::vector<nlohmann::json>& events) {
  std::vector<std::string> messages;
  for (const nlohmann::json& event : events) {
    if (event.at("event") != "document") continue;
    const char* const number = event.at("kind") == "status" ? "state" : "code";
    messages.push_back(event.at("kind").get<std::string>() + " to " +
                       event.at("to").get<std::string>() + ": " +
                       std::to_string(event.at(number).get<int>()));
  }
  return messages;
}

class RunTest : public ServerProcessTest {
 protected:
  void MakeFiles() const {
    scratch_.Write("files/read me.txt", "hello\n");
    scratch_.Write("files/empty", "");
    scratch_.Write("files/sub/data.bin", std::string(200'000, 'd'));
  }
  void MakeDevice(const std::string& settings = "") const {
    ASSERT_EQ(Call("device new device " + settings).code, 0);
  }
  /// A bundle for a server that listens on the port of the running one.
  void MakeBundleFor(int port, const std::string& more = "") const {
    const Ended made = Call("bundle make files out --address 127.0.0.2 --port " +
                            std::to_string(port) + " " + more);
    ASSERT_EQ(made.code, 0) << made.errors;
  }
};

bool HasReceived(const std::vector<nlohmann::json>& events, const std::string& file) {
  return std::any_of(events.begin(), events.end(), [&file](const nlohmann::json& event) {
    return event.at("event") == "multicast" && event.at("step") == "received" &&
           event.at("file") == file;
  });
}

TEST_F(RunTest, TakesFromTheGroupWhatIsAnnouncedForItAndTheRestByHttp) {
  MakeFiles();
  scratch_.Write("files/top.bin", "makes the folder");
  scratch_.Write("files/other.bin", "for somebody else");
  const std::string more = "--multicast 239.1.1.1:" + std::to_string(7000 + ::getpid() % 2000) +
                           " --device-text TQ52 --encrypt --http-only '*.txt' "
                           "--masks-for 'other.bin=MV41*'";
  MakeBundleFor(8080, more);
  Start({"out", "--port", "0", "--json", "--expect", "1", "--wait", "3", "--report", "report.json",
         "--pcap", "server.pcap"});
  MakeBundleFor(port_, more);
  MakeDevice("--set network.datagram_loss_percent=5");

  const Ended run = Run("run out/job.xml --device device --hurry 50 --json --pcap device.pcap");

  ASSERT_EQ(run.code, 0) << run.errors;
  const auto events = Events(run.output);
  EXPECT_TRUE(HasReceived(events, "\\Orvenix\\bundle.lst"));
  EXPECT_TRUE(HasReceived(events, "\\Application\\sub\\data.bin"));
  EXPECT_FALSE(HasReceived(events, "\\Application\\read me.txt"));
  EXPECT_FALSE(HasReceived(events, "\\Application\\other.bin"));
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "device/storage/Application/sub/data.bin"),
            std::string(200'000, 'd'));
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "device/storage/Application/read me.txt"), "hello\n");
  EXPECT_FALSE(fs::exists(scratch_.path() / "device/storage/Application/other.bin"));
  EXPECT_EQ(events.back().at("multicast").at("files"), 3);
  ::kill(process_, SIGINT);
  EXPECT_EQ(Wait(), 0);
  const auto report = nlohmann::json::parse(ReadWholeFile(scratch_.path() / "report.json"));
  const auto& files = report.at("multicast").at("files");
  ASSERT_EQ(files.size(), 4U) << report.dump(2);
  for (const auto& file : files) {
    const bool foreign = file.at("path") == "\\Application\\other.bin";
    EXPECT_EQ(file.at("proven"), foreign ? 0 : 1) << file.dump(2);
  }
  EXPECT_GT(fs::file_size(scratch_.path() / "server.pcap"), 200'000U);
  EXPECT_GT(fs::file_size(scratch_.path() / "device.pcap"), 200'000U);
}

TEST_F(RunTest, BringsEveryFileToTheDeviceAndTellsWhatHappens) {
  MakeFiles();
  MakeBundleFor(8080);
  Start({"out", "--port", "0", "--json", "--report", "report.json"});
  MakeBundleFor(port_);
  MakeDevice();
  scratch_.Write("device/storage/Application/read me.txt", "hello\n");
  scratch_.Write("device/storage/Application/sub/data.bin", "spoilt");

  const Ended run =
      Run("run out/job.xml --device device --hurry 50 --screens screens --json --events all");

  ASSERT_EQ(run.code, 0) << run.errors;
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "all"), run.output);
  const auto events = Events(run.output);
  EXPECT_THAT(events, Contains(nlohmann::json{{"event", "processes"}, {"names", {"host.exe"}}}));
  const nlohmann::json& ended = events.back();
  EXPECT_EQ(ended.at("outcome"), "ok");
  EXPECT_EQ(ended.at("files").size(), 3U);
  const auto shown = [&events](const std::string& text) {
    return std::any_of(events.begin(), events.end(), [&text](const nlohmann::json& event) {
      return event.at("event") == "status" && event.at("text") == text;
    });
  };
  EXPECT_TRUE(shown("Upgrade Initialization..."));
  EXPECT_TRUE(shown("Upgrade Complete"));
  EXPECT_THAT(Messages(events),
              ElementsAre("status to host: 4", "device-event to TW_Event_DB@~MASTERKX: 205181",
                          "device-event to TW_Event_DB@~MASTERKX: 205182", "status to host: 1"));
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "device/storage/Application/sub/data.bin"),
            std::string(200'000, 'd'));
  EXPECT_TRUE(fs::exists(scratch_.path() / "screens/paint-000001.png"));

  const Ended screen = Call("device screen device --picture last.png --json");
  EXPECT_THAT(nlohmann::json::parse(screen.output).at("lines"), Contains("Upgrade Complete"));
  EXPECT_TRUE(fs::exists(scratch_.path() / "last.png"));
  const Ended show = Call("device show device");
  EXPECT_THAT(show.output, HasSubstr("\\Application\\sub\\data.bin"));
  EXPECT_THAT(show.output, HasSubstr("end of \\FileXfer.log:"));

  ::kill(process_, SIGINT);
  EXPECT_EQ(Wait(), 0);
  const auto report = nlohmann::json::parse(ReadWholeFile(scratch_.path() / "report.json"));
  const auto& device = report.at("devices").at(0);
  EXPECT_EQ(device.at("reports"), 1);
  EXPECT_EQ(device.at("report").at("error"), "");
  for (const auto& file : device.at("files")) {
    EXPECT_NE(file.at("path"), "bundle/read me.txt") << "it was right already";
  }
}

TEST_F(RunTest, TellsThatTheServerCouldNotBeReached) {
  MakeFiles();
  MakeBundleFor(9);
  MakeDevice();

  const Ended run = Run("run out/job.xml --device device --timeout 1");

  EXPECT_EQ(run.code, static_cast<int>(ExitCode::kUnreachable)) << run.errors;
  EXPECT_THAT(run.errors, HasSubstr("is the server running at http://127.0.0.2:9?"));
}

TEST_F(RunTest, LeavesStatusesToTheMessageQueueWhenAsked) {
  MakeFiles();
  MakeBundleFor(9);
  MakeDevice();

  const Ended run = Run("run out/job.xml --device device --timeout 1 --no-callbacks --json");

  EXPECT_THAT(
      Messages(Events(run.output)),
      ElementsAre("status to TW_CLIENT: 4", "device-event to TW_Event_DB@~MASTERKX: 205181"));
  EXPECT_TRUE(fs::exists(scratch_.path() / "device/messages/000001-TW_CLIENT.xml"));
}

TEST_F(RunTest, TellsWhyADeviceRefusesAJob) {
  MakeFiles();
  MakeBundleFor(8080);
  MakeDevice("--set power.ac_line=0 --set power.battery_flag=4");

  const Ended power = Run("run out/job.xml --device device --hurry 50");
  EXPECT_EQ(power.code, static_cast<int>(ExitCode::kNoPower)) << power.errors;
  EXPECT_THAT(power.output,
              HasSubstr("event 205180 to TW_Event_DB@~MASTERKX: Power requirement not met\n"));
  EXPECT_THAT(power.errors, HasSubstr("out/job.xml:"));

  std::string job = ReadWholeFile(scratch_.path() / "out/job.xml");
  job.replace(job.find("200006"), 6, "2000000000");
  scratch_.Write("big.xml", job);
  fs::remove_all(scratch_.path() / "device");
  MakeDevice();
  const Ended space = Run("run big.xml --device device --hurry 50");
  EXPECT_EQ(space.code, static_cast<int>(ExitCode::kNoSpace)) << space.errors;

  job.replace(job.find("HTTPServer"), 10, "HTTPSender");
  scratch_.Write("unknown.xml", job);
  const Ended linted = Run("run unknown.xml --device device --json");
  EXPECT_EQ(linted.code, static_cast<int>(ExitCode::kBadInput));
  EXPECT_EQ(Events(linted.output).at(0).at("findings").at(0).at("id"), "unknown-group");
  EXPECT_THAT(linted.errors,
              HasSubstr("1 error in the job: unknown-group; see 'orvenix job lint'"));
  const Ended unknown = Run("run unknown.xml --device device --force --hurry 50");
  EXPECT_EQ(unknown.code, static_cast<int>(ExitCode::kUnknownName)) << unknown.errors;
  EXPECT_THAT(unknown.errors, HasSubstr("knows no group or field \"HTTPSender\""));
}

class RunClientTest : public RunTest {
 protected:
  /// A configuration file for the running server, beside nothing.
  void WriteConfiguration(const std::string& content) const {
    scratch_.Write("upgrade.xml", "<Job><BaseUrl>http://127.0.0.2</BaseUrl><HTTPPort>" +
                                      std::to_string(port_) + "</HTTPPort>" + content + "</Job>");
  }
  std::string OnDevice(const std::string& path) const {
    return ReadWholeFile(scratch_.path() / "device" / path);
  }
};

TEST_F(RunClientTest, SendsTheJobForEachPassAcrossTheRestartOfTheFlash) {
  const std::string image(100'000, 'o');
  scratch_.Write("served/fw/os.nb0", image);
  scratch_.Write("served/fw/apps001.zip", "part one");
  scratch_.Write("served/fw/apps002.zip", "part two");
  scratch_.Write("served/both.txt", "in every pass");
  Start({"served", "--address", "127.0.0.2", "--port", "0", "--json"});
  WriteConfiguration(
      "<OSFirmware><Package HardwareVersion='TQ5*' SourceDir='fw' Base='os.nb0' DestDir='RAM:' "
      "AdditionalParms='Pass=1,RAMAllocSize=100000'/>"
      "<Package HardwareVersion='TQ5*' SourceDir='fw' Base='apps' Count='2' "
      "DestDir='\\Application' "
      "AdditionalParms='Pass=2'/></OSFirmware>"
      "<Downloads><File SourceDir='both.txt' DestDir='\\both.txt'/></Downloads>");
  MakeDevice("--set flash.start=restarts");

  const Ended run =
      Run("run upgrade.xml --mode client --device device --bundle served --hurry 50 --json "
          "--events all");

  ASSERT_EQ(run.code, 0) << run.errors;
  EXPECT_EQ(OnDevice("flash/os.nb0"), image);
  EXPECT_EQ(OnDevice("storage/Application/apps002.zip"), "part two");
  EXPECT_EQ(OnDevice("storage/kvoupgclnt.txt"), "2");
  EXPECT_FALSE(fs::exists(scratch_.path() / "device/storage/Windows/upgrade.xml"));
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "all"), run.output) << "of both starts";
  std::vector<std::string> story;
  for (const nlohmann::json& event : Events(run.output)) {
    const std::string name = event.at("event");
    if (name == "started") story.push_back("pass " + std::to_string(event.at("pass").get<int>()));
    if (name == "restart") story.push_back("restart by " + event.at("cause").get<std::string>());
    if (name != "ended") continue;
    EXPECT_EQ(event.at("outcome"), "ok");
    for (const auto& file : event.at("files")) {
      story.push_back(file.at("path").get<std::string>() + " " +
                      file.at("state").get<std::string>());
    }
  }
  EXPECT_THAT(story, ElementsAre("pass 1", "RAM:os.nb0 right", "\\both.txt right",
                                 "restart by flash", "pass 2", "\\Application\\apps001.zip right",
                                 "\\Application\\apps002.zip right", "\\both.txt right"));
}

TEST_F(RunClientTest, EndsWithTheTestThatFailed) {
  port_ = 9;
  WriteConfiguration(
      "<Registry><Key>Software</Key><ValueName>V</ValueName><Type>REG_DWORD</Type>"
      "<Operator>EQ</Operator><Value>1</Value><ErrorMsg>no V</ErrorMsg></Registry>"
      "<OSFirmware><Package HardwareVersion='*' SourceDir='fw' Base='a' DestDir='\\' "
      "AdditionalParms='Pass=2'/><Package HardwareVersion='*' SourceDir='fw' Base='b' "
      "DestDir='\\' AdditionalParms='Pass=1'/></OSFirmware>");
  MakeDevice();
  scratch_.Write("device/storage/kvoupgclnt.txt", "1");

  const Ended run = Run("run upgrade.xml --mode client --device device --hurry 50 --timeout 20");

  EXPECT_EQ(run.code, static_cast<int>(ExitCode::kTestFailed)) << run.output;
  EXPECT_THAT(run.output, HasSubstr("Upgrade Failed: no V"));
  EXPECT_FALSE(fs::exists(scratch_.path() / "device/storage/kvoupgclnt.txt"))
      << "the next job is the first pass again";
}

TEST_F(RunClientTest, RefusesAConfigurationWithErrors) {
  port_ = 9;
  WriteConfiguration("<OSFirmware><Package HardwareVersion='*' Base='os'/></OSFirmware>");
  MakeDevice();

  const Ended run = Run("run upgrade.xml --mode client --device device");

  EXPECT_EQ(run.code, static_cast<int>(ExitCode::kBadInput));
  EXPECT_THAT(run.errors, HasSubstr("1 error in the job: package-no-source"));
}

}  // namespace
}  // namespace tools
