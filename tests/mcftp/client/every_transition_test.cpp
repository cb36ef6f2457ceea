// Every event that an action of the state machine can store, made to happen from outside, and where
// the client comes to rest then. With StateTableTest, which walks the table with the same events,
// this says of each cell that it is reached, or that nothing leads there.
#include <gmock/gmock.h>

#include <set>
#include <utility>

#include "mcftp/client/transfer_test.h"
#include "mcftp/rules/stored_events.h"

namespace {

using mcftp::Event;
using mcftp::State;
using std::chrono::milliseconds;
using std::chrono::seconds;
using test::Announcement;
using test::Data;
using test::kErrorFrame;
using test::kOackPassive;
using test::kUnknownFrame;
using test::kWaiting;
using test::Offer;

/// Where a client waits for something from outside.
enum class Rest {
  kFresh,      ///< for an announcement, with no file in hand
  kFileKnown,  ///< for an announcement of any file but the one that it knows
  kAsked,      ///< for an OACK
  kReceiving,  ///< for blocks
  kDallying,
  kEnded,
};

class EveryTransitionTest : public test::TransferTest {
 protected:
  struct Transition {
    State from;
    Event event;
    Rest rest;
    /// Brings a client that waits for its first announcement into the state.
    void (*enter)(EveryTransitionTest& test);
    /// Makes the state's action store the event.
    void (*happen)(EveryTransitionTest& test);
  };
  static const std::vector<Transition>& All();

  // ---- ways into the states ----
  static void AlreadyThere(EveryTransitionTest& /*test*/) {}
  static void Ask(EveryTransitionTest& test) { test.ToPublic(Announcement({})); }
  static void Receive(EveryTransitionTest& test) { test.Establish(); }
  static void Dally(EveryTransitionTest& test) { test.DallyBehind("00 20"); }
  static void DallyBehindTheLast(EveryTransitionTest& test) { test.DallyBehind("00 21"); }

  // ---- events ----
  static Offer Other() {
    Offer offer;
    offer.name = "\\Temp\\b.bin";
    return offer;
  }
  static void OtherFile(EveryTransitionTest& test) { test.ToPublic(Announcement(Other())); }
  static void Error(EveryTransitionTest& test) { test.ToClient(kErrorFrame); }
  static void Unknown(EveryTransitionTest& test) { test.ToClient(kUnknownFrame); }

  [[nodiscard]] Rest Observe() {
    const std::string last = Log().back();
    if (last == "McftpClient::StateMachineThread stopping") return Rest::kEnded;
    if (last == "Dallying...") return Rest::kDallying;
    if (last == kWaiting) {
      ToPublic(Announcement(offer_));
      return Log().empty() ? Rest::kFileKnown : Rest::kFresh;
    }
    if (last == "RRQ sent to 10.0.0.2") return Rest::kAsked;
    return Rest::kReceiving;
  }

  Offer offer_;  ///< of the file that may be known

