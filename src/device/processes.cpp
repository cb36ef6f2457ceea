// The process operations of the file class: finding, running and ending programs.
#include <coredll.h>

#include "device/file.h"

namespace device {
namespace {

constexpr std::uint32_t kNotRun = 0xFFFFFFFFU;

/// Room for the longest process parameters of a job.
using CommandLine = WideText<300>;

}  // namespace

std::uint32_t File::FindProcess(const char* program) noexcept {
  const WideText<kNameSize> name(program);
  const SnapshotHandle snapshot(CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0));
  if (!snapshot) return 0;
  PROCESSENTRY32 entry = {};
  entry.dwSize = sizeof entry;
  for (BOOL more = Process32First(snapshot.get(), &entry); more != 0;
       more = Process32Next(snapshot.get(), &entry)) {
    entry.szExeFile[MAX_PATH - 1] = 0;
    if (name.view() == entry.szExeFile) return entry.th32ProcessID;
  }
  return 0;
}

std::uint32_t File::RunProcess(const char* program, const char* parameters,
                               std::uint32_t wait_ms) noexcept {
  const WideText<kNameSize> name(program);
  if (name.empty()) return kNotRun;
  CommandLine command_line(parameters);
  PROCESS_INFORMATION started = {};
  if (!Note(CreateProcessW(name.c_str(), command_line.data(), nullptr, nullptr, FALSE, 0, nullptr,
                           nullptr, nullptr, &started) != 0)) {
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
