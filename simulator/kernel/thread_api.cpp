// Threads, time and the last error.
#include <system_error>

#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/kernel.h"
#include "kernel/objects.h"

namespace {

using sim::ApiCall;

/// A program that asks for the time this often without a pause waits for time to pass.
constexpr std::uint32_t kAsksBeforeTimePasses = 1000;

std::shared_ptr<sim::ThreadObject> FindThread(const ApiCall& call, HANDLE handle) {
  return call.device().handles().FindAs<sim::ThreadObject>(handle);
}

}  // namespace

extern "C" {

HANDLE CreateThread(SECURITY_ATTRIBUTES* /*security*/, DWORD stack_size,
                    LPTHREAD_START_ROUTINE start, void* argument, DWORD flags, DWORD* thread_id) {
  ApiCall call("CreateThread", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("stack", stack_size);
  call.Argument("flags", flags);
  if (call.failed()) return call.Return(HANDLE{});
  if (start == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, HANDLE{});
  sim::World& world = call.world();
  const sim::World::Lock lock = world.Acquire();
  try {
    sim::SimThread& thread = world.Spawn(
        call.device(), "thread", [start, argument] { return start(argument); },
        (flags & CREATE_SUSPENDED) != 0);
    if (thread_id != nullptr) *thread_id = thread.id;
    return call.Return(call.device().handles().Add(std::make_shared<sim::ThreadObject>(thread)));
  } catch (const std::system_error&) {
    return call.Fail(ERROR_NOT_ENOUGH_MEMORY, HANDLE{});
  }
}

DWORD ResumeThread(HANDLE thread) {
  constexpr DWORD kFailed = 0xFFFFFFFFU;
  ApiCall call("ResumeThread", ERROR_INVALID_HANDLE);
  call.Argument("handle", thread);
  if (call.failed()) return call.Return(kFailed);
  const sim::World::Lock lock = call.world().Acquire();
  const auto object = FindThread(call, thread);
  if (object == nullptr) return call.Fail(ERROR_INVALID_HANDLE, kFailed);
  const bool suspended = object->thread().state == sim::SimThread::State::kSuspended;
  call.world().Resume(object->thread());
  return call.Return(suspended ? DWORD{1} : DWORD{0});
}

BOOL TerminateThread(HANDLE thread, DWORD exit_code) {
  ApiCall call("TerminateThread", ERROR_ACCESS_DENIED);
  call.Argument("handle", thread);
  call.Argument("code", exit_code);
  if (call.failed()) return call.Return(FALSE);
  sim::World::Lock lock = call.world().Acquire();
  const auto object = FindThread(call, thread);
  if (object == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  call.world().Terminate(object->thread(), exit_code);
  // A thread that ends itself does so here; this call is its last.
  if (&object->thread() == &call.thread()) call.world().Block(lock, {}, std::nullopt);
  return call.Return(TRUE);
}

BOOL GetExitCodeThread(HANDLE thread, DWORD* exit_code) {
  ApiCall call("GetExitCodeThread", ERROR_INVALID_HANDLE);
  call.Argument("handle", thread);
  if (call.failed()) return call.Return(FALSE);
  if (exit_code == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  sim::World::Lock lock = call.world().Acquire();
  const auto object = FindThread(call, thread);
  if (object == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  *exit_code = object->thread().exit_code;
  if (*exit_code == STILL_ACTIVE) call.world().Yield(lock);
  return call.Return(TRUE);
}

DWORD GetCurrentThreadId() {
  ApiCall call("GetCurrentThreadId", sim::kCannotFail);
  return call.Return(DWORD{call.thread().id});
}

DWORD GetCurrentProcessId() {
  ApiCall call("GetCurrentProcessId", sim::kCannotFail);
  return call.Return(DWORD{sim::Kernel::process_id()});
}

void Sleep(DWORD duration_ms) {
  ApiCall call("Sleep", sim::kCannotFail);
  call.Argument("ms", duration_ms);
  sim::World& world = call.world();
  sim::World::Lock lock = world.Acquire();
  sim::Kernel& kernel = call.device().kernel();
  kernel.NoteSleep(call.thread().id, duration_ms);
  if (duration_ms == 0 || kernel.skips_sleeps()) {
    world.Yield(lock);
    return;
  }
  std::optional<sim::Micros> until;
  if (duration_ms != INFINITE) until = world.now() + kernel.SleepTime(duration_ms);
  world.WaitUntil(lock, {}, until, [] { return false; });
}

DWORD GetTickCount() {
  ApiCall call("GetTickCount", sim::kCannotFail);
  sim::World::Lock lock = call.world().Acquire();
  if (++call.thread().time_asked >= kAsksBeforeTimePasses) {
    call.world().Block(lock, {}, call.world().now() + std::chrono::milliseconds(1));
  }
  return call.Return(DWORD{call.device().kernel().TickCount()});
}

DWORD GetLastError() {
  ApiCall call("GetLastError", sim::kCannotFail);
  return call.Return(DWORD{call.thread().last_error});
}

void SetLastError(DWORD error) {
  ApiCall call("SetLastError", sim::kCannotFail);
  call.Argument("error", error);
  call.SetError(error);
}

}  // extern "C"
