// A command of the host that stands in for a program of the device.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "storage/unique_fd.h"

namespace sim {

struct HostCommand {
  std::string command;                       ///< for the host's shell
  std::string command_line;                  ///< of the device's program
  std::filesystem::path device_folder;       ///< where it runs
  std::chrono::milliseconds limit{600'000};  ///< of the host's time; then it is killed
};

/// One run of such a command. It has ORVENIX_DEVICE (the device's folder) and ORVENIX_COMMAND_LINE
/// in its environment, reads nothing, writes to `programs.log` of the device's folder and is the
/// leader of a process group, which is killed when it ends: nothing of it stays behind.
class HostProgram {
 public:
  /// Exit code of a program that was killed at its limit.
  static constexpr std::uint32_t kTimedOut = 0xFFFFFFFFU;

  /// @return null when the host cannot start it.
  static std::unique_ptr<HostProgram> Start(const HostCommand& command);
  /// Kills what still runs.
  ~HostProgram();
  HostProgram(const HostProgram&) = delete;
  HostProgram& operator=(const HostProgram&) = delete;

  /// Waits, in the host's time, until the program has ended. A signal counts as 128 and its number.
  /// To be called once, or Watch.
  std::uint32_t Wait();
  /// Waits on a thread of its own, which then calls `ended` with the exit code.
  void Watch(std::function<void(std::uint32_t)> ended);
  /// Ends the program now. Any thread.
  void Kill();

 private:
  HostProgram(pid_t pid, UniqueFd exit, std::chrono::milliseconds limit);

  const pid_t pid_;
  const UniqueFd exit_;  ///< readable once the program has ended
  const std::chrono::milliseconds limit_;
  std::mutex mutex_;
  bool reaped_ = false;  ///< the host may give its number to another
  std::thread watcher_;
};

}  // namespace sim
