// The main program of every test program: each test runs in a process of its own, because the
// product's state lives as long as its process. The processes are forked from one that has been
// loaded already, so that a small test costs milliseconds and not the start of a program.
//
// A single test, the listing of tests and whatever ORVENIX_ONE_PROCESS is set for run as gtest
// runs them, without a fork: that is what a debugger wants.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>
#include <vector>

namespace {

using Clock = std::chrono::steady_clock;

constexpr int kLongestTestMs = 120'000;
constexpr int kSkippedCode = 77;

/// What became of one test.
struct Outcome {
  const testing::TestInfo* test = nullptr;
  enum class Kind { kPassed, kFailed, kSkipped } kind = Kind::kFailed;
  double seconds = 0;
  /// All that the process wrote.
  std::string output;
};

std::string NameOf(const testing::TestInfo& test) {
  return std::string(test.test_suite_name()) + "." + test.name();
}

/// The tests that the filter of the command line leaves. gtest chooses them when it lists them.
std::vector<const testing::TestInfo*> ChosenTests() {
  const int out = ::dup(STDOUT_FILENO);
  const int nowhere = ::open("/dev/null", O_WRONLY);
  ::dup2(nowhere, STDOUT_FILENO);
  ::close(nowhere);
  testing::GTEST_FLAG(list_tests) = true;
  [[maybe_unused]] const int listed = RUN_ALL_TESTS();
  testing::GTEST_FLAG(list_tests) = false;
  std::fflush(stdout);
  ::dup2(out, STDOUT_FILENO);
  ::close(out);

  std::vector<const testing::TestInfo*> chosen;
  const testing::UnitTest& all = *testing::UnitTest::GetInstance();
  for (int s = 0; s < all.total_test_suite_count(); ++s) {
    const testing::TestSuite& suite = *all.GetTestSuite(s);
    for (int t = 0; t < suite.total_test_count(); ++t) {
      if (suite.GetTestInfo(t)->should_run()) chosen.push_back(suite.GetTestInfo(t));
    }
  }
  return chosen;
}

/// The forked process: runs one test and ends as a program does, leak check included.
[[noreturn]] void RunHere(const testing::TestInfo& test, int output) {
  ::setpgid(0, 0);
  ::dup2(output, STDOUT_FILENO);
  ::dup2(output, STDERR_FILENO);
  testing::GTEST_FLAG(filter) = NameOf(test);
  testing::GTEST_FLAG(output) = "";
  const int code = RUN_ALL_TESTS();
  std::exit(code == 0 && test.result()->Skipped() ? kSkippedCode : code);
}

/// Waits for a process's end, and ends it and all it started when it takes too long.
int WaitFor(pid_t child) {
  const int watched = static_cast<int>(::syscall(SYS_pidfd_open, child, 0));
  pollfd end{watched, POLLIN, 0};
  const bool in_time = ::poll(&end, 1, kLongestTestMs) > 0;
  ::kill(-child, SIGKILL);
  if (!in_time) ::kill(child, SIGKILL);
  int status = 0;
  ::waitpid(child, &status, 0);
  ::close(watched);
  return status;
}

std::string TextOf(int file) {
  std::string text(static_cast<std::size_t>(::lseek(file, 0, SEEK_END)), '\0');
  const ssize_t got = ::pread(file, text.data(), text.size(), 0);
  text.resize(got < 0 ? 0 : static_cast<std::size_t>(got));
  return text;
}

Outcome Run(const testing::TestInfo& test) {
  Outcome outcome;
  outcome.test = &test;
  const auto start = Clock::now();
  const int output = ::memfd_create("output", MFD_CLOEXEC);
  const pid_t child = ::fork();
  if (child == 0) RunHere(test, output);
  const int status = child < 0 ? -1 : WaitFor(child);
  outcome.seconds = std::chrono::duration<double>(Clock::now() - start).count();
  outcome.output = TextOf(output);
  ::close(output);
  if (child < 0) {
    outcome.output += "no process could be made for the test\n";
  } else if (WIFEXITED(status) && WEXITSTATUS(status) == 0) {
    outcome.kind = Outcome::Kind::kPassed;
  } else if (WIFEXITED(status) && WEXITSTATUS(status) == kSkippedCode) {
    outcome.kind = Outcome::Kind::kSkipped;
  } else if (WIFSIGNALED(status)) {
    outcome.output += "ended by signal " + std::to_string(WTERMSIG(status)) + " after " +
                      std::to_string(outcome.seconds) + " s\n";
  } else {
    outcome.output += "ended with code " + std::to_string(WEXITSTATUS(status)) + "\n";
  }
  return outcome;
}

void Show(const Outcome& outcome) {
  if (outcome.kind == Outcome::Kind::kPassed) return;
  const bool skipped = outcome.kind == Outcome::Kind::kSkipped;
  std::printf("%s\n%s %s\n", outcome.output.c_str(), skipped ? "[  SKIPPED ]" : "[  FAILED  ]",
              NameOf(*outcome.test).c_str());
  std::fflush(stdout);
}

/// Text as it may stand in an attribute: what XML cannot say becomes a question mark.
std::string Escaped(const std::string& text) {
  std::string escaped;
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte == '\n') {
      escaped += "&#10;";
    } else if (byte < 0x20 || byte >= 0x7F) {
      escaped += '?';
    } else if (c == '<' || c == '&' || c == '"') {
      escaped += "&#" + std::to_string(byte) + ";";
    } else {
      escaped += c;
    }
  }
  return escaped;
}

