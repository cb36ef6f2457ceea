// Walks: a small job in which every call of the API that can fail does so, one call a run.
#pragma once

#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <string>
#include <string_view>
#include <vector>

namespace test {

/// Calls that give something back or end a thread. When one fails, what it should have given back
/// is kept (a file that cannot be closed stays open, and is asked for again and again), and no
/// program could do anything about it.
inline constexpr std::string_view kReleases[] = {
    "CloseHandle",     "FindClose",   "RegCloseKey",   "ReleasePowerRequirement",
    "UnmapViewOfFile", "WSACleanup",  "DestroyWindow", "CloseToolhelp32Snapshot",
    "TerminateThread", "closesocket", "PostMessageW",  "DeactivateDevice"};

inline bool IsRelease(const std::string& call) {
  return std::find(std::begin(kReleases), std::end(kReleases), call) != std::end(kReleases);
}

/// Far more than a job takes whose every wait runs into its limit, in seconds.
inline constexpr std::uint32_t kWalkLimit = 900;

/// Makes one run in a process of its own, so that a run that goes wrong spoils no other.
/// @tparam Walk  made with the number of the call; has Run, call, fired and Check
enum class WalkOutcome : std::uint8_t { kPassed = 0, kNotFired = 1, kFailed = 2 };
template <typename Walk>
WalkOutcome RunCall(std::uint64_t nth) {
  std::cout.flush();
  const pid_t child = fork();
  if (child == 0) {
    WalkOutcome outcome = WalkOutcome::kFailed;
    {
      Walk walk(nth);
      walk.Run();
      SCOPED_TRACE("call " + std::to_string(nth) + " failed: " + walk.call());
      walk.Check();
      outcome = walk.fired() ? WalkOutcome::kPassed : WalkOutcome::kNotFired;
    }
    std::cout.flush();
    _exit(static_cast<int>(::testing::Test::HasFailure() ? WalkOutcome::kFailed : outcome));
  }
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child || !WIFEXITED(status)) {
    return WalkOutcome::kFailed;
  }
  return static_cast<WalkOutcome>(std::min(WEXITSTATUS(status), 2));
}

/// Lets every `step`th call fail in turn, from the `first` on, until the job makes no more calls.
/// A failure names the call, and its number is enough to repeat the run.
/// @return the calls whose runs went wrong
template <typename Walk>
std::vector<std::uint64_t> WalkCalls(std::uint64_t first, std::uint64_t step) {
  // Collected first: a process inherits the failures that were noted before it began.
  std::vector<std::uint64_t> failed;
  std::uint64_t nth = first;
  for (WalkOutcome outcome = WalkOutcome::kPassed; outcome != WalkOutcome::kNotFired; nth += step) {
    if (nth >= 20000U) {
      ADD_FAILURE() << "the job does not end";
      break;
    }
    outcome = RunCall<Walk>(nth);
    if (outcome == WalkOutcome::kFailed) failed.push_back(nth);
  }
  ::testing::Test::RecordProperty("calls", static_cast<int>(nth));
  return failed;
}

}  // namespace test
