#include "upgrade/turn.h"

#include <coredll.h>

#include "device/lock.h"
#include "upgrade/progress.h"

namespace upgrade {
namespace {

constexpr std::uint32_t kPlaces = 8;
constexpr DWORD kLookEveryMs = 50;

struct Place {
  Handover handed;
  bool given_back = false;  ///< no thread will come for this number
};

// Numbers go up by one; 0 is none. The lock also orders what one job's thread did before what the
// next one's does.
device::Lock lock;
std::uint32_t last_taken = 0;
std::uint32_t serving = 1;
Place places[kPlaces];

Place& PlaceOf(std::uint32_t number) noexcept {
  return places[number % kPlaces];
}

/// Lock held.
void SkipNumbersGivenBack() noexcept {
  while (serving <= last_taken && PlaceOf(serving).given_back) ++serving;
}

bool IsServing(std::uint32_t number) noexcept {
  const device::LockGuard guard(lock);
  return serving == number;
}

}  // namespace

std::uint32_t TakeNumber(UpgradeConfig* job, std::int32_t mode) noexcept {
  const device::LockGuard guard(lock);
  const std::uint32_t number = last_taken + 1;
  if (number - serving >= kPlaces) return 0;
  PlaceOf(number) = {{job, mode, false, AnnouncedBytes()}, false};
  last_taken = number;
  return number;
}

void GiveNumberBack(std::uint32_t number) noexcept {
  const device::LockGuard guard(lock);
  PlaceOf(number) = {Handover(), true};
  SkipNumbersGivenBack();
}

bool AwaitTurn(std::uint32_t number, std::uint32_t timeout_ms) noexcept {
  std::uint32_t waited_ms = 0;
  while (!IsServing(number)) {
    if (waited_ms >= timeout_ms) return false;
    Sleep(kLookEveryMs);
    if (timeout_ms != INFINITE) waited_ms += kLookEveryMs;
  }
  return true;
}

Handover HandoverOf(std::uint32_t number) noexcept {
  const device::LockGuard guard(lock);
  return PlaceOf(number).handed;
}

void NotePresented(std::uint32_t number) noexcept {
  const device::LockGuard guard(lock);
  PlaceOf(number).handed.presented = true;
}

void ForgetJob(const UpgradeConfig* job) noexcept {
  const device::LockGuard guard(lock);
  for (Place& place : places) {
    if (place.handed.job == job) place.handed.job = nullptr;
  }
}

void EndTurn(std::uint32_t number) noexcept {
  const device::LockGuard guard(lock);
  serving = number + 1;
  SkipNumbersGivenBack();
}

}  // namespace upgrade
