#include "report/messages/host_callbacks.h"

#include "device/lock.h"

namespace report {
namespace {

/// As old as the process, and without a destructor.
struct State {
  device::Lock lock;  ///< around what follows, never around a call of the host
  HostCallbacks callbacks;
};
State state;

}  // namespace

void SetHostCallbacks(HostCallbacks callbacks) noexcept {
  const device::LockGuard lock(state.lock);
  state.callbacks = callbacks;
}

HostCallbacks GetHostCallbacks() noexcept {
  const device::LockGuard lock(state.lock);
  return state.callbacks;
}

}  // namespace report
