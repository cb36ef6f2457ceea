// The process operations of the file class: finding, running and ending programs.
#include <coredll.h>

#include "device/file.h"

namespace device {
namespace {

constexpr std::uint32_t kNotRun = 0xFFFFFFFFU;

/// A program's name as the platform lists it.
using ProgramName = WideText<File::kNameSize>;
/// Room for the longest process parameters of a job.
using CommandLine = WideText<300>;

/// @return the id of the first process of exactly this name, 0 when there is none.
std::uint32_t FindByName(base::WideView name) noexcept {
  const SnapshotHandle snapshot(CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0));
  if (!snapshot) return 0;
  PROCESSENTRY32 entry = {};
  entry.dwSize = sizeof entry;
  for (BOOL more = Process32First(snapshot.get(), &entry); more != 0;
       more = Process32Next(snapshot.get(), &entry)) {
    entry.szExeFile[MAX_PATH - 1] = 0;
    if (name == entry.szExeFile) return entry.th32ProcessID;
  }
  return 0;
}

}  // namespace

std::uint32_t File::FindProcess(const char* program) noexcept {
  // What does not fit is refused: cut, it could be the name of another program.
  ProgramName name;
  return name.Assign(program) && !name.empty() ? FindByName(name.view()) : 0;
}

std::uint32_t File::RunProcess(const char* program, const char* parameters,
                               std::uint32_t wait_ms) noexcept {
  ProgramName name;
  CommandLine command_line;
  if (!name.Assign(program) || name.empty() || !command_line.Assign(parameters)) return kNotRun;
  // The device ignores the record; other platforms insist on one.
  STARTUPINFOW startup = {};
  startup.cb = sizeof startup;
  PROCESS_INFORMATION started = {};
  if (!Note(CreateProcessW(name.c_str(), command_line.data(), nullptr, nullptr, FALSE, 0, nullptr,
                           nullptr, &startup, &started) != 0)) {
    return kNotRun;
  }
  const ProcessHandle process(started.hProcess);
  const ThreadHandle thread(started.hThread);
  return WaitForSingleObject(process.get(), wait_ms);
}

bool File::StopProcess(const char* program) noexcept {
  const std::uint32_t id = FindProcess(program);
  if (id == 0) return false;
  const ProcessHandle process(OpenProcess(PROCESS_TERMINATE, FALSE, id));
  return process && Note(TerminateProcess(process.get(), 0) != 0);
}

}  // namespace device
