#include "upgrade/progress.h"

#include <atomic>

#include "device/lock.h"
#include "report/window/progress_window.h"

namespace upgrade {
namespace {

std::atomic<std::uint32_t> announced_bytes{0};
std::atomic<std::uint32_t> expected_bytes{0};

// Files of 4 GiB in all and more: no single word of the device holds this.
device::Lock received_lock;
std::uint64_t received_bytes = 0;  // under received_lock

}  // namespace

void SetExpectedBytes(std::uint32_t bytes) noexcept {
  announced_bytes.store(bytes, std::memory_order_relaxed);
}

std::uint32_t AnnouncedBytes() noexcept {
  return announced_bytes.load(std::memory_order_relaxed);
}

void BeginReceiving(std::uint32_t expected) noexcept {
  expected_bytes.store(expected, std::memory_order_relaxed);
  const device::LockGuard guard(received_lock);
  received_bytes = 0;
}

void AddReceivedBytes(std::uint32_t bytes) noexcept {
  std::uint64_t received = 0;
  {
    const device::LockGuard guard(received_lock);
    received = received_bytes += bytes;
  }
  report::SetOverallProgress(
      OverallPercent(received, expected_bytes.load(std::memory_order_relaxed)));
}

}  // namespace upgrade