/// The results in the form in which gtest writes them.
bool Write(const std::string& file, const std::vector<Outcome>& outcomes) {
  std::ofstream xml(file);
  xml << "<?xml version=\"1.0\"?>\n<testsuites>\n<testsuite name=\"" << Escaped(file) << "\">\n";
  for (const Outcome& outcome : outcomes) {
    xml << "<testcase classname=\"" << Escaped(outcome.test->test_suite_name()) << "\" name=\""
        << Escaped(outcome.test->name()) << "\" time=\"" << outcome.seconds << "\">";
    if (outcome.kind == Outcome::Kind::kFailed) {
      xml << "<failure message=\"" << Escaped(outcome.output) << "\"/>";
    } else if (outcome.kind == Outcome::Kind::kSkipped) {
      xml << "<skipped message=\"" << Escaped(outcome.output) << "\"/>";
    }
    xml << "</testcase>\n";
  }
  xml << "</testsuite>\n</testsuites>\n";
  return xml.flush().good();
}

int RunEachInAProcess(const std::vector<const testing::TestInfo*>& tests,
                      const std::string& report) {
  std::vector<Outcome> outcomes;
  std::size_t failed = 0;
  for (const testing::TestInfo* test : tests) {
    outcomes.push_back(Run(*test));
    Show(outcomes.back());
    if (outcomes.back().kind == Outcome::Kind::kFailed) ++failed;
  }
  std::printf("%zu tests, %zu failed\n", outcomes.size(), failed);
  if (!report.empty() && !Write(report, outcomes)) {
    std::printf("%s cannot be written\n", report.c_str());
    return 1;
  }
  return failed == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
  // gtest starts the program again for the inside of a death test.
  const bool death =
      argc > 1 && std::string(argv[argc - 1]).find("death_test=") != std::string::npos;
  testing::InitGoogleMock(&argc, argv);
  if (death || testing::GTEST_FLAG(list_tests) || std::getenv("ORVENIX_ONE_PROCESS")) {
    return RUN_ALL_TESTS();
  }
  const std::vector<const testing::TestInfo*> tests = ChosenTests();
  const std::string output = testing::GTEST_FLAG(output);
  if (tests.size() == 1 && output.empty()) return RUN_ALL_TESTS();
  constexpr char kXml[] = "xml:";
  return RunEachInAProcess(tests, output.rfind(kXml, 0) == 0 ? output.substr(4) : "");
}