 private:
  void DallyBehind(const char* header) {
    Offer offer;
    offer.header = header;
    offer.size = 512;
    EstablishAsMaster(offer);
    ToPrivate(Data(1, 512));
    EXPECT_EQ(Log().back(), "Dallying...");
  }
};

const std::vector<EveryTransitionTest::Transition>& EveryTransitionTest::All() {
  using Test = EveryTransitionTest;
  static const std::vector<Transition> all = {
      {State::StateReset, Event::EventReady, Rest::kFresh, AlreadyThere, AlreadyThere},

      {State::StateAwaitAnnouncement, Event::EventAbort, Rest::kFresh, AlreadyThere,
       [](Test& test) {
         Offer offer;
         offer.masks = "MR*";
         test.ToPublic(Announcement(offer));
       }},
      {State::StateAwaitAnnouncement, Event::EventAnnouncement, Rest::kAsked, AlreadyThere, Ask},
      {State::StateAwaitAnnouncement, Event::EventFileError, Rest::kFileKnown, AlreadyThere,
       [](Test& test) {
         test.offer_.name = "\\No\\Such\\a.bin";
         test.ToPublic(Announcement(test.offer_));
       }},
      {State::StateAwaitAnnouncement, Event::EventShutdown, Rest::kEnded, AlreadyThere,
       [](Test& test) { test.Wait(seconds(300)); }},

      {State::StateRequest, Event::EventAbort, Rest::kFresh, AlreadyThere,
       [](Test& test) {
         test.device().faults().Add({"sendto", 2, 1, WSAENETUNREACH});  // behind a status
         Ask(test);
       }},
      {State::StateRequest, Event::EventRequestSent, Rest::kAsked, AlreadyThere, Ask},
      {State::StateRequest, Event::EventNoServer, Rest::kFileKnown, Ask,
       [](Test& test) { test.Wait(seconds(8)); }},
      {State::StateRequest, Event::EventShutdown, Rest::kEnded, AlreadyThere,
       [](Test& test) {
         Offer offer;
         offer.header = "00 21";
         offer.size = 0;
         test.ToPublic(Announcement(offer));
       }},

      {State::StateAwaitOack, Event::EventAbort, Rest::kFresh, Ask, Unknown},
      {State::StateAwaitOack, Event::EventAnnouncement, Rest::kAsked, Ask, OtherFile},
      {State::StateAwaitOack, Event::EventJoined, Rest::kReceiving, Ask,
       [](Test& test) { test.ToClient(kOackPassive); }},
      {State::StateAwaitOack, Event::EventErrorFrame, Rest::kFresh, Ask, Error},
      {State::StateAwaitOack, Event::EventData, Rest::kFresh, Ask,
       [](Test& test) { test.ToClient(Data(1, 512)); }},
      {State::StateAwaitOack, Event::EventJoinFailed, Rest::kFresh, Ask,
       [](Test& test) { test.ToClient(test::Hex("00 70 00 00 1b 58 0a 00 00 09")); }},
      {State::StateAwaitOack, Event::EventTimeout, Rest::kAsked, Ask,
       [](Test& test) { test.Wait(milliseconds(1000)); }},

      {State::StateReceive, Event::EventAbort, Rest::kFresh, Receive, Unknown},
      {State::StateReceive, Event::EventAnnouncement, Rest::kFresh, Receive, OtherFile},
      {State::StateReceive, Event::EventErrorFrame, Rest::kFresh, Receive, Error},
      {State::StateReceive, Event::EventData, Rest::kReceiving, Receive,
       [](Test& test) {
         test.ToPrivate(Data(1, 512));
         test.ToPrivate(Data(1, 512));
       }},
      {State::StateReceive, Event::EventLastBlock, Rest::kDallying, Receive,
       [](Test& test) {
         for (unsigned block = 1; block <= 3; ++block) {
           test.ToPrivate(Data(block, block < 3 ? 512 : 276));
         }
         test.ToClient(test::kOackNak);
       }},
      {State::StateReceive, Event::EventTimeout, Rest::kFresh, Receive,
       [](Test& test) { test.Wait(seconds(32)); }},

      {State::StateDally, Event::EventAbort, Rest::kFresh, Dally, Unknown},
      {State::StateDally, Event::EventAnnouncement, Rest::kFresh, Dally, OtherFile},
      {State::StateDally, Event::EventErrorFrame, Rest::kFresh, Dally, Error},
      {State::StateDally, Event::EventTimeout, Rest::kFresh, Dally,
       [](Test& test) { test.Wait(seconds(5)); }},
      {State::StateDally, Event::EventShutdown, Rest::kEnded, DallyBehindTheLast,
       [](Test& test) { test.Wait(seconds(5)); }},

      {State::StateShutdown, Event::EventShutdown, Rest::kEnded, DallyBehindTheLast, Error},
  };
  return all;
}

using Place = std::pair<int, int>;  // state, event

Place PlaceOf(State state, Event event) {
  return {static_cast<int>(state), static_cast<int>(event)};
}

/// The state in which a client rests.
State StateOf(Rest rest) {
  switch (rest) {
    case Rest::kFresh:
    case Rest::kFileKnown: return State::StateAwaitAnnouncement;
    case Rest::kAsked: return State::StateAwaitOack;
    case Rest::kReceiving: return State::StateReceive;
    case Rest::kDallying: return State::StateDally;
    case Rest::kEnded: return State::StateShutdown;
  }
  return State::StateReset;  // not reached
}

/// The state in which the machine waits when it goes on by itself from this one.
State RestingStateFrom(State state) {
  if (state == State::StateReset) return State::StateAwaitAnnouncement;
  if (state == State::StateRequest) return State::StateAwaitOack;
  return state;
}

TEST_F(EveryTransitionTest, ListsEveryEventThatAnActionCanStore) {
  std::set<Place> listed;
  for (const Transition& transition : All()) {
    EXPECT_TRUE(listed.insert(PlaceOf(transition.from, transition.event)).second);
  }
  std::set<Place> stored;
  for (std::uint32_t state = 0; state < mcftp::kStates; ++state) {
    std::set<mcftp::Action> actions;
    for (const mcftp::Cell& cell : mcftp::kTransitions[state]) actions.insert(cell.action);
    for (const mcftp::Action action : actions) {
      for (const Event event : test::StoredEvents(action)) {
        stored.insert(PlaceOf(State{state}, event));
      }
    }
  }
  EXPECT_EQ(listed, stored);
}

TEST_F(EveryTransitionTest, EndsWhereTheTableSays) {
  for (const Transition& transition : All()) {
    const Place place = PlaceOf(transition.from, transition.event);
    SCOPED_TRACE("state " + std::to_string(place.first) + ", event " +
                 std::to_string(place.second));
    offer_ = {};
    Start("-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -UP=5655 -HV=TQ52", true);
    transition.enter(*this);

    transition.happen(*this);

    EXPECT_EQ(Observe(), transition.rest);
    EXPECT_EQ(StateOf(transition.rest),
              RestingStateFrom(mcftp::At(transition.from, transition.event).next));
    device().faults().Clear();
    EXPECT_EQ(End(), 0);
    EXPECT_THAT(Log(), ::testing::Not(::testing::Contains("State machine called nop()")));
    Forget();
  }
}

}  // namespace
