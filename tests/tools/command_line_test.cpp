// The program as people and scripts use it: its words, its JSON and its exit codes.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>

#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "tools/exit_codes.h"
#include "tools/file_text.h"
#include "tools/program.h"

namespace tools {
namespace {

using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::StartsWith;

TEST_F(CommandLineTest, ListsItsVerbsAndExitCodes) {
  const Ended help = Run("--help");

  EXPECT_EQ(help.code, 0);
  for (const char* verb : {"bundle", "job", "serve", "device", "run", "explain"}) {
    EXPECT_THAT(help.output, HasSubstr(std::string("  ") + verb + " ")) << verb;
  }
  for (const ExitCodeRow& row : kExitCodes) {
    EXPECT_THAT(help.output,
                HasSubstr(std::to_string(static_cast<int>(row.code)) + "  " + row.name));
  }
}

TEST_F(CommandLineTest, HasTheExitCodesThatItsDocumentLists) {
  std::string table;
  for (const ExitCodeRow& row : kExitCodes) {
    table += "| " + std::to_string(static_cast<int>(row.code)) + " | " + row.name + " | " +
             row.meaning + " |\n";
  }

  EXPECT_THAT(ReadWholeFile(ORVENIX_TOOLS_DOCUMENT), HasSubstr("|---|---|---|\n" + table + "\n"));
}

TEST_F(CommandLineTest, ShowsAnExampleForEveryVerb) {
  for (const char* verb : {"bundle make", "job lint", "serve", "device new", "device show",
                           "device screen", "run", "explain", "fleet"}) {
    const Ended help = Call(std::string(verb) + " --help");
    EXPECT_EQ(help.code, 0) << verb;
    EXPECT_THAT(help.output, HasSubstr("Example:\n  orvenix " + std::string(verb))) << verb;
    EXPECT_THAT(help.output, HasSubstr("--json")) << verb;
  }
}

struct MistakeCase {
  const char* words;
  ExitCode code;
  const char* complaint;
};

TEST_F(CommandLineTest, AnswersAMistakeWithOneLineAndItsCode) {
  const MistakeCase kCases[] = {
      {"", ExitCode::kUsage, "orvenix: command line: "},
      {"fly", ExitCode::kUsage, "orvenix: fly: there is no such verb; use one of bundle"},
      {"bundle make", ExitCode::kUsage, "FOLDER is required"},
      {"serve . --port many", ExitCode::kUsage, "--port"},
      {"serve . --wings", ExitCode::kUsage, "--wings"},
      {"bundle make nowhere out", ExitCode::kBadInput, "nowhere: is not a folder"},
      {"serve nowhere", ExitCode::kBadInput, "nowhere: there is no such bundle"},
      {"serve empty.txt", ExitCode::kBadInput, "empty.txt: does not belong to a bundle"},
      {"serve . --address 203.0.113.1 --port 8080", ExitCode::kCannotListen, "203.0.113.1:8080: "},
      {"device", ExitCode::kUsage, "subcommand is required"},
      {"device new . --set width=3", ExitCode::kCannotWrite, ".: is there already"},
      {"device new d --set width", ExitCode::kUsage, "\"width\" is no setting"},
      {"device new d --set screen.wings=2", ExitCode::kUsage, "no setting \"screen.wings\""},
      {"device new d --set screen.width=wide", ExitCode::kUsage, "\"wide\" is no number"},
      {"device new d --profile nowhere", ExitCode::kBadInput, "nowhere"},
      {"device show nowhere", ExitCode::kBadInput, "nowhere: is not a device"},
      {"device screen nowhere", ExitCode::kBadInput, "nowhere: is not a device"},
      {"run nowhere.xml --device d", ExitCode::kBadInput, "nowhere.xml: there is no such file"},
      {"run empty.txt --device d", ExitCode::kBadInput, "empty.txt:1: not well-formed XML"},
      {"run nowhere.xml", ExitCode::kUsage, "--device is required"},
      {"job", ExitCode::kUsage, "subcommand is required"},
      {"job lint nowhere.xml", ExitCode::kBadInput, "nowhere.xml: there is no such file"},
      {"job lint .", ExitCode::kBadInput, ".: there is no job.xml in the folder"},
      {"job lint empty.txt", ExitCode::kBadInput, "empty.txt:1: not well-formed XML"},
      {"job lint empty.txt --bundle nowhere", ExitCode::kBadInput,
       "nowhere: there is no such bundle"},
      {"explain", ExitCode::kUsage, "WHAT is required"},
      {"explain 4000000000", ExitCode::kBadInput, "the system has no such number"},
      {"explain nonsense", ExitCode::kBadInput, "is no file, no number and no text of the system"},
      {"explain ./nowhere.log", ExitCode::kBadInput, "./nowhere.log: there is no such file"},
      {"explain empty.txt", ExitCode::kBadInput, "empty.txt: holds no line of this system"},
      {"serve . --address elsewhere", ExitCode::kCannotListen, "elsewhere:8080: "},
      {"serve . --expect 3 --address 127.0.0.2 --port 0", ExitCode::kUsage,
       "multicast: the bundle is not made for it; make it with 'orvenix bundle make"},
      {"bundle make . out --device-text TQ52", ExitCode::kUsage, "--device-text requires"},
      {"bundle make . out --multicast 10.1.1.1:7000", ExitCode::kUsage,
       "--multicast: \"10.1.1.1\" is no multicast address"},
      {"bundle make . out --multicast 239.1.1.1:0", ExitCode::kUsage, "\"0\" is no port"},
      {"run nowhere.xml --device d --pcap no/folder", ExitCode::kBadInput, "nowhere.xml"},
  };
  for (const MistakeCase& c : kCases) {
    const Ended ended = Call(c.words);
    EXPECT_EQ(ended.code, static_cast<int>(c.code)) << c.words;
    EXPECT_THAT(ended.errors, HasSubstr(c.complaint)) << c.words;
    EXPECT_THAT(ended.errors, StartsWith("orvenix: ")) << c.words;
    EXPECT_EQ(ended.errors.find('\n'), ended.errors.size() - 1) << c.words << ": one line";
  }
}

TEST_F(CommandLineTest, SaysAMistakeInJsonToo) {
  const Ended ended = Call("bundle make nowhere out --json");

  const auto json = nlohmann::json::parse(ended.output);
  EXPECT_EQ(json.at("event"), "error");
  EXPECT_EQ(json.at("code"), 3);
  EXPECT_EQ(json.at("name"), "bad-input");
  EXPECT_EQ(json.at("where"), "nowhere");
}

TEST_F(CommandLineTest, MakesABundle) {
  scratch_.Write("files/with blank.txt", "12345");

  const Ended ended = Call("bundle make files out --attributes '*.txt=read-only' --json");

  EXPECT_EQ(ended.code, 0) << ended.errors;
  const auto json = nlohmann::json::parse(ended.output);
  EXPECT_EQ(json.at("files"), 1);
  EXPECT_EQ(json.at("bytes"), 5);
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "out/tree/bundle/with blank.txt"), "12345");
}

