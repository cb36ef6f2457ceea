// The client's state machine: all of it, as one table.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace mcftp {

enum class State : std::uint32_t {
  StateReset,
  StateAwaitAnnouncement,
  StateRequest,
  StateAwaitOack,
  StateReceive,
  StateDally,
  StateShutdown
};

enum class Event : std::uint32_t {
  EventAbort,         ///< a failure or an unexpected frame
  EventRequestSent,   ///< a read request went out
  EventAnnouncement,  ///< a file was accepted, or an announcement interrupts
  EventJoined,        ///< member of the file's private group
  EventErrorFrame,    ///< the server says ERROR
  EventData,          ///< a block came that is not the last to come
  EventReady,         ///< everything of the last file is forgotten
  EventJoinFailed,    ///< no member of the private group
  EventLastBlock,     ///< the file is complete
  EventTimeout,       ///< no frame in time
  EventNoServer,      ///< all requests are spent
  EventFileError,     ///< the output file cannot be opened
  EventShutdown       ///< there is nothing more to receive
};

enum class Action : std::uint8_t {
  Nop,
  ResetSession,
  AwaitAnnouncement,
  SendRequest,
  AwaitOack,
  ReceiveBlocks,
  CompleteAndDally,
  Shutdown
};

inline constexpr std::size_t kStates = 7;
inline constexpr std::size_t kEvents = 13;
inline constexpr std::size_t kActions = 8;

struct Cell {
  Action action = Action::Nop;
  State next = State::StateReset;
};
using TransitionTable = std::array<std::array<Cell, kEvents>, kStates>;

/// Letters of the table below, in the order of Action.
inline constexpr std::string_view kActionLetters = "-RAQOBDS";

/// Turns "action/next " cells, four characters each, into the table. Any slip in the text (a
/// missing or surplus cell, an unknown letter or state) empties the whole table, and the assertions
/// below turn that into a compile error.
constexpr TransitionTable ReadTable(const std::string_view text) {
  TransitionTable table{};
  if (text.size() != kStates * kEvents * 4) return {};
  for (std::size_t at = 0; at < kStates * kEvents; ++at) {
    const std::size_t action = kActionLetters.find(text[at * 4]);
    const int next = text[at * 4 + 2] - '0';
    if (action == std::string_view::npos || text[at * 4 + 1] != '/') return {};
    if (next < 0 || next >= static_cast<int>(kStates) || text[at * 4 + 3] != ' ') return {};
    table[at / kEvents][at % kEvents] = {static_cast<Action>(action), static_cast<State>(next)};
  }
  return table;
}

// Read a cell as: what runs when the machine arrives in this row with this event / where it goes
// from this row when an action there stores this event.
inline constexpr TransitionTable kTransitions = ReadTable(
    // clang-format off
    // event                 0   1   2   3   4   5   6   7   8   9  10  11  12
    /* 0 Reset             */ "R/0 -/0 R/0 R/0 R/0 R/0 -/1 R/0 -/0 R/0 -/0 R/0 -/6 "
    /* 1 AwaitAnnouncement */ "-/0 -/3 -/2 -/0 -/0 -/0 A/1 -/1 -/1 A/1 A/1 A/1 -/6 "
    /* 2 Request           */ "-/0 -/3 Q/2 -/2 -/2 -/0 -/2 -/2 -/2 Q/2 -/1 -/2 -/6 "
    /* 3 AwaitOack         */ "-/0 O/3 -/2 -/4 -/0 -/0 -/3 -/0 -/3 -/2 -/3 -/3 -/6 "
    /* 4 Receive           */ "-/0 -/4 -/0 B/4 -/0 B/4 -/4 -/4 -/5 -/0 -/4 -/0 -/6 "
    /* 5 Dally             */ "-/0 -/5 -/0 -/0 -/0 -/5 -/5 -/5 D/5 -/0 -/5 -/5 -/6 "
    /* 6 Shutdown          */ "-/6 -/6 -/6 -/6 -/6 -/6 -/6 -/6 -/6 -/6 -/6 -/6 S/6 ");
// clang-format on

[[nodiscard]] constexpr const Cell& At(State state, Event event) noexcept {
  return kTransitions[static_cast<std::size_t>(state)][static_cast<std::size_t>(event)];
}

constexpr bool EveryStateObeysShutdown() {
  for (const auto& row : kTransitions) {
    if (row[static_cast<std::size_t>(Event::EventShutdown)].next != State::StateShutdown) {
      return false;
    }
  }
  return true;
}
static_assert(EveryStateObeysShutdown(), "whatever the state, a shutdown is a shutdown");
static_assert(At(State::StateReset, Event::EventReady).next == State::StateAwaitAnnouncement);
static_assert(At(State::StateShutdown, Event::EventShutdown).action == Action::Shutdown);

}  // namespace mcftp
