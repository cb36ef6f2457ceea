// The program as people and scripts use it: its words, its JSON and its exit codes.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "server/scratch_folder.h"
#include "tools/exit_codes.h"
#include "tools/file_text.h"

namespace tools {
namespace {

using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::StartsWith;

struct Ended {
  int code = -1;
  std::string output;
  std::string errors;
};

/// Runs the program in a folder of its own with a line of shell words.
class CommandLineTest : public ::testing::Test {
 protected:
  Ended Run(const std::string& words) const {
    const std::string command =
        "cd '" + scratch_.path().string() + "' && '" ORVENIX_PROGRAM "' " + words + " 2>errors.txt";
    Ended ended;
    FILE* pipe = ::popen(command.c_str(), "r");
    std::array<char, 4096> block{};
    for (std::size_t got; (got = std::fread(block.data(), 1, block.size(), pipe)) > 0;) {
      ended.output.append(block.data(), got);
    }
    const int status = ::pclose(pipe);
    ended.code = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    ended.errors = ReadWholeFile(scratch_.path() / "errors.txt");
    return ended;
  }

  ScratchFolder scratch_;
};

TEST_F(CommandLineTest, ListsItsVerbsAndExitCodes) {
  const Ended help = Run("--help");

  EXPECT_EQ(help.code, 0);
  for (const char* verb : {"bundle", "serve"}) {
    EXPECT_THAT(help.output, HasSubstr(std::string("  ") + verb + " ")) << verb;
  }
  for (const ExitCodeRow& row : kExitCodes) {
    EXPECT_THAT(help.output,
                HasSubstr(std::to_string(static_cast<int>(row.code)) + "  " + row.name));
  }
}

TEST_F(CommandLineTest, ShowsAnExampleForEveryVerb) {
  for (const char* verb : {"bundle make", "serve"}) {
    const Ended help = Run(std::string(verb) + " --help");
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
      {"serve errors.txt", ExitCode::kBadInput, "errors.txt: does not belong to a bundle"},
      {"serve . --address 203.0.113.1 --port 8080", ExitCode::kCannotListen, "203.0.113.1:8080: "},
      {"serve . --address elsewhere", ExitCode::kCannotListen, "elsewhere:8080: "},
  };
  for (const MistakeCase& c : kCases) {
    const Ended ended = Run(c.words);
    EXPECT_EQ(ended.code, static_cast<int>(c.code)) << c.words;
    EXPECT_THAT(ended.errors, HasSubstr(c.complaint)) << c.words;
    EXPECT_THAT(ended.errors, StartsWith("orvenix: ")) << c.words;
    EXPECT_EQ(ended.errors.find('\n'), ended.errors.size() - 1) << c.words << ": one line";
  }
}

TEST_F(CommandLineTest, SaysAMistakeInJsonToo) {
  const Ended ended = Run("bundle make nowhere out --json");

  const auto json = nlohmann::json::parse(ended.output);
  EXPECT_EQ(json.at("event"), "error");
  EXPECT_EQ(json.at("code"), 3);
  EXPECT_EQ(json.at("name"), "bad-input");
  EXPECT_EQ(json.at("where"), "nowhere");
}

TEST_F(CommandLineTest, MakesABundle) {
  scratch_.Write("files/with blank.txt", "12345");

  const Ended ended = Run("bundle make files out --attributes '*.txt=read-only' --json");

  EXPECT_EQ(ended.code, 0) << ended.errors;
  const auto json = nlohmann::json::parse(ended.output);
  EXPECT_EQ(json.at("files"), 1);
  EXPECT_EQ(json.at("bytes"), 5);
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "out/tree/bundle/with blank.txt"), "12345");
}

/// The server as a process of its own that is interrupted like one.
class ServeTest : public CommandLineTest {
 protected:
  /// Starts it and waits until it says where it listens.
  void Start(const std::vector<std::string>& options) {
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    process_ = ::fork();
    ASSERT_GE(process_, 0);
    if (process_ == 0) Exec(options, ends[1]);
    ::close(ends[1]);
    output_ = ::fdopen(ends[0], "r");
    const auto listening = ReadLine();
    ASSERT_EQ(listening.at("event"), "listening");
    port_ = listening.at("port");
  }
  void TearDown() override {
    if (output_ != nullptr) ::fclose(output_);
    if (process_ > 0) {
      ::kill(process_, SIGKILL);
      ::waitpid(process_, nullptr, 0);
    }
  }
  nlohmann::json ReadLine() const {
    std::string line;
    for (int letter; (letter = std::fgetc(output_)) != EOF && letter != '\n';) {
      line += static_cast<char>(letter);
    }
    return line.empty() ? nlohmann::json::object() : nlohmann::json::parse(line);
  }
  int Wait() {
    int status = 0;
    ::waitpid(process_, &status, 0);
    process_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }
  /// What curl says to a request as a device writes it.
  std::string Fetch(const std::string& path, const std::string& more = "") const {
    const std::string command = "curl -s --max-time 20 --request-target '" + path + "' " + more +
                                " http://127.0.0.2:" + std::to_string(port_) + "/";
    std::string got;
    FILE* pipe = ::popen(command.c_str(), "r");
    for (int letter; (letter = std::fgetc(pipe)) != EOF;) got += static_cast<char>(letter);
    ::pclose(pipe);
    return got;
  }

  pid_t process_ = -1;
  FILE* output_ = nullptr;
  int port_ = 0;

 private:
  [[noreturn]] void Exec(const std::vector<std::string>& options, int output) const {
    std::vector<std::string> words{ORVENIX_PROGRAM, "serve"};
    words.insert(words.end(), options.begin(), options.end());
    std::vector<char*> arguments;
    for (std::string& word : words) arguments.push_back(word.data());
    arguments.push_back(nullptr);
    if (::chdir(scratch_.path().c_str()) != 0 || ::dup2(output, STDOUT_FILENO) < 0) ::_exit(126);
    ::execv(ORVENIX_PROGRAM, arguments.data());
    ::_exit(127);
  }
};

TEST_F(ServeTest, ServesABundleToAClientThatNobodyHereWrote) {
  scratch_.Write("files/read me.txt", "hello\n");
  ASSERT_EQ(Run("bundle make files out --address 127.0.0.2 --attributes '*.txt=read-only'").code,
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
  ASSERT_EQ(Run("bundle make files out --address 127.0.0.2").code, 0);
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