TEST_F(CommandLineTest, RefusesAMulticastThatCannotWorkFromHere) {
  scratch_.Write("files/a.txt", "12345");
  ASSERT_EQ(Call("bundle make files out --multicast 239.1.1.1:7000").code, 0);
  const std::string serve = "serve out --address 127.0.0.2 --port 0 ";

  const Ended interface = Call(serve + "--interface wlan17");
  EXPECT_EQ(interface.code, static_cast<int>(ExitCode::kCannotListen));
  EXPECT_THAT(interface.errors, HasSubstr("no interface \"wlan17\"; choose one of 127.0.0.1 (lo)"));
  const Ended rate = Call(serve + "--rate fast");
  EXPECT_EQ(rate.code, static_cast<int>(ExitCode::kUsage));
  EXPECT_THAT(rate.errors, HasSubstr("\"fast\" is no rate; give bits per second as 800k"));
  scratch_.Write("out/tree/bundle/a.txt", "");
  std::filesystem::remove(scratch_.path() / "out/tree/bundle/a.txt");
  const Ended gone = Call(serve + "--force");
  EXPECT_EQ(gone.code, static_cast<int>(ExitCode::kBadInput));
  EXPECT_THAT(gone.errors, HasSubstr("a.txt: No such file or directory; make the bundle anew"));
}

TEST_F(CommandLineTest, ChecksABundleBeforeItIsSent) {
  scratch_.Write("files/a.txt", "12345");
  ASSERT_EQ(Call("bundle make files out").code, 0);

  const Ended good = Call("job lint out");
  EXPECT_EQ(good.code, 0) << good.errors;
  EXPECT_EQ(good.output, "out/job.xml: nothing found\n");

  scratch_.Write("out/tree/bundle/a.txt", "54321");
  const Ended bad = Call("job lint out/job.xml --json");
  EXPECT_EQ(bad.code, 3);
  EXPECT_THAT(bad.errors, HasSubstr("out/job.xml: 1 error in the job: file-crc; mend them"));
  const auto json = nlohmann::json::parse(bad.output.substr(0, bad.output.find('\n')));
  EXPECT_EQ(json.at("event"), "linted");
  EXPECT_EQ(json.at("findings").at(0).at("where"), "bundle.lst:1");

  EXPECT_EQ(Call("job lint out/job.xml --bundle out").code, 3);
  scratch_.Write("alone.xml", ReadWholeFile(scratch_.path() / "out/job.xml"));
  EXPECT_EQ(Call("job lint alone.xml").code, 0) << "there is no server to look at";
  EXPECT_EQ(Call("job lint alone.xml --bundle out/tree").code, 3);
  EXPECT_THAT(Call("serve out").errors, HasSubstr("serve it all the same with --force"));
}

