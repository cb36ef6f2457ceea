// The processes of a device.
//
// The table begins with the program that the device's threads belong to and with what the profile
// lists. CreateProcessW adds to it: a program of the device is what the profile names for it, a
// command of the host or a built-in that ends with a given code after a given time. The package
// installer is on every device (see Installer). A program file that lies in the storage but is not
// named is a built-in that ends at once with code 0.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ce/kernel.h"
#include "kernel/handle_table.h"

namespace sim {

class Device;
class HostProgram;
struct ProgramProfile;

/// One process. Guarded by the world's lock; waits for it end when it does.
class Process final : public KernelObject {
 public:
  Process(std::uint32_t process_id, std::uint32_t parent_id, std::u16string executable)
      : id(process_id), parent(parent_id), name(std::move(executable)) {}
  [[nodiscard]] bool Signalled(const SimThread& /*thread*/) const override { return !running; }
  [[nodiscard]] bool can_be_awaited() const override { return true; }

  const std::uint32_t id;
  const std::uint32_t parent;
  const std::u16string name;  ///< of the executable, as a snapshot shows it
  bool running = true;
  std::uint32_t exit_code = STILL_ACTIVE;
  std::uint64_t timer = 0;  ///< the world's action that ends it; 0: none
};

/// The one thread of a started process, for the second handle that CreateProcessW gives.
class ProcessThread final : public KernelObject {
 public:
  explicit ProcessThread(std::shared_ptr<Process> process) : process_(std::move(process)) {}
  [[nodiscard]] bool Signalled(const SimThread& /*thread*/) const override {
    return !process_->running;
  }
  [[nodiscard]] bool can_be_awaited() const override { return true; }
  [[nodiscard]] WaitQueue& wait_queue() override { return process_->queue; }

 private:
  std::shared_ptr<Process> process_;
};

class Processes {
 public:
  /// Name of the program that the device's own threads belong to. It cannot be terminated.
  static constexpr std::u16string_view kOwnName = u"host.exe";

  explicit Processes(Device& device);
  /// Ends the host's commands that still run.
  ~Processes();
  Processes(const Processes&) = delete;
  Processes& operator=(const Processes&) = delete;

  // ---- for tests and tools; these take the world's lock themselves ----

  struct Entry {
    std::uint32_t id;
    std::uint32_t parent;
    std::string name;
  };
  /// The running processes, oldest first.
  [[nodiscard]] std::vector<Entry> List() const;
  /// @return the new process's id; no id is used twice.
  std::uint32_t Add(std::u16string_view name);
  /// Ends a process with `exit_code`. @return false when there is none of that id, or it is the
  ///   device's own.
  bool Remove(std::uint32_t id, std::uint32_t exit_code = 0);

  struct Launch {
    std::uint32_t id;
    std::string program;  ///< as the caller named it
    std::string command_line;
  };
  /// Everything that CreateProcessW has started, oldest first.
  [[nodiscard]] std::vector<Launch> Launches() const;

  // ---- for the API functions ----

  /// Starts a program of the device. In a virtual world a command of the host runs to its end
  /// before this returns; the process then ends on the world's clock, after the profile's time.
  /// Takes the world's lock itself. @return an error number, 0 for success.
  DWORD Start(const WCHAR* program, const WCHAR* command_line, std::shared_ptr<Process>& process);

  // With the world's lock held:
  [[nodiscard]] std::shared_ptr<Process> Find(std::uint32_t id) const;
  [[nodiscard]] const std::vector<std::shared_ptr<Process>>& running() const { return running_; }
  /// Ends a process at once. @return an error number, 0 for success.
  DWORD Terminate(Process& process, std::uint32_t exit_code);

 private:
  DWORD FindProgram(const WCHAR* program, std::u16string& name) const;
  DWORD StartCommand(const Launch& launch, const std::u16string& name, const ProgramProfile& what,
                     std::shared_ptr<Process>& process);
  // With the world's lock held:
  std::shared_ptr<Process> AddHeld(std::u16string_view name);
  void NoteLaunch(Launch launch, std::uint32_t id);
  void Finish(Process& process, std::uint32_t exit_code);
  void FinishAfter(const std::shared_ptr<Process>& process, std::uint32_t run_ms,
                   std::uint32_t exit_code);

  Device& device_;
  std::mutex installing_;  ///< one package at a time
  std::vector<std::shared_ptr<Process>> running_;
  std::vector<Launch> launches_;
  std::map<std::uint32_t, std::unique_ptr<HostProgram>> programs_;  ///< by process id
  std::vector<std::uint32_t> watched_to_the_end_;  ///< their watchers touch nothing any more
  std::uint32_t next_id_ = 0x1000;
};

}  // namespace sim
