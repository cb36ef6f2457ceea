#include "server/multicast/pace.h"

#include <gtest/gtest.h>

#include <chrono>

namespace server {
namespace {

using std::chrono::hours;
using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr std::uint64_t kFrame = 1250;  // 10,000 bits: a millisecond at 10 Mbit/s

/// Frames that may go out at one moment.
int Burst(Pace& pace, Micros now) {
  int frames = 0;
  for (; pace.Ready(now) && frames < 1000; ++frames) pace.Take(kFrame, now);
  return frames;
}

TEST(PaceTest, LetsFourFramesOutAtOnceAndThenOneWheneverItsTimeHasCome) {
  Pace pace(10'000'000, kFrame);
  EXPECT_EQ(Burst(pace, seconds(1)), 4);
  EXPECT_EQ(pace.ReadyAt(seconds(1)), seconds(1) + milliseconds(1));
  EXPECT_FALSE(pace.Ready(seconds(1) + Micros(999)));
  EXPECT_EQ(Burst(pace, seconds(1) + milliseconds(1)), 1);
}

TEST(PaceTest, HoldsNoMoreThanFourFramesAfterALongPause) {
  Pace pace(10'000'000, kFrame);
  Burst(pace, seconds(1));
  EXPECT_EQ(Burst(pace, seconds(1) + hours(100)), 4);
}

TEST(PaceTest, SendsAsMuchAsTheRateSays) {
  Pace pace(1'000'000, kFrame);
  int frames = 0;
  for (Micros now{0}; now < seconds(10); now += Micros(77)) frames += Burst(pace, now);
  EXPECT_NEAR(frames, 1000, 5);
}

TEST(PaceTest, KnowsNoLimitWithoutARate) {
  Pace pace(0, kFrame);
  EXPECT_EQ(Burst(pace, seconds(1)), 1000);
  EXPECT_EQ(pace.ReadyAt(seconds(1)), seconds(1));
}

TEST(PaceTest, WorksAtBothEndsOfWhatARateCanBe) {
  Pace slow(1, kFrame);
  EXPECT_EQ(Burst(slow, Micros(0)), 4);
  EXPECT_EQ(slow.ReadyAt(Micros(0)), seconds(10'000));
  EXPECT_EQ(Burst(slow, seconds(10'000)), 1);
  Pace fast(1'000'000'000'000, kFrame);
  EXPECT_EQ(Burst(fast, Micros(0)), 4);
  EXPECT_EQ(Burst(fast, Micros(1)), 4);
  EXPECT_EQ(Burst(fast, hours(100'000)), 4);
}

TEST(PaceTest, OwesNoMoreThanFourFramesForWhatCouldNotWait) {
  Pace pace(10'000'000, kFrame);
  for (int i = 0; i < 1000; ++i) pace.Take(kFrame, seconds(1));
  EXPECT_EQ(pace.ReadyAt(seconds(1)), seconds(1) + milliseconds(5));
}

TEST(PaceTest, KeepsADebtAtTheOldRateAndPaysItAtTheNew) {
  Pace pace(10'000'000, kFrame);
  for (int i = 0; i < 8; ++i) pace.Take(kFrame, seconds(1));  // four frames of debt
  pace.SetRate(1'000'000, seconds(1));
  EXPECT_EQ(pace.ReadyAt(seconds(1)), seconds(1) + milliseconds(50));
  pace.SetRate(0, seconds(1));
  EXPECT_TRUE(pace.Ready(seconds(1)));
}

TEST(PaceTest, GivesNothingForAClockThatGoesBack) {
  Pace pace(10'000'000, kFrame);
  Burst(pace, seconds(5));
  EXPECT_EQ(Burst(pace, seconds(1)), 0);
  EXPECT_EQ(Burst(pace, seconds(5) + milliseconds(2)), 2);
}

}  // namespace
}  // namespace server
