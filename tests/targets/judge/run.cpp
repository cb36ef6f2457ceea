#include "targets/judge/run.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <exception>
#include <stdexcept>
#include <vector>

#include "targets/judge/comparable.h"
#include "targets/judge/files.h"
#include "targets/judge/own_network.h"
#include "targets/judge/wire.h"

namespace targets {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kLimit{100};
constexpr int kNoNetwork = 90;
constexpr int kTookTooLong = 91;
constexpr int kBroken = 92;

const fs::path kWalks = ORVENIX_WALKS;

/// Starts the client; what it says goes to the file `said`.
pid_t StartClient(const std::vector<std::string>& command, const fs::path& said) {
  const pid_t child = ::fork();
  if (child != 0) return child;
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  const int out = ::open(said.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  const int in = ::open("/dev/null", O_RDONLY);
  ::dup2(in, STDIN_FILENO);
  ::dup2(out, STDOUT_FILENO);
  ::dup2(out, STDERR_FILENO);
  std::vector<char*> words;
  for (const std::string& word : command) words.push_back(const_cast<char*>(word.c_str()));
  words.push_back(nullptr);
  ::execvp(words[0], words.data());
  ::_exit(kBroken);
}

/// Serves until the client has ended. @return its exit code
int ServeClient(WireServer& server, pid_t client) {
  const Clock::time_point limit = Clock::now() + kLimit;
  int status = 0;
  while (::waitpid(client, &status, WNOHANG) == 0) {
    server.Serve();
    if (Clock::now() < limit) continue;
    ::kill(client, SIGKILL);
    ::waitpid(client, &status, 0);
    return kTookTooLong;
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

void ReadFolder(const fs::path& folder, const std::string& prefix, Record& record) {
  if (!fs::exists(folder)) return;
  for (const auto& entry : fs::recursive_directory_iterator(folder)) {
    const std::string name = prefix + entry.path().lexically_relative(folder).generic_string();
    if (entry.path().filename() == "orvenix.dll") continue;  // each target has another
    if (entry.is_directory()) {
      record[name + "/"];
    } else {
      record[name] = Comparable(ReadFile(entry.path()));
    }
  }
}

}  // namespace

Run::Run(const Scenario& scenario, const Target& target, fs::path folder)
    : scenario_(scenario), target_(target), folder_(std::move(folder)) {}

void Run::Start() {
  fs::remove_all(folder_);
  fs::create_directories(folder_ / "wire");
  process_ = ::fork();
  if (process_ < 0) throw std::runtime_error("no further process");
  if (process_ > 0) return;
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  int code = kBroken;
  try {
    code = CarryOut();
  } catch (const std::exception& error) {
    std::fprintf(stderr, "%s: %s\n", folder_.c_str(), error.what());
  }
  ::_exit(code);
}

int Run::CarryOut() const {
  const std::string complaint = EnterOwnNetwork();
  if (!complaint.empty()) {
    WriteFile(folder_ / "said.txt", complaint);
    return kNoNetwork;
  }
  ::setenv("TZ", "UTC", 1);
  const std::vector<std::string> command = target_.Command(folder_);
  WriteFile(folder_ / "device/storage/host.walk", WalkOf(scenario_, kWalks));
  WireServer server(scenario_, folder_);
  const int code = ServeClient(server, StartClient(command, folder_ / "said.txt"));
  target_.TidyUp(folder_);
  return code;
}

bool Run::PollEnd() {
  if (::waitpid(process_, &status_, WNOHANG) == 0) return false;
  has_no_network_ = WIFEXITED(status_) && WEXITSTATUS(status_) == kNoNetwork;
  return true;
}

std::string Run::Complaint() const {
  if (WIFEXITED(status_) && WEXITSTATUS(status_) == 0) return "";
  const int code = WIFEXITED(status_) ? WEXITSTATUS(status_) : 128 + WTERMSIG(status_);
  std::string text = folder_.string() + ": ";
  text += code == kTookTooLong ? "took too long" : "ended with code " + std::to_string(code);
  for (const char* file : {"said.txt", "device/storage/host.trace"}) {
    if (fs::exists(folder_ / file)) text += "\n" + ReadFile(folder_ / file);
  }
  return text;
}

Record Run::ReadRecord() const {
  Record record;
  ReadFolder(folder_ / "device/storage", "storage/", record);
  ReadFolder(folder_ / "device/messages", "messages/", record);
  ReadFolder(folder_ / "device/flash", "flash/", record);
  ReadFolder(folder_ / "wire", "wire/", record);
  return record;
}

}  // namespace targets
