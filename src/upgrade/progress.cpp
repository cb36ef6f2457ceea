#include "upgrade/progress.h"

#include <atomic>

#include "report/window/progress_window.h"

namespace upgrade {
namespace {

std::atomic<std::uint32_t> announced_bytes{0};
std::atomic<std::uint32_t> expected_bytes{0};
std::atomic<std::uint32_t> received_bytes{0};

}  // namespace

void SetExpectedBytes(std::uint32_t bytes) noexcept {
  announced_bytes.store(bytes, std::memory_order_relaxed);
}

std::uint32_t AnnouncedBytes() noexcept {
  return announced_bytes.load(std::memory_order_relaxed);
}

void BeginReceiving(std::uint32_t expected) noexcept {
  expected_bytes.store(expected, std::memory_order_relaxed);
  received_bytes.store(0, std::memory_order_relaxed);
}

void AddReceivedBytes(std::uint32_t bytes) noexcept {
  const std::uint32_t received = received_bytes.load(std::memory_order_relaxed) + bytes;
  received_bytes.store(received, std::memory_order_relaxed);
  report::SetOverallProgress(
      OverallPercent(received, expected_bytes.load(std::memory_order_relaxed)));
}

}  // namespace upgrade
