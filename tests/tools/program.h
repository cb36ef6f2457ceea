// The built program, run as a process of its own.
#pragma once

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
#include "tools/file_text.h"

namespace tools {

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
