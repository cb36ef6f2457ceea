// Which events each action of the state machine can store.
#pragma once

#include <vector>

#include "mcftp/rules/state_table.h"

namespace test {

/// What an action may store, by its own rules. EveryTransitionTest makes each of them happen.
inline std::vector<mcftp::Event> StoredEvents(mcftp::Action action) {
  using mcftp::Action;
  using mcftp::Event;
  switch (action) {
    case Action::Nop: return {};
    case Action::ResetSession: return {Event::EventReady};
    case Action::AwaitAnnouncement:
      return {Event::EventAbort, Event::EventAnnouncement, Event::EventFileError,
              Event::EventShutdown};
    case Action::SendRequest:
      return {Event::EventAbort, Event::EventRequestSent, Event::EventNoServer,
              Event::EventShutdown};
    case Action::AwaitOack:
      return {Event::EventAbort,      Event::EventAnnouncement, Event::EventJoined,
              Event::EventErrorFrame, Event::EventData,         Event::EventJoinFailed,
              Event::EventTimeout};
    case Action::ReceiveBlocks:
      return {Event::EventAbort, Event::EventAnnouncement, Event::EventErrorFrame,
              Event::EventData,  Event::EventLastBlock,    Event::EventTimeout};
    case Action::CompleteAndDally:
      return {Event::EventAbort, Event::EventAnnouncement, Event::EventErrorFrame,
              Event::EventTimeout, Event::EventShutdown};
    case Action::Shutdown: return {Event::EventShutdown};
  }
  return {};
}

}  // namespace test
