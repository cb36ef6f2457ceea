// Upgrades one after the other.
//
// The host may hand over a job while an earlier one is still putting things away, or, by ending a
// group twice, the same job again. Both would share the event, the connection, the window and the
// job itself. So every job takes a number and begins when all before it have ended.
#pragma once

#include <cstdint>

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// What is kept about a job that was handed over.
struct Handover {
  UpgradeConfig* job = nullptr;      ///< null when a run before it has freed the job
  std::int32_t mode = 0;             ///< 0: what multicast did not bring; else everything by HTTP
  bool presented = false;            ///< the progress window has been opened for it
  std::uint32_t expected_bytes = 0;  ///< as announced when it was handed over
};

/// Takes a place behind the jobs that were handed over before. Any thread, as all of these.
/// @return the number, or 0 when too many wait already.
std::uint32_t TakeNumber(UpgradeConfig* job, std::int32_t mode) noexcept;

/// Gives a number up, because no thread runs it.
void GiveNumberBack(std::uint32_t number) noexcept;

/// Waits until it is this number's turn.
/// @param timeout_ms  INFINITE: as long as it takes
/// @return false when the time ran out.
bool AwaitTurn(std::uint32_t number, std::uint32_t timeout_ms) noexcept;

[[nodiscard]] Handover HandoverOf(std::uint32_t number) noexcept;

/// Notes that the window was opened. By the thread that took the number.
void NotePresented(std::uint32_t number) noexcept;

/// Takes the job away from every number: it is about to be freed. By the thread whose turn it is.
void ForgetJob(const UpgradeConfig* job) noexcept;

/// Ends this number's turn; the next one begins.
void EndTurn(std::uint32_t number) noexcept;

}  // namespace upgrade
