#include "process/host_program.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <string_view>
#include <utility>
#include <vector>

namespace sim {
namespace {

constexpr std::string_view kDeviceName = "ORVENIX_DEVICE=";
constexpr std::string_view kCommandLineName = "ORVENIX_COMMAND_LINE=";
constexpr std::uint32_t kSignalBase = 128;

/// What has to be right for posix_spawn, released on every path.
class SpawnPlan {
 public:
  SpawnPlan() {
    ::posix_spawn_file_actions_init(&actions_);
    ::posix_spawnattr_init(&attributes_);
  }
  ~SpawnPlan() {
    ::posix_spawnattr_destroy(&attributes_);
    ::posix_spawn_file_actions_destroy(&actions_);
  }
  SpawnPlan(const SpawnPlan&) = delete;
  SpawnPlan& operator=(const SpawnPlan&) = delete;

  bool Prepare(const std::filesystem::path& folder) {
    const std::string log = folder / "programs.log";
    constexpr int kLogFlags = O_WRONLY | O_CREAT | O_APPEND | O_NOFOLLOW;
    constexpr short kFlags = POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK;
    sigset_t none;
    sigemptyset(&none);
    return ::posix_spawn_file_actions_addopen(&actions_, 0, "/dev/null", O_RDONLY, 0) == 0 &&
           ::posix_spawn_file_actions_addopen(&actions_, 1, log.c_str(), kLogFlags, 0644) == 0 &&
           ::posix_spawn_file_actions_adddup2(&actions_, 1, 2) == 0 &&
           ::posix_spawn_file_actions_addclosefrom_np(&actions_, 3) == 0 &&
           ::posix_spawn_file_actions_addchdir_np(&actions_, folder.c_str()) == 0 &&
           ::posix_spawnattr_setflags(&attributes_, kFlags) == 0 &&
           ::posix_spawnattr_setpgroup(&attributes_, 0) == 0 &&
           ::posix_spawnattr_setsigmask(&attributes_, &none) == 0;
  }
  [[nodiscard]] const posix_spawn_file_actions_t* actions() const { return &actions_; }
  [[nodiscard]] const posix_spawnattr_t* attributes() const { return &attributes_; }

 private:
  posix_spawn_file_actions_t actions_{};
  posix_spawnattr_t attributes_{};
};

std::vector<std::string> Environment(const HostCommand& command,
                                     const std::filesystem::path& folder) {
  std::vector<std::string> all;
  for (char** entry = environ; *entry != nullptr; ++entry) {
    const std::string_view text = *entry;
    if (text.substr(0, kDeviceName.size()) == kDeviceName) continue;
    if (text.substr(0, kCommandLineName.size()) == kCommandLineName) continue;
    all.emplace_back(text);
  }
  all.push_back(std::string(kDeviceName) + folder.string());
  all.push_back(std::string(kCommandLineName) + command.command_line);
  return all;
}

int ExitCodeOf(const siginfo_t& status) {
  if (status.si_code == CLD_EXITED) return status.si_status;
  return static_cast<int>(kSignalBase) + status.si_status;
}

}  // namespace

std::unique_ptr<HostProgram> HostProgram::Start(const HostCommand& command) {
  std::error_code failed;
  const std::filesystem::path folder = std::filesystem::absolute(command.device_folder, failed);
  SpawnPlan plan;
  if (failed || !plan.Prepare(folder)) return nullptr;
  std::vector<std::string> texts = Environment(command, folder);
  std::vector<char*> environment;
  environment.reserve(texts.size() + 1);
  for (std::string& text : texts) environment.push_back(text.data());
  environment.push_back(nullptr);
  std::string shell = "sh";
  std::string option = "-c";
  std::string script = command.command;
  const std::array<char*, 4> arguments = {shell.data(), option.data(), script.data(), nullptr};
  pid_t pid = 0;
  if (::posix_spawn(&pid, "/bin/sh", plan.actions(), plan.attributes(), arguments.data(),
                    environment.data()) != 0) {
    return nullptr;
  }
  UniqueFd exit(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0)));
  const bool watched = static_cast<bool>(exit);
  std::unique_ptr<HostProgram> program(new HostProgram(pid, std::move(exit), command.limit));
  if (watched) return program;
  // A program whose end cannot be seen must not run: its destructor ends it.
  return nullptr;
}

HostProgram::HostProgram(pid_t pid, UniqueFd exit, std::chrono::milliseconds limit)
    : pid_(pid), exit_(std::move(exit)), limit_(limit) {}

HostProgram::~HostProgram() {
  Kill();
  if (watcher_.joinable()) {
    watcher_.join();
  } else if (!reaped_) {
    static_cast<void>(Wait());
  }
}

std::uint32_t HostProgram::Wait() {
  using Clock = std::chrono::steady_clock;
  const Clock::time_point end = Clock::now() + limit_;
  bool ended = false;
  while (exit_ && !ended) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now());
    if (left.count() < 0) break;
    pollfd exit{exit_.get(), POLLIN, 0};
    ended = ::poll(&exit, 1, static_cast<int>(left.count()) + 1) == 1;
  }
  const std::lock_guard<std::mutex> hold(mutex_);
  // Until it is reaped the group is still its own, so this reaches only what it has left behind.
  ::kill(-pid_, SIGKILL);
  siginfo_t status{};
  while (::waitid(P_PID, static_cast<id_t>(pid_), &status, WEXITED) != 0 && errno == EINTR) {
  }
  reaped_ = true;
  return ended ? static_cast<std::uint32_t>(ExitCodeOf(status)) : kTimedOut;
}

void HostProgram::Watch(std::function<void(std::uint32_t)> ended) {
  watcher_ = std::thread([this, ended = std::move(ended)]() mutable { ended(Wait()); });
}

void HostProgram::Kill() {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (!reaped_) ::kill(-pid_, SIGKILL);
}

}  // namespace sim
