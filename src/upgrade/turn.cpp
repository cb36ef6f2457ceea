#include "upgrade/turn.h"

#include <coredll.h>

#include <atomic>

namespace upgrade {
namespace {

constexpr std::uint32_t kPlaces = 8;
constexpr DWORD kLookEveryMs = 50;

struct Place {
  std::atomic<UpgradeConfig*> job;
  std::atomic<std::int32_t> mode;
  std::atomic<bool> presented;
};

// Numbers go up by one; 0 is none. The host's thread alone writes `last_taken`, the thread whose
// turn ends alone writes `serving`, so plain atomic values do.
std::atomic<std::uint32_t> last_taken{0};
std::atomic<std::uint32_t> serving{1};
Place places[kPlaces];

Place& PlaceOf(std::uint32_t number) noexcept {
  return places[number % kPlaces];
}

}  // namespace

std::uint32_t TakeNumber(UpgradeConfig* job, std::int32_t mode) noexcept {
  const std::uint32_t number = last_taken.load(std::memory_order_relaxed) + 1;
  if (number - serving.load(std::memory_order_relaxed) >= kPlaces) return 0;
  Place& place = PlaceOf(number);
  place.job.store(job, std::memory_order_relaxed);
  place.mode.store(mode, std::memory_order_relaxed);
  place.presented.store(false, std::memory_order_relaxed);
  last_taken.store(number, std::memory_order_relaxed);
  return number;
}

void GiveNumberBack(std::uint32_t number) noexcept {
  PlaceOf(number).job.store(nullptr, std::memory_order_relaxed);
  last_taken.store(number - 1, std::memory_order_relaxed);
}

bool AwaitTurn(std::uint32_t number, std::uint32_t timeout_ms) noexcept {
  std::uint32_t waited_ms = 0;
  while (serving.load(std::memory_order_relaxed) != number) {
    if (waited_ms >= timeout_ms) return false;
    Sleep(kLookEveryMs);
    if (timeout_ms != INFINITE) waited_ms += kLookEveryMs;
  }
  return true;
}

Handover HandoverOf(std::uint32_t number) noexcept {
  const Place& place = PlaceOf(number);
  return {place.job.load(std::memory_order_relaxed), place.mode.load(std::memory_order_relaxed),
          place.presented.load(std::memory_order_relaxed)};
}

void NotePresented(std::uint32_t number) noexcept {
  PlaceOf(number).presented.store(true, std::memory_order_relaxed);
}

void ForgetJob(const UpgradeConfig* job) noexcept {
  for (Place& place : places) {
    if (place.job.load(std::memory_order_relaxed) == job) {
      place.job.store(nullptr, std::memory_order_relaxed);
    }
  }
}

void EndTurn(std::uint32_t number) noexcept {
  serving.store(number + 1, std::memory_order_relaxed);
}

}  // namespace upgrade
