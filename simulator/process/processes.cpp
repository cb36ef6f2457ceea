#include "process/processes.h"

#include <algorithm>
#include <optional>

#include "ce/errors.h"
#include "ce/files.h"
#include "device/device.h"
#include "installer/installer.h"
#include "kernel/kernel.h"
#include "locale/code_pages.h"
#include "process/host_program.h"
#include "profile/profile.h"
#include "storage/storage.h"
#include "text/names.h"
#include "world/world.h"

namespace sim {
namespace {

constexpr std::uint32_t kIdStep = 4;
/// A command line is at most this long: what is longer is no text of a program's own.
constexpr std::size_t kMaxCommandLine = 32768;

}  // namespace

Processes::Processes(Device& device) : device_(device) {
  running_.push_back(std::make_shared<Process>(Kernel::process_id(), 0, std::u16string(kOwnName)));
  for (const ProcessProfile& profile : device.profile().processes) {
    bool malformed = false;
    AddHeld(FromUtf8(profile.name, malformed));
  }
}

Processes::~Processes() {
  std::map<std::uint32_t, std::unique_ptr<HostProgram>> left;
  {
    const auto lock = device_.world().Acquire();
    for (const auto& process : running_) {
      if (process->timer != 0) device_.world().Cancel(process->timer);
    }
    left.swap(programs_);
  }
  // Their watchers need the lock once more.
  left.clear();
}

std::vector<Processes::Entry> Processes::List() const {
  const auto lock = device_.world().Acquire();
  std::vector<Entry> entries;
  for (const auto& process : running_) {
    entries.push_back({process->id, process->parent, ToHostText(process->name)});
  }
  return entries;
}

std::uint32_t Processes::Add(std::u16string_view name) {
  const auto lock = device_.world().Acquire();
  return AddHeld(name)->id;
}

bool Processes::Remove(std::uint32_t id, std::uint32_t exit_code) {
  const auto lock = device_.world().Acquire();
  const std::shared_ptr<Process> process = Find(id);
  return process != nullptr && Terminate(*process, exit_code) == ERROR_SUCCESS;
}

std::vector<Processes::Launch> Processes::Launches() const {
  const auto lock = device_.world().Acquire();
  return launches_;
}

std::shared_ptr<Process> Processes::Find(std::uint32_t id) const {
  const auto found = std::find_if(running_.begin(), running_.end(),
                                  [id](const auto& process) { return process->id == id; });
  return found == running_.end() ? nullptr : *found;
}

std::shared_ptr<Process> Processes::AddHeld(std::u16string_view name) {
  auto process = std::make_shared<Process>(next_id_, Kernel::process_id(), std::u16string(name));
  next_id_ += kIdStep;
  running_.push_back(process);
  return process;
}

DWORD Processes::Terminate(Process& process, std::uint32_t exit_code) {
  if (!process.running || process.id == Kernel::process_id()) return ERROR_ACCESS_DENIED;
  const auto program = programs_.find(process.id);
  if (program != programs_.end()) program->second->Kill();
  Finish(process, exit_code);
  return ERROR_SUCCESS;
}

void Processes::Finish(Process& process, std::uint32_t exit_code) {
  if (!process.running) return;
  process.running = false;
  process.exit_code = exit_code;
  World& world = device_.world();
  if (process.timer != 0) world.Cancel(process.timer);
  process.timer = 0;
  world.Notify(process.queue);
  // Last: this may be the process's last reference.
  running_.erase(std::find_if(running_.begin(), running_.end(),
                              [&process](const auto& other) { return other.get() == &process; }));
}

void Processes::FinishAfter(const std::shared_ptr<Process>& process, std::uint32_t run_ms,
                            std::uint32_t exit_code) {
  World& world = device_.world();
  const Micros end = world.now() + std::chrono::milliseconds(run_ms);
  process->timer = world.At(end, [this, process, exit_code] {
    process->timer = 0;  // it is this one
    Finish(*process, exit_code);
  });
}

void Processes::NoteLaunch(Launch launch, std::uint32_t id) {
  launch.id = id;
  launches_.push_back(std::move(launch));
}

DWORD Processes::FindProgram(const WCHAR* program, std::u16string& name) const {
  DevicePath path;
  if (const DWORD error = ParsePath(program, false, path); error != ERROR_SUCCESS) {
    return error == ERROR_PATH_NOT_FOUND ? ERROR_FILE_NOT_FOUND : error;
  }
  if (path.names.empty()) return ERROR_FILE_NOT_FOUND;
  name = path.names.back();
  if (FoldCase(name) == Installer::kProgram) return ERROR_SUCCESS;
  if (device_.profile().programs.count(ToHostText(FoldCase(name))) != 0) return ERROR_SUCCESS;
  const auto is_file = [this](const WCHAR* candidate) {
    DWORD attributes = 0;
    return device_.storage().GetAttributes(candidate, attributes) == ERROR_SUCCESS &&
           (attributes & FILE_ATTRIBUTE_DIRECTORY) == 0;
  };
  if (is_file(program)) return ERROR_SUCCESS;
  // A bare name is looked for among the system's programs, too.
  const bool bare = path.names.size() == 1 && program[0] != u'\\';
  if (bare && is_file((u"\\Windows\\" + name).c_str())) return ERROR_SUCCESS;
  return ERROR_FILE_NOT_FOUND;
}

DWORD Processes::Start(const WCHAR* program, const WCHAR* command_line,
                       std::shared_ptr<Process>& process) {
  std::u16string name;
  if (const DWORD error = FindProgram(program, name); error != ERROR_SUCCESS) return error;
  const auto& programs = device_.profile().programs;
  const auto named = programs.find(ToHostText(FoldCase(name)));
  ProgramProfile what = named == programs.end() ? ProgramProfile{} : named->second;
  const Launch launch = {0, ToHostText(BoundedView(program, MAX_PATH)),
                         ToHostText(BoundedView(command_line, kMaxCommandLine))};
  if (!what.command.empty()) return StartCommand(launch, name, what, process);
  if (named == programs.end() && FoldCase(name) == Installer::kProgram) {
    const std::lock_guard<std::mutex> hold(installing_);
    what = {"", Installer(device_).Run(launch.command_line), Installer::kRunMs};
  }
  const auto lock = device_.world().Acquire();
  process = AddHeld(name);
  NoteLaunch(launch, process->id);
  FinishAfter(process, what.run_ms, what.exit_code);
  return ERROR_SUCCESS;
}

DWORD Processes::StartCommand(const Launch& launch, const std::u16string& name,
                              const ProgramProfile& what, std::shared_ptr<Process>& process) {
  std::unique_ptr<HostProgram> program =
      HostProgram::Start({what.command, launch.command_line, device_.folder()});
  if (program == nullptr) return ERROR_GEN_FAILURE;
  World& world = device_.world();
  if (world.is_virtual()) {
    const std::uint32_t exit_code = program->Wait();
    device_.storage().Recount();
    const auto lock = world.Acquire();
    process = AddHeld(name);
    NoteLaunch(launch, process->id);
    FinishAfter(process, what.run_ms, exit_code);
    return ERROR_SUCCESS;
  }
  std::vector<std::unique_ptr<HostProgram>> ended;  // outlives the lock
  const auto lock = world.Acquire();
  for (const std::uint32_t id : watched_to_the_end_) {
    ended.push_back(std::move(programs_[id]));
    programs_.erase(id);
  }
  watched_to_the_end_.clear();
  process = AddHeld(name);
  NoteLaunch(launch, process->id);
  // The watcher waits for the lock before it looks at the process, and lets go of it with the lock.
  program->Watch([this, process](std::uint32_t exit_code) mutable {
    device_.storage().Recount();
    const auto hold = device_.world().Acquire();
    Finish(*process, exit_code);
    watched_to_the_end_.push_back(process->id);
    process.reset();
  });
  programs_[process->id] = std::move(program);
  return ERROR_SUCCESS;
}

}  // namespace sim
