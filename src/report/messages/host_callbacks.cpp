#include "report/messages/host_callbacks.h"

#include "device/lock.h"

namespace report {
namespace {

/// As old as the process, and without a destructor.
struct State {
  device::Lock lock;  ///< around what follows, never around a call of the host
  HostCallbacks callbacks;
};
State host;

}  // namespace

void SetHostCallbacks(HostCallbacks callbacks) noexcept {
  const device::LockGuard lock(host.lock);
  host.callbacks = callbacks;
}

HostCallbacks GetHostCallbacks() noexcept {
  const device::LockGuard lock(host.lock);
  return host.callbacks;
}

}  // namespace report
