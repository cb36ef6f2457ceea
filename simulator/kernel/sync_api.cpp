// Events, mutexes, semaphores and waits.
#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/kernel.h"
#include "kernel/objects.h"

namespace sim {
namespace {

/// Makes the object, or finds the one that has the name already.
template <typename Object, typename... Arguments>
HANDLE Create(ApiCall& call, Kernel::Kind kind, const WCHAR* name, Arguments... arguments) {
  const World::Lock lock = call.world().Acquire();
  Device& device = call.device();
  std::shared_ptr<KernelObject> object = device.kernel().FindNamed(kind, name);
  // The one success that tells something through the last error; so it has to say "new", too.
  call.SetError(object != nullptr ? ERROR_ALREADY_EXISTS : ERROR_SUCCESS);
  if (object == nullptr) {
    object = std::make_shared<Object>(arguments...);
    device.kernel().Name(kind, name, object);
  }
  return call.Return(device.handles().Add(std::move(object)));
}

/// Does `action` with the object of this type behind `handle`.
template <typename Object, typename Action>
BOOL With(ApiCall& call, HANDLE handle, Action action) {
  call.Argument("handle", handle);
  if (call.failed()) return call.Return(FALSE);
  const World::Lock lock = call.world().Acquire();
  const std::shared_ptr<Object> object = call.device().handles().FindAs<Object>(handle);
  if (object == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return action(*object);
}

std::optional<Micros> Deadline(const World& world, DWORD timeout_ms) {
  if (timeout_ms == INFINITE) return std::nullopt;
  return world.now() + std::chrono::milliseconds(timeout_ms);
}

/// A loop around a wait that fails at once would otherwise never let go.
DWORD FailedWait(ApiCall& call, DWORD error, World::Lock& lock) {
  call.world().Yield(lock);
  return call.Fail(error, WAIT_FAILED);
}

DWORD FailedWait(ApiCall& call, DWORD error) {
  World::Lock lock = call.world().Acquire();
  return FailedWait(call, error, lock);
}

DWORD Wait(ApiCall& call, DWORD count, const HANDLE* handles, bool all, DWORD timeout_ms) {
  World::Lock lock = call.world().Acquire();
  ObjectWait::Objects objects;
  for (DWORD i = 0; i < count; ++i) {
    objects.push_back(call.device().handles().Find(handles[i]));
    if (objects.back() == nullptr || !objects.back()->can_be_awaited()) {
      return FailedWait(call, ERROR_INVALID_HANDLE, lock);
    }
  }
  const std::optional<Micros> deadline = Deadline(call.world(), timeout_ms);
  ObjectWait wait(call.thread(), std::move(objects), all);
  return call.Return(wait.Run(call.world(), lock, deadline));
}

}  // namespace
}  // namespace sim

using sim::ApiCall;

extern "C" {

HANDLE CreateEventW(SECURITY_ATTRIBUTES* /*security*/, BOOL manual_reset, BOOL initial_state,
                    const WCHAR* name) {
  ApiCall call("CreateEventW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("manual", manual_reset);
  call.Argument("set", initial_state);
  call.Argument("name", name);
  if (call.failed()) return call.Return(HANDLE{});
  return sim::Create<sim::EventObject>(call, sim::Kernel::Kind::kEvent, name, manual_reset != FALSE,
                                       initial_state != FALSE);
}

HANDLE OpenEventW(DWORD /*access*/, BOOL /*inherit*/, const WCHAR* name) {
  ApiCall call("OpenEventW", ERROR_FILE_NOT_FOUND);
  call.Argument("name", name);
  if (call.failed()) return call.Return(HANDLE{});
  if (name == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, HANDLE{});
  const sim::World::Lock lock = call.world().Acquire();
  std::shared_ptr<sim::KernelObject> object =
      call.device().kernel().FindNamed(sim::Kernel::Kind::kEvent, name);
  if (object == nullptr) return call.Fail(ERROR_FILE_NOT_FOUND, HANDLE{});
  return call.Return(call.device().handles().Add(std::move(object)));
}

BOOL SetEvent(HANDLE event) {
  ApiCall call("SetEvent", ERROR_INVALID_HANDLE);
  return sim::With<sim::EventObject>(call, event, [&call](sim::EventObject& object) {
    object.Set();
    return call.Return(TRUE);
  });
}

BOOL ResetEvent(HANDLE event) {
  ApiCall call("ResetEvent", ERROR_INVALID_HANDLE);
  return sim::With<sim::EventObject>(call, event, [&call](sim::EventObject& object) {
    object.Reset();
    return call.Return(TRUE);
  });
}

BOOL PulseEvent(HANDLE event) {
  ApiCall call("PulseEvent", ERROR_INVALID_HANDLE);
  return sim::With<sim::EventObject>(call, event, [&call](sim::EventObject& object) {
    object.Pulse();
    return call.Return(TRUE);
  });
}

BOOL EventModify(HANDLE event, DWORD action) {
  if (action == EVENT_SET) return SetEvent(event);
  if (action == EVENT_RESET) return ResetEvent(event);
  if (action == EVENT_PULSE) return PulseEvent(event);
  ApiCall call("EventModify", ERROR_INVALID_PARAMETER);
  return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
}

HANDLE CreateMutexW(SECURITY_ATTRIBUTES* /*security*/, BOOL initial_owner, const WCHAR* name) {
  ApiCall call("CreateMutexW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("owned", initial_owner);
  call.Argument("name", name);
  if (call.failed()) return call.Return(HANDLE{});
  // The request for ownership is ignored when the mutex exists already.
  return sim::Create<sim::MutexObject>(call, sim::Kernel::Kind::kMutex, name,
                                       initial_owner != FALSE ? &call.thread() : nullptr);
}

BOOL ReleaseMutex(HANDLE mutex) {
  ApiCall call("ReleaseMutex", ERROR_INVALID_HANDLE);
  return sim::With<sim::MutexObject>(call, mutex, [&call](sim::MutexObject& object) {
    if (!object.Release(call.thread())) return call.Fail(ERROR_NOT_OWNER, FALSE);
    return call.Return(TRUE);
  });
}

HANDLE CreateSemaphoreW(SECURITY_ATTRIBUTES* /*security*/, LONG initial, LONG maximum,
                        const WCHAR* name) {
  ApiCall call("CreateSemaphoreW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("initial", initial);
  call.Argument("maximum", maximum);
  call.Argument("name", name);
  if (call.failed()) return call.Return(HANDLE{});
  if (initial < 0 || maximum < 1 || initial > maximum) {
    return call.Fail(ERROR_INVALID_PARAMETER, HANDLE{});
  }
  return sim::Create<sim::SemaphoreObject>(call, sim::Kernel::Kind::kSemaphore, name, initial,
                                           maximum);
}

BOOL ReleaseSemaphore(HANDLE semaphore, LONG count, LONG* previous) {
  ApiCall call("ReleaseSemaphore", ERROR_INVALID_HANDLE);
  call.Argument("count", count);
  return sim::With<sim::SemaphoreObject>(call, semaphore, [&](sim::SemaphoreObject& object) {
    if (count < 1) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
    LONG before = 0;
    if (!object.Release(count, before)) return call.Fail(ERROR_TOO_MANY_POSTS, FALSE);
    if (previous != nullptr) *previous = before;
    return call.Return(TRUE);
  });
}

DWORD WaitForSingleObject(HANDLE object, DWORD timeout_ms) {
  ApiCall call("WaitForSingleObject", ERROR_INVALID_HANDLE);
  call.Argument("handle", object);
  call.Argument("ms", timeout_ms);
  if (call.failed()) return sim::FailedWait(call, call.fault_error());
  return sim::Wait(call, 1, &object, false, timeout_ms);
}

DWORD WaitForMultipleObjects(DWORD count, const HANDLE* objects, BOOL wait_all, DWORD timeout_ms) {
  ApiCall call("WaitForMultipleObjects", ERROR_INVALID_HANDLE);
  call.Argument("count", count);
  call.Argument("all", wait_all);
  call.Argument("ms", timeout_ms);
  if (call.failed()) return sim::FailedWait(call, call.fault_error());
  if (count == 0 || count > MAXIMUM_WAIT_OBJECTS || objects == nullptr) {
    return sim::FailedWait(call, ERROR_INVALID_PARAMETER);
  }
  return sim::Wait(call, count, objects, wait_all != FALSE, timeout_ms);
}

BOOL CloseHandle(HANDLE object) {
  ApiCall call("CloseHandle", ERROR_INVALID_HANDLE);
  call.Argument("handle", object);
  if (call.failed()) return call.Return(FALSE);
  const sim::World::Lock lock = call.world().Acquire();
  if (call.device().handles().Remove(object) == nullptr) {
    return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  }
  return call.Return(TRUE);
}

}  // extern "C"
