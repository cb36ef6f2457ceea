// Walks the state machine with every event that each action can store.
#include "mcftp/rules/state_table.h"

#include <gmock/gmock.h>

#include <deque>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "mcftp/rules/stored_events.h"

namespace {

using mcftp::Action;
using mcftp::At;
using mcftp::Event;
using mcftp::State;
using ::testing::UnorderedElementsAre;

using Place = std::pair<int, int>;  // state, event

std::set<Place> ReachedPlaces() {
  std::set<Place> reached = {{0, 0}};
  std::deque<Place> next = {{0, 0}};
  while (!next.empty()) {
    const State state{static_cast<std::uint32_t>(next.front().first)};
    const Event event{static_cast<std::uint32_t>(next.front().second)};
    next.pop_front();
    if (state == State::StateShutdown) continue;
    for (const Event stored : test::StoredEvents(At(state, event).action)) {
      const Place place(static_cast<int>(At(state, stored).next), static_cast<int>(stored));
      if (reached.insert(place).second) next.push_back(place);
    }
  }
  return reached;
}

TEST(StateTableTest, ReachesSixteenCellsAndNoneInWhichTheMachineSleepsForEver) {
  const std::set<Place> reached = ReachedPlaces();

  EXPECT_THAT(reached, UnorderedElementsAre(Place(0, 0), Place(0, 2), Place(0, 4), Place(0, 5),
                                            Place(0, 7), Place(0, 9), Place(1, 6), Place(1, 10),
                                            Place(1, 11), Place(2, 2), Place(2, 9), Place(3, 1),
                                            Place(4, 3), Place(4, 5), Place(5, 8), Place(6, 12)));
  for (const auto& [state, event] : reached) {
    const auto& cell =
        At(State{static_cast<std::uint32_t>(state)}, Event{static_cast<std::uint32_t>(event)});
    EXPECT_NE(cell.action, Action::Nop) << state << ", " << event;
  }
}

TEST(StateTableTest, HoldsThreeActionsThatNothingReaches) {
  const std::set<Place> reached = ReachedPlaces();

  std::vector<Place> idle;
  for (int state = 0; state < 7; ++state) {
    for (int event = 0; event < 13; ++event) {
      const auto& cell =
          At(State{static_cast<std::uint32_t>(state)}, Event{static_cast<std::uint32_t>(event)});
      if (cell.action != Action::Nop && reached.count({state, event}) == 0) {
        idle.emplace_back(state, event);
      }
    }
  }
  EXPECT_THAT(idle, UnorderedElementsAre(Place(0, 3), Place(0, 11), Place(1, 9)));
}

TEST(StateTableTest, RunsInEachStateOnlyTheStatesOwnAction) {
  static constexpr Action kOwn[] = {
      Action::ResetSession,  Action::AwaitAnnouncement, Action::SendRequest, Action::AwaitOack,
      Action::ReceiveBlocks, Action::CompleteAndDally,  Action::Shutdown};
  int cells = 0;
  for (std::size_t state = 0; state < mcftp::kStates; ++state) {
    for (const mcftp::Cell& cell : mcftp::kTransitions[state]) {
      if (cell.action == Action::Nop) continue;
      EXPECT_EQ(cell.action, kOwn[state]);
      ++cells;
    }
  }
  EXPECT_EQ(cells, 19);
}

TEST(StateTableTest, RefusesADamagedTable) {
  EXPECT_TRUE(mcftp::ReadTable("")[0][0].action == Action::Nop);
  std::string text;
  for (int i = 0; i < 91; ++i) text += "A/1 ";
  EXPECT_TRUE(mcftp::ReadTable(text)[6][12].action == Action::AwaitAnnouncement);
  for (const auto& [at, wrong] : {std::pair(0, 'x'), std::pair(5, '-'), std::pair(6, '7'),
                                  std::pair(7, 'A'), std::pair(6, '/')}) {
    std::string damaged = text;
    damaged[static_cast<std::size_t>(at)] = wrong;
    EXPECT_TRUE(mcftp::ReadTable(damaged)[6][12].action == Action::Nop) << at;
  }
}

}  // namespace
