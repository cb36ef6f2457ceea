#include "faults/faults.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "support/device_test.h"

namespace {

class FaultsTest : public DeviceTest {
 protected:
  sim::Faults& faults() { return device().faults(); }

  /// Sets `event` `count` times. @return one letter a call: . for success, x for failure.
  static std::string Set(HANDLE event, int count) {
    std::string seen;
    for (int i = 0; i < count; ++i) seen += SetEvent(event) != FALSE ? '.' : 'x';
    return seen;
  }

  HANDLE event_ = CreateEventW(nullptr, TRUE, FALSE, nullptr);
};

TEST_F(FaultsTest, TheNthCallFails) {
  faults().Add({"SetEvent", 3, 1, 112});
  EXPECT_EQ(Set(event_, 2), "..");
  SetLastError(1);
  EXPECT_EQ(Set(event_, 1), "x");
  EXPECT_EQ(GetLastError(), 112U);
  EXPECT_EQ(Set(event_, 3), "...");
  EXPECT_EQ(faults().fired(), 1U);
  EXPECT_EQ(faults().last_fired(), "SetEvent");
}

TEST_F(FaultsTest, SeveralCallsInARowFail) {
  faults().Add({"SetEvent", 2, 3, 5});
  EXPECT_EQ(Set(event_, 6), ".xxx..");
}

TEST_F(FaultsTest, EveryCallFromTheNthOnFails) {
  faults().Add({"SetEvent", 4, 0, 14});
  EXPECT_EQ(Set(event_, 7), "...xxxx");
}

TEST_F(FaultsTest, ARuleWithoutErrorSetsTheUsualOne) {
  faults().Add({"CreateEventW", 1, 1, 0});
  EXPECT_EQ(CreateEventW(nullptr, TRUE, FALSE, nullptr), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_NOT_ENOUGH_MEMORY);
}

TEST_F(FaultsTest, CallsAreToldApartByTheirPlacesAndTheWaysThere) {
  const auto other = [this] { return Set(event_, 2); };
  faults().NotePlaces();
  Set(event_, 2);
  SetEvent(event_);
  other();
  GetTickCount();  // cannot fail
  const std::vector<std::uint64_t> places = faults().places();
  ASSERT_EQ(places.size(), 5U);
  EXPECT_EQ(places[0], places[1]);
  EXPECT_NE(places[0], places[2]);
  EXPECT_EQ(places[3], places[4]);
  EXPECT_NE(places[0], places[3]) << "the same line, by another way";
}

TEST_F(FaultsTest, PlacesAreNotedBesideRules) {
  faults().Add({"SetEvent", 2, 1, 5});
  faults().NotePlaces();
  EXPECT_EQ(Set(event_, 3), ".x.");
  faults().Clear();
  EXPECT_EQ(Set(event_, 1), ".");
  EXPECT_EQ(faults().places().size(), 4U);
}

TEST_F(FaultsTest, AFailedCallHasNoEffect) {
  faults().Add({"SetEvent", 1, 1, 5});
  Set(event_, 1);
  EXPECT_EQ(WaitForSingleObject(event_, 0), WAIT_TIMEOUT);
}

TEST_F(FaultsTest, RulesCountFromWhenTheyWereMade) {
  EXPECT_EQ(Set(event_, 5), ".....");
  faults().Add({"SetEvent", 2, 1, 5});
  EXPECT_EQ(Set(event_, 3), ".x.");
}

TEST_F(FaultsTest, RulesCountIndependentlyOfEachOther) {
  faults().Add({"SetEvent", 1, 1, 5});
  faults().Add({"SetEvent", 3, 1, 6});
  EXPECT_EQ(Set(event_, 4), "x.x.");
  EXPECT_EQ(GetLastError(), 6U);
}

TEST_F(FaultsTest, OfTwoRulesForOneCallTheFirstNamesTheError) {
  faults().Add({"SetEvent", 1, 1, 5});
  faults().Add({"SetEvent", 1, 1, 6});
  Set(event_, 1);
  EXPECT_EQ(GetLastError(), 5U);
  EXPECT_EQ(faults().fired(), 1U);
}

TEST_F(FaultsTest, AStarCountsTheCallsThatCanFailAndNoOthers) {
  faults().Add({"*", 2, 1, 31});
  Sleep(1);
  EXPECT_NE(SetEvent(event_), FALSE);
  GetTickCount();
  EXPECT_EQ(ResetEvent(event_), FALSE);
  EXPECT_EQ(GetLastError(), 31U);
  EXPECT_EQ(faults().last_fired(), "ResetEvent");
}

TEST_F(FaultsTest, CallsAreCountedWithAndWithoutRules) {
  const std::uint64_t before = faults().Count("*");
  Set(event_, 2);
  Sleep(1);
  faults().Add({"SetEvent", 1, 1, 5});
  Set(event_, 1);
  EXPECT_EQ(faults().Count("SetEvent"), 3U) << "failed calls count, too";
  EXPECT_EQ(faults().Count("Sleep"), 1U);
  EXPECT_EQ(faults().Count("*"), before + 3);
  EXPECT_EQ(faults().Count("NeverCalled"), 0U);
}

TEST_F(FaultsTest, OtherFunctionsAreLeftAlone) {
  faults().Add({"ResetEvent", 1, 0, 5});
  EXPECT_EQ(Set(event_, 3), "...");
  EXPECT_EQ(faults().fired(), 0U);
  EXPECT_EQ(faults().last_fired(), "");
}

TEST_F(FaultsTest, ClearedRulesFailNothing) {
  faults().Add({"SetEvent", 1, 0, 5});
  EXPECT_EQ(Set(event_, 2), "xx");
  faults().Clear();
  EXPECT_EQ(Set(event_, 2), "..");
  EXPECT_EQ(faults().fired(), 2U);
}

TEST_F(FaultsTest, FaultsBelongToOneDevice) {
  const test::TemporaryFolder folder;
  sim::Device other(world(), sim::Profile{}, folder.path());
  faults().Add({"*", 1, 0, 5});
  {
    const sim::AttachedThread there(other);
    EXPECT_NE(CreateEventW(nullptr, TRUE, FALSE, nullptr), nullptr);
  }
  EXPECT_EQ(CreateEventW(nullptr, TRUE, FALSE, nullptr), nullptr);
}

}  // namespace
