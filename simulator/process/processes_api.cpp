// The process calls of the Windows CE API.
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/kernel.h"
#include "process/processes.h"

namespace sim {
namespace {

/// The processes as they were when it was taken.
class Snapshot final : public KernelObject {
 public:
  std::vector<PROCESSENTRY32> entries;
  std::size_t next = 0;
};

PROCESSENTRY32 Describe(const Process& process, std::size_t threads) {
  constexpr LONG kNormalPriority = 3;
  PROCESSENTRY32 entry{};
  entry.dwSize = sizeof entry;
  entry.cntUsage = 1;
  entry.th32ProcessID = process.id;
  entry.th32ParentProcessID = process.parent;
  entry.cntThreads = static_cast<DWORD>(threads);
  entry.pcPriClassBase = kNormalPriority;
  process.name.copy(entry.szExeFile, MAX_PATH - 1);
  return entry;
}

/// Gives out the snapshot's next entry; `first` begins anew.
BOOL NextEntry(ApiCall& call, HANDLE handle, PROCESSENTRY32* entry, bool first) {
  call.Argument("snapshot", handle);
  if (call.failed()) return call.Return(FALSE);
  if (entry == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  if (entry->dwSize < sizeof *entry) return call.Fail(ERROR_INSUFFICIENT_BUFFER, FALSE);
  const auto lock = call.world().Acquire();
  const auto snapshot = call.device().handles().FindAs<Snapshot>(handle);
  if (snapshot == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  if (first) snapshot->next = 0;
  if (snapshot->next >= snapshot->entries.size()) return call.Fail(ERROR_NO_MORE_FILES, FALSE);
  const DWORD size = entry->dwSize;
  *entry = snapshot->entries[snapshot->next++];
  entry->dwSize = size;
  return call.Return(TRUE);
}

}  // namespace
}  // namespace sim

HANDLE CreateToolhelp32Snapshot(DWORD flags, DWORD /*process_id*/) {
  sim::ApiCall call("CreateToolhelp32Snapshot", ERROR_OUTOFMEMORY);
  call.Argument("flags", flags);
  if (call.failed()) return call.Return(INVALID_HANDLE_VALUE);
  const auto lock = call.world().Acquire();
  const auto snapshot = std::make_shared<sim::Snapshot>();
  if ((flags & TH32CS_SNAPPROCESS) != 0) {
    for (const auto& process : call.device().processes().running()) {
      const bool own = process->id == sim::Kernel::process_id();
      const std::size_t threads = own ? call.world().LiveThreads(call.device()) : 1;
      snapshot->entries.push_back(sim::Describe(*process, threads));
    }
  }
  return call.Return(call.device().handles().Add(snapshot));
}

BOOL CloseToolhelp32Snapshot(HANDLE snapshot) {
  // A failure that is injected closes the snapshot all the same: the caller cannot try again.
  sim::ApiCall call("CloseToolhelp32Snapshot", ERROR_INVALID_HANDLE);
  call.Argument("snapshot", snapshot);
  const auto lock = call.world().Acquire();
  sim::HandleTable& handles = call.device().handles();
  if (handles.FindAs<sim::Snapshot>(snapshot) == nullptr) {
    return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  }
  handles.Remove(snapshot);
  return call.Return(call.failed() ? FALSE : TRUE);
}

BOOL Process32First(HANDLE snapshot, PROCESSENTRY32* entry) {
  sim::ApiCall call("Process32First", ERROR_NO_MORE_FILES);
  return sim::NextEntry(call, snapshot, entry, true);
}

BOOL Process32Next(HANDLE snapshot, PROCESSENTRY32* entry) {
  sim::ApiCall call("Process32Next", ERROR_NO_MORE_FILES);
  return sim::NextEntry(call, snapshot, entry, false);
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
BOOL CreateProcessW(const WCHAR* program, WCHAR* command_line, SECURITY_ATTRIBUTES* /*process*/,
                    SECURITY_ATTRIBUTES* /*thread*/, BOOL inherit, DWORD flags, void* environment,
                    const WCHAR* folder, STARTUPINFOW* /*startup*/,
                    PROCESS_INFORMATION* information) {
  sim::ApiCall call("CreateProcessW", ERROR_FILE_NOT_FOUND);
  call.Argument("program", program);
  call.Argument("command_line", command_line);
  if (call.failed()) return call.Return(FALSE);
  // The device has neither inheritance nor environments nor current folders.
  if (program == nullptr || inherit != FALSE || environment != nullptr || folder != nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  if ((flags & CREATE_SUSPENDED) != 0) return call.Fail(ERROR_NOT_SUPPORTED, FALSE);
  std::shared_ptr<sim::Process> process;
  const DWORD error = call.device().processes().Start(program, command_line, process);
  if (error != ERROR_SUCCESS) return call.Fail(error, FALSE);
  const auto lock = call.world().Acquire();
  if (information != nullptr) {
    sim::HandleTable& handles = call.device().handles();
    information->hProcess = handles.Add(process);
    information->hThread = handles.Add(std::make_shared<sim::ProcessThread>(process));
    information->dwProcessId = process->id;
    information->dwThreadId = process->id + 1;
  }
  process.reset();  // with the lock held
  return call.Return(TRUE);
}

HANDLE OpenProcess(DWORD /*access*/, BOOL /*inherit*/, DWORD process_id) {
  sim::ApiCall call("OpenProcess", ERROR_INVALID_PARAMETER);
  call.Argument("process_id", process_id);
  const HANDLE none = nullptr;
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  const auto process = call.device().processes().Find(process_id);
  if (process == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, none);
  return call.Return(call.device().handles().Add(process));
}

BOOL TerminateProcess(HANDLE process, DWORD exit_code) {
  sim::ApiCall call("TerminateProcess", ERROR_ACCESS_DENIED);
  call.Argument("process", process);
  call.Argument("exit_code", exit_code);
  if (call.failed()) return call.Return(FALSE);
  const auto lock = call.world().Acquire();
  const auto found = call.device().handles().FindAs<sim::Process>(process);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  const DWORD error = call.device().processes().Terminate(*found, exit_code);
  return error == ERROR_SUCCESS ? call.Return(TRUE) : call.Fail(error, FALSE);
}

BOOL GetExitCodeProcess(HANDLE process, DWORD* exit_code) {
  sim::ApiCall call("GetExitCodeProcess", ERROR_INVALID_HANDLE);
  call.Argument("process", process);
  if (call.failed()) return call.Return(FALSE);
  if (exit_code == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  auto lock = call.world().Acquire();
  const auto found = call.device().handles().FindAs<sim::Process>(process);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  *exit_code = found->exit_code;
  if (*exit_code == STILL_ACTIVE) call.world().Yield(lock);
  return call.Return(TRUE);
}
