// The program, called in this process or run as one of its own.
#pragma once

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <filesystem>
#include <iostream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "server/scratch_folder.h"
#include "tools/command_line.h"
#include "tools/file_text.h"

namespace tools {

struct Ended {
  int code = -1;
  std::string output;
  std::string errors;
};

/// What goes to a stream of the process in the meantime.
class CapturedStream {
 public:
  explicit CapturedStream(std::ostream& stream)
      : stream_(stream), before_(stream.rdbuf(text_.rdbuf())) {}
  ~CapturedStream() { stream_.rdbuf(before_); }
  CapturedStream(const CapturedStream&) = delete;
  CapturedStream& operator=(const CapturedStream&) = delete;
  [[nodiscard]] std::string text() const { return text_.str(); }

 private:
  std::ostringstream text_;
  std::ostream& stream_;
  std::streambuf* const before_;
};

/// Gives lines of words to the program, in a folder of its own.
class CommandLineTest : public ::testing::Test {
 protected:
  CommandLineTest() {
    std::filesystem::current_path(scratch_.path());
    scratch_.Write("empty.txt", "");
  }
  ~CommandLineTest() override { std::filesystem::current_path("/"); }

  /// Divides at blanks; what stands in single quotes stays together.
  static std::vector<std::string> Words(const std::string& line) {
    std::vector<std::string> words{"orvenix"};
    bool in_word = false, quoted = false;
    for (const char letter : line) {
      if (letter == ' ' && !quoted) {
        in_word = false;
        continue;
      }
      if (!in_word) words.emplace_back();
      in_word = true;
      if (letter == '\'') {
        quoted = !quoted;
      } else {
        words.back() += letter;
      }
    }
    return words;
  }

  /// Calls the program's command line in this process.
  static Ended Call(const std::string& line) {
    std::vector<std::string> words = Words(line);
    std::vector<char*> arguments;
    for (std::string& word : words) arguments.push_back(word.data());
    const CapturedStream output(std::cout), errors(std::cerr);
    Ended ended;
    ended.code = RunCommandLine(static_cast<int>(arguments.size()), arguments.data());
    ended.output = output.text();
    ended.errors = errors.text();
    return ended;
  }

  /// Runs the built program through a shell: for what starts threads, or reads where it lies.
  Ended Run(const std::string& words) const {
    const std::string command = "'" ORVENIX_PROGRAM "' " + words + " 2>errors.txt";
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

/// The server as a process of its own that is interrupted like one.
class ServerProcessTest : public CommandLineTest {
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

}  // namespace tools
