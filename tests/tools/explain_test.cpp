// What a log tells: jobs, phases, outcome, cause.

#include "tools/explain/explain.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>

#include "server/scratch_folder.h"
#include "tools/explain/client_log.h"
#include "tools/failure.h"

namespace tools {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

/// The story of a log whose lines are given without their ends.
JobStory Tell(const std::vector<std::string>& lines, std::size_t wanted = 0) {
  LogStory story(wanted);
  for (const std::string& line : lines) story.Line(line);
  return story.Finish();
}

using Lines = std::vector<std::string>;
Lines operator+(Lines a, const Lines& b) {
  a.insert(a.end(), b.begin(), b.end());
  return a;
}

const Lines kWalk = {"IcfgBeginGroup - Orvenix", "Allocating gpUpgCfg", "IcfgBeginGroup - Upgrade",
                     "IcfgSetField - ShowGUI, true"};
const Lines kChecks = {"Orvenix - PerformTests",      "PerformTests - 0",
                       "Orvenix - Cleanup",           "Orvenix - CheckSpace",
                       "Orvenix - CheckSpace, \\",    "Orvenix - SetTransferBytes",
                       "Orvenix - StartUpgradeThread"};
const Lines kStart = {"Version=3.44", "Orvenix thread - Started",
                      "Orvenix - CretaeUpgradeInProgressEvent - Success",
                      "Orvenix - UpgradeThread - InitRAM"};
const Lines kFetch = {"Orvenix - before OpenURL",
                      "http://10.0.0.2:8080/a:1,1",
                      "Orvenix - CSocketIO::Connect - connect established",
                      "",
                      "GET a:1,1 HTTP/1.1",
                      "Host: 2.0.0.10",
                      "",
                      "Orvenix - FILECRC32",
                      "Orvenix - good CRC"};
const Lines kFiles = Lines{"Multicast Fallback Mode...Orvenix - UpgradeThread - Validate Files",
                           "Orvenix - ValidateFiles - crc error, no file, \\a"} +
                     kFetch;
const Lines kEnd = {"Orvenix - SendUpgradeComplete",     "Local Upgrade Executing",
                    "Orvenix - StartUpgrade - Entering", "Orvenix - StartUpgrade - Exiting",
                    "Orvenix - UpgradeThread - Exiting", "Orvenix - DeleteUpgradeInProgressEvent"};
const Lines kRefusal = {"Orvenix - SendDeviceEvent - entering"};

std::string Event(const std::string& number, const std::string& text) {
  return "<?xml version=\"1.0\"?><DevInfo Action=\"Notify\"><Field Name=\"msgNum\">" + number +
         "</Field><Field Name=\"optArgArrayElement\">" + text + "</Field></DevInfo>";
}

std::vector<Phase> Phases(const JobStory& job) {
  std::vector<Phase> phases;
  for (const PhaseStretch& stretch : job.stretches) phases.push_back(stretch.phase);
  return phases;
}

TEST(LogStoryTest, TellsThePhasesOfAJobThatEndedWell) {
  const JobStory job = Tell(kWalk + kChecks + kStart + kFiles + kEnd);

  EXPECT_EQ(job.end, JobEnd::kComplete);
  EXPECT_FALSE(job.cause);
  EXPECT_TRUE(job.troubles.empty());
  EXPECT_EQ(job.files, 1U);
  EXPECT_THAT(Phases(job),
              ElementsAre(Phase::kSettings, Phase::kChecks, Phase::kStart, Phase::kFiles,
                          Phase::kReport, Phase::kInstall, Phase::kEnd));
  EXPECT_EQ(job.stretches[0].first, 1U);
  EXPECT_EQ(job.stretches[0].last, 4U);
  EXPECT_EQ(job.stretches[1].last, 12U) << "the version belongs to where it stands";
}

struct RefusalCase {
  Lines lines;
  std::uint32_t result;
  const char* why;
};

TEST(LogStoryTest, TellsWhichCheckRefusedAJob) {
  const RefusalCase kCases[] = {
      {kRefusal, 0xC4111003, "no test was begun"},
      {Lines{"Orvenix - PerformTests", "PerformTests - 1", "Orvenix - PerformTests - No such key",
             "Orvenix - PerformTests - failed test", "Too old"} +
           kRefusal,
       0xC4111005, "a test failed"},
      {Lines{"Orvenix - PerformTests", "PerformTests - 0", "Orvenix - Cleanup",
             "Orvenix - CheckSpace", "Orvenix - CheckSpace, \\"} +
           kRefusal,
       0xC4111002, "the space check is the last"},
      {{"Upgrade already in progress"}, 0xC4111001, "it says so"},
  };
  for (const RefusalCase& c : kCases) {
    const JobStory job = Tell(kWalk + c.lines);
    EXPECT_EQ(job.end, JobEnd::kRefused) << c.why;
    EXPECT_EQ(job.result, c.result) << c.why;
  }
}

TEST(LogStoryTest, NamesTheFirstCauseOfAFailedTestAndItsMessage) {
  const JobStory job = Tell(kWalk + Lines{"Orvenix - PerformTests", "PerformTests - 2",
                                          "Orvenix - PerformTests - No such valuename",
                                          "Orvenix - PerformTests - failed test", "Scanner too old",
                                          "2006/03/01:14:05:09Orvenix - SendDeviceEvent - send msg",
                                          Event("205180", "Scanner too old")});

  ASSERT_TRUE(job.cause);
  EXPECT_EQ(job.troubles[*job.cause].text, "Orvenix - PerformTests - No such valuename");
  EXPECT_EQ(job.message, "Scanner too old");
  ASSERT_EQ(job.events.size(), 1U);
  EXPECT_EQ(job.events[0].code, 205180U);
  EXPECT_EQ(job.events[0].text, "Scanner too old");
  EXPECT_EQ(job.events[0].time, "2006/03/01:14:05:09");
}

TEST(LogStoryTest, TellsAFailureInsideTheThread) {
  const JobStory job = Tell(kStart + Lines{"UpgradeClient Mode...PerformTests - 1",
                                           "Orvenix - PerformTests - failed test", "",
                                           "Orvenix - UpgradeThread - Exiting"});

  EXPECT_EQ(job.end, JobEnd::kFailed);
  EXPECT_EQ(job.message, "");
}

TEST(LogStoryTest, NamesWhatADeviceIsStuckAt) {
  Lines lines = kWalk + kChecks + kStart + kFiles;
  for (int i = 0; i < 50; ++i) {
    lines = lines + Lines{"Orvenix - before OpenURL",
                          "Orvenix - CSocketIO::Connect - connect established",
                          "Orvenix - CHttpClient:Get - bad ret 5"};
  }
  const JobStory job = Tell(lines);

  EXPECT_EQ(job.end, JobEnd::kUnfinished);
  ASSERT_TRUE(job.cause);
  const Trouble& cause = job.troubles[*job.cause];
  EXPECT_EQ(cause.count, 50U);
  ASSERT_NE(cause.code(), nullptr);
  EXPECT_STREQ(cause.code()->name, "bad ret 5");
}

TEST(LogStoryTest, ForgetsTroublesThatPassed) {
  const Lines down = {"Orvenix - CSocketIO::Connect - Error !10061%",
                      "Orvenix - OpenURL - could not connect"};
  const JobStory ended = Tell(kWalk + kChecks + kStart + down + kFiles + kEnd);
  EXPECT_EQ(ended.end, JobEnd::kComplete);
  EXPECT_FALSE(ended.cause);
  EXPECT_EQ(ended.troubles.size(), 2U);

  const JobStory cut = Tell(kWalk + kChecks + kStart + kFiles + down);
  ASSERT_TRUE(cut.cause);
  EXPECT_STREQ(cut.troubles[*cut.cause].code()->name, "WSAECONNREFUSED");
}

TEST(LogStoryTest, NamesWhatACompleteJobGaveUp) {
  const JobStory job =
      Tell(kStart +
           Lines{"Orvenix - LoadFileList, error getting list fileOrvenix - Rename settings file"} +
           kEnd);

  EXPECT_EQ(job.end, JobEnd::kComplete);
  ASSERT_TRUE(job.cause);
  EXPECT_EQ(job.troubles[*job.cause].text, "Orvenix - LoadFileList, error getting list file");
}

TEST(LogStoryTest, KeepsTheJobThatIsAskedFor) {
  const Lines log =
      kWalk + kRefusal + kWalk + kChecks + kStart + kFiles + kEnd + kWalk + kChecks + kStart;

  EXPECT_EQ(Tell(log, 1).end, JobEnd::kRefused);
  EXPECT_EQ(Tell(log, 2).end, JobEnd::kComplete);
  EXPECT_EQ(Tell(log, 3).end, JobEnd::kUnfinished);
  EXPECT_EQ(Tell(log).number, 3U);
  EXPECT_EQ(Tell(log, 4).number, 0U);
  EXPECT_EQ(Tell(Lines{"Version=3.44", "Version=3.44"} + kWalk).number, 1U)
      << "the host has loaded it";
  EXPECT_EQ(Tell(kStart + kEnd + kStart).number, 2U) << "a program other than the host starts jobs";
}

TEST(LogStoryTest, ReadsWhatASyslogServerWrote) {
  Lines log;
  for (const std::string& line : kWalk + kChecks) log.push_back("< 14>2006-03-01 14:05:09 " + line);

  const JobStory job = Tell(log);

  EXPECT_EQ(job.end, JobEnd::kUnfinished);
  ASSERT_EQ(job.stretches.size(), 2U);
  EXPECT_EQ(job.stretches[1].time, "2006-03-01 14:05:09");
}

TEST(LogStoryTest, TakesAnyBytesAndKeepsLittleOfThem) {
  LogStory story;
  std::string line;
  std::uint32_t seed = 1;
  for (int i = 0; i < 3000; ++i) {
    seed = seed * 1664525U + 1013904223U;
    line = "Orvenix - CSocketIO::Connect - Error !" + std::to_string(seed) + "%";
    if (i % 3 == 0) line = std::string(seed % 300, static_cast<char>(seed >> 24U));
    if (i % 7 == 0) line = i % 2 == 0 ? "Orvenix - Cleanup" : "Orvenix - SendUpgradeComplete";
    if (i % 11 == 0) line = Event(std::to_string(seed), "<<<");
    story.Line(line);
  }
  const JobStory job = story.Finish();

  EXPECT_LE(job.troubles.size(), 100U);
  EXPECT_LE(job.stretches.size(), 200U);
  EXPECT_LE(job.events.size(), 100U);
  EXPECT_EQ(Tell({"nothing", "of", "ours", ""}).number, 0U);
}

TEST(ReadLogTest, ReadsFilesOfAnyLineEndsAndLengths) {
  const ScratchFolder scratch;
  const std::string text = "\r\nOrvenix thread - Started\r\r\n" + std::string(300'000, 'x') +
                           "\nOrvenix - UpgradeThread - Exiting";  // no line end
  LogStory story = ReadLog(scratch.Write("log", text), 0);

  const JobStory job = story.Finish();

  EXPECT_EQ(job.end, JobEnd::kComplete);
  EXPECT_EQ(job.first, 2U);
  EXPECT_EQ(job.last, 4U);
  EXPECT_THROW(static_cast<void>(ReadLog(scratch.path() / "none", 0)), Failure);
}

TEST(ParseCodeTest, ReadsTheWaysInWhichCodesAreWritten) {
  EXPECT_EQ(ParseCode("205180"), 205180U);
  EXPECT_EQ(ParseCode("0xC4111002"), 0xC4111002U);
  EXPECT_EQ(ParseCode("c4111002"), 0xC4111002U);
  EXPECT_EQ(ParseCode("-1005514750"), 0xC4111002U);
  EXPECT_EQ(ParseCode("3289452546"), 0xC4111002U);
  EXPECT_EQ(ParseCode("0"), 0U);
  for (const char* text :
       {"", "-", "0x", "0x123456789", "4294967296", "12a", "log.txt", "deadbeex", "1 2"}) {
    EXPECT_EQ(ParseCode(text), std::nullopt) << text;
  }
}

TEST(StoryViewTest, TellsAStoryInAFewLines) {
  std::ostringstream out;
  PrintStory(out, "FileXfer.log",
             Tell(kWalk + Lines{"Orvenix - PerformTests", "PerformTests - 1",
                                "Orvenix - PerformTests - No such key",
                                "Orvenix - PerformTests - failed test", "Too old",
                                Event("205180", "Too old")}),
             3);

  EXPECT_EQ(
      out.str(),
      "FileXfer.log: job 1 of 3, lines 1 to 10\n"
      "\n"
      "outcome  refused\n"
      "         test-failed: a registry test of the job failed\n"
      "cause    the registry key of a test does not exist\n"
      "         line 7, 1 time: Orvenix - PerformTests - No such key\n"
      "message  Too old\n"
      "remedy   see the test's key and value in the job and in the device's registry\n"
      "\n"
      "phases\n"
      "  settings  lines 1 to 4\n"
      "  checks    lines 5 to 10, 2 troubles\n"
      "\n"
      "troubles\n"
      "  1 x  line 7  Orvenix - PerformTests - No such key\n"
      "        the registry key of a test does not exist\n"
      "  1 x  line 8  Orvenix - PerformTests - failed test\n"
      "        a registry test failed; the upgrade ends, the next line is the test's message\n"
      "\n"
      "events\n"
      "  line 10  205180 upgrade-failed  Too old\n");
}

TEST(StoryViewTest, TellsTheSameInJson) {
  const auto json = StoryJson(
      "log", Tell(kWalk + kChecks + kStart + Lines{"Orvenix - CSocketIO::Connect - Error !10061%"}),
      1);

  EXPECT_EQ(json.at("outcome"), "unfinished");
  EXPECT_EQ(json.at("cause").at("number_name"), "WSAECONNREFUSED");
  EXPECT_EQ(json.at("cause").at("remedy"), "start the server, or correct BaseURL and HTTPPort");
  EXPECT_EQ(json.at("phases").size(), 3U);
  EXPECT_THAT(json.at("text").get<std::string>(), HasSubstr("the log ends in the phase start"));
}

const Lines kClientStart = {"Command line parsed and multicast client instantiated",
                            "Initializing callbacks",
                            "Starting the client protocol engine (state machine)",
                            "Registry - creating keys and loading values", "Registry updated"};
const Lines kClientRuns = {"Initializing the multicast client", "Socket API initialized",
                           "Creating state machine thread", "State machine thread created"};

ClientRunStory TellClient(const Lines& lines, std::size_t wanted = 0) {
  ClientLog log(wanted);
  for (const std::string& line : lines) log.Line(line);
  return log.Finish();
}

TEST(ClientLogTest, TellsHowEachRunOfTheClientWent) {
  const Lines log =
      kClientStart + Lines{"Client configured NOT to load!"} + kClientStart +
      Lines{"Initializing the multicast client", "Failed to initialize the multicast client!"} +
      kClientStart + kClientStart + kClientRuns +
      Lines{"Last file flag is set, shutting down state machine", "who wrote this?"};

  const ClientRunStory last = TellClient(log);
  EXPECT_EQ(last.number, 4U);
  EXPECT_EQ(last.end, ClientEnd::kRan);
  EXPECT_EQ(last.first, 19U);
  EXPECT_EQ(last.last, 28U);
  EXPECT_EQ(last.unknown, 1U);
  const ClientRunStory off = TellClient(log, 1);
  EXPECT_EQ(off.end, ClientEnd::kSwitchedOff);
  ASSERT_TRUE(off.failed);
  EXPECT_EQ(off.lines[*off.failed].first, 6U);
  EXPECT_EQ(TellClient(log, 2).end, ClientEnd::kNotStarted);
  EXPECT_EQ(TellClient(log, 3).end, ClientEnd::kBroken);
  EXPECT_EQ(TellClient(log, 5).number, 0U);
  EXPECT_EQ(TellClient({"", "something else"}).number, 0U);
}

TEST(ClientLogTest, CountsWhatAClientToldALogServer) {
  Lines log = {"2006-03-01 14:05:09 Waiting for a Multicast MCFTP Server to announce a file..."};
  for (int block = 1; block < 500; ++block) {
    log.push_back("2006-03-01 14:05:10 NAKing block " + std::to_string(block) + " of 600");
  }
  log.emplace_back("2006-03-01 14:05:11 WRQ Timeout");

  const ClientRunStory run = TellClient(log);

  EXPECT_EQ(run.end, ClientEnd::kRan);
  ASSERT_EQ(run.lines.size(), 3U);
  EXPECT_EQ(run.lines[1].count, 499U);
  std::ostringstream out;
  PrintClientRun(out, "syslog", run, 1);
  EXPECT_THAT(out.str(), HasSubstr("syslog: run 1 of 1 of the multicast client, lines 1 to 501\n"));
  EXPECT_THAT(out.str(), HasSubstr("\ntroubles\n  1 x  line 501  WRQ Timeout\n        no file was "
                                   "announced in 300 s"));
  EXPECT_THAT(out.str(), HasSubstr("  499 x  lines 2 to 500  NAKing block 1 of 600\n"));
  const auto json = ClientRunJson("syslog", run, 1);
  EXPECT_EQ(json.at("troubles").at(0).at("text"), "WRQ Timeout");
  EXPECT_EQ(json.at("steps").at(1).at("count"), 499);
}

}  // namespace
}  // namespace tools