TEST_F(CommandLineTest, ExplainsCodesTextsAndLogs) {
  const Ended code = Call("explain 0xC4111002");
  EXPECT_EQ(code.code, 0) << code.errors;
  EXPECT_EQ(
      code.output,
      "3289452546 = 0xC4111002 = -1005514750\n\nresult  no-space\n"
      "  the last storage requirement of the job is not met, or the job has none\n"
      "  remedy: make room on the device, lower RequiredSpace, or add a storage requirement\n");
  EXPECT_EQ(Call("explain -- -1005514750").output, code.output);
  EXPECT_EQ(
      nlohmann::json::parse(Call("explain 10061 --json").output).at("meanings").at(0).at("name"),
      "WSAECONNREFUSED");

  const Ended text = Call("explain 'Orvenix - CSocketIO::Connect - Error !10061%'");
  EXPECT_THAT(text.output, HasSubstr("WSAECONNREFUSED: no server listens"));
  EXPECT_THAT(Call("explain 'No MCT on device'").output, HasSubstr("a line of the screen"));
  EXPECT_EQ(nlohmann::json::parse(Call("explain 'Orvenix - good CRC' --json").output).at("where"),
            "log");

  scratch_.Write("log", "Orvenix thread - Started\r\nOrvenix - UpgradeThread - Exiting\r\n");
  EXPECT_THAT(Call("explain log").output, HasSubstr("outcome  complete"));
  EXPECT_EQ(nlohmann::json::parse(Call("explain log --json").output).at("outcome"), "complete");
  EXPECT_EQ(Call("explain log --job 2").code, 3);

  scratch_.Write("mcast.log",
                 "Command line parsed and multicast client instantiated\n"
                 "Client configured NOT to load!\n");
  EXPECT_THAT(Call("explain mcast.log").output,
              HasSubstr("outcome  switched-off\n         the registry forbids the client"));
  EXPECT_EQ(nlohmann::json::parse(Call("explain mcast.log --json").output).at("runs"), 1);
  EXPECT_THAT(Call("explain mcast.log --job 2").errors,
              HasSubstr("holds 1 runs of the multicast client"));
}

using ServeTest = ServerProcessTest;

TEST_F(ServeTest, ServesABundleToAClientThatNobodyHereWrote) {
  scratch_.Write("files/read me.txt", "hello\n");
  ASSERT_EQ(Call("bundle make files out --address 127.0.0.2 --attributes '*.txt=read-only'").code,
            0);
  Start({"out", "--port", "0", "--json"});

  EXPECT_EQ(Fetch("bundle/read me.txt:1,1"), "hello\n");
  EXPECT_THAT(
      Fetch("bundle\\read me.txt", "--head -X GET"),
      MatchesRegex("HTTP/1.1 200 OK\r\nContent-Length: 6\r\nContent-Attributes: 1\r\n"
                   "Content-timestamp: [-0-9]+ [0-9:]+\r\nContent-CRC32: 909783072\r\n\r\n"));
  EXPECT_EQ(Fetch("../bundle.json", "--path-as-is"), "");
}

TEST_F(ServeTest, WritesEventsAndAtTheEndARecordOfEveryDevice) {
  scratch_.Write("files/a.txt", "12345");
  ASSERT_EQ(Call("bundle make files out --address 127.0.0.2").code, 0);
  Start({"out", "--port", "0", "--json", "--report", "report.json"});
  Fetch("bundle/a.txt:2,3", "-H 'Core-name: MR1' -H 'Model: TQ52'");
  EXPECT_EQ(ReadLine().at("event"), "request");
  const auto sent = ReadLine();
  EXPECT_EQ(sent.at("event"), "sent");
  EXPECT_EQ(sent.at("device"), "MR1");
  EXPECT_EQ(sent.at("path"), "bundle/a.txt");
  EXPECT_EQ(sent.at("bytes"), 5);

  ::kill(process_, SIGINT);

  EXPECT_EQ(Wait(), 0);
  EXPECT_EQ(ReadLine().at("event"), "ended");
  const auto report = nlohmann::json::parse(ReadWholeFile(scratch_.path() / "report.json"));
  ASSERT_EQ(report.at("devices").size(), 1U);
  const auto& device = report.at("devices").at(0);
  EXPECT_EQ(device.at("device"), "MR1");
  EXPECT_EQ(device.at("model"), "TQ52");
  EXPECT_EQ(device.at("completed"), 1);
  EXPECT_EQ(device.at("attempt"), 2);
  EXPECT_EQ(device.at("report"), nullptr);
  EXPECT_EQ(device.at("files").at(0).at("path"), "bundle/a.txt");
}

TEST_F(ServeTest, EndsByItselfWhenTheWantedReportsHaveCome) {
  scratch_.Write("plain/a.txt", "12345");
  Start({"plain", "--address", "127.0.0.2", "--port", "0", "--json", "--until-reports", "1"});

  // A report has no answer; curl waits for one until the server is gone.
  Fetch("x", "-H 'Core-name: MR1' -H 'Bundle-rx: 5' -H 'Bundle-transfer: COMPLETE'");

  EXPECT_EQ(Wait(), 0);
  const auto report = ReadLine();
  EXPECT_EQ(report.at("event"), "report");
  EXPECT_EQ(report.at("bundle_rx"), 5);
}

}  // namespace
}  // namespace tools
