// What a link does to frames.
#include "net/virtual/link.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

namespace {

using namespace std::chrono_literals;  // NOLINT(google-build-using-namespace)
using sim::Link;
using sim::LinkProfile;
using sim::Micros;

constexpr int kFrames = 20000;

Link MakeLink(const LinkProfile& profile, std::uint64_t seed = 1) {
  Link link(seed);
  link.set_profile(profile);
  return link;
}

/// '1' for each of the datagrams that arrived, '0' for each that did not.
std::string Fates(Link& link, int frames = kFrames) {
  std::string fates;
  for (int i = 0; i < frames; ++i) fates += link.Datagram(Micros(i), 100).empty() ? '0' : '1';
  return fates;
}

double LossShare(const std::string& fates) {
  std::size_t lost = 0;
  for (const char fate : fates) lost += fate == '0' ? 1 : 0;
  return static_cast<double>(lost) / static_cast<double>(fates.size());
}

TEST(LinkTest, LosesNothingAndTakesNoTimeByDefault) {
  Link link(1);

  EXPECT_EQ(link.Datagram(5ms, 1000), std::vector<Micros>{5ms});
  EXPECT_EQ(link.Segment(6ms, 1460), Micros(6ms));
}

TEST(LinkTest, TakesTheDelayOnTop) {
  LinkProfile profile;
  profile.delay = 30ms;
  Link link = MakeLink(profile);

  EXPECT_EQ(link.Datagram(5ms, 1000), std::vector<Micros>{35ms});
}

TEST(LinkTest, KeepsTheOrderWhateverTheJitter) {
  LinkProfile profile;
  profile.delay = 10ms;
  profile.jitter = 20ms;
  Link link = MakeLink(profile);
  Micros last{0};
  Micros longest{0};

  for (int i = 0; i < 1000; ++i) {
    const Micros sent = i * 1ms;
    const Micros arrival = link.Datagram(sent, 100).at(0);
    EXPECT_GE(arrival, last);
    EXPECT_GE(arrival - sent, 10ms);
    EXPECT_LE(arrival - sent, 30ms);
    longest = std::max(longest, arrival - sent);
    last = arrival;
  }
  EXPECT_GT(longest, 25ms);
}

TEST(LinkTest, LosesTheShareItIsToldTo) {
  LinkProfile profile;
  profile.loss = 0.1;
  for (std::uint64_t seed = 1; seed <= 5; ++seed) {
    Link link = MakeLink(profile, seed);

    // Five standard deviations of 20,000 tries are 0.0106.
    EXPECT_NEAR(LossShare(Fates(link)), 0.1, 0.0106) << "seed " << seed;
  }
}

TEST(LinkTest, LosesTheSameFramesWithTheSameSeedOnly) {
  LinkProfile profile;
  profile.loss = 0.3;
  Link first = MakeLink(profile, 7);
  Link second = MakeLink(profile, 7);
  Link third = MakeLink(profile, 8);
  const std::string fates = Fates(first);

  EXPECT_EQ(Fates(second), fates);
  EXPECT_NE(Fates(third), fates);
}

TEST(LinkTest, LosesFramesInBursts) {
  LinkProfile profile;
  profile.burst_begin = 0.01;
  profile.burst_end = 0.1;  // a burst lasts ten frames on average
  Link link = MakeLink(profile);
  const std::string fates = Fates(link, 200000);
  std::size_t bursts = 0;
  std::size_t lost = 0;
  for (std::size_t i = 0; i < fates.size(); ++i) {
    if (fates[i] == '1') continue;
    ++lost;
    if (i == 0 || fates[i - 1] == '1') ++bursts;
  }

  EXPECT_NEAR(static_cast<double>(lost) / static_cast<double>(bursts), 10.0, 1.0);
  EXPECT_NEAR(LossShare(fates), 1.0 / 11, 0.01);  // 10 frames of 100 + 10
}

TEST(LinkTest, BringsSomeDatagramsTwice) {
  LinkProfile profile;
  profile.duplicate = 0.2;
  Link link = MakeLink(profile);
  std::size_t twice = 0;
  for (int i = 0; i < kFrames; ++i) twice += link.Datagram(Micros(i), 100).size() - 1;

  EXPECT_NEAR(static_cast<double>(twice) / kFrames, 0.2, 0.0142);  // five standard deviations
}

TEST(LinkTest, LetsLaterDatagramsOvertakeThoseHeldBack) {
  LinkProfile profile;
  profile.reorder = 0.1;
  profile.reorder_delay = 5ms;
  Link link = MakeLink(profile);
  int held = 0;
  for (int i = 0; i < 1000; ++i) {
    const Micros sent = i * 1ms;
    const Micros arrival = link.Datagram(sent, 100).at(0);
    EXPECT_TRUE(arrival == sent || arrival == sent + 5ms);
    held += arrival == sent ? 0 : 1;
  }

  EXPECT_NEAR(held, 100, 48);  // five standard deviations
}

TEST(LinkTest, PassesNoMoreThanItsBandwidth) {
  LinkProfile profile;
  profile.bytes_per_second = 100000;
  Link link = MakeLink(profile);

  // 958 bytes and 42 of headers take 10 ms each, one after the other.
  EXPECT_EQ(link.Datagram(0ms, 958).at(0), Micros(10ms));
  EXPECT_EQ(link.Datagram(0ms, 958).at(0), Micros(20ms));
  EXPECT_EQ(link.Segment(0ms, 946), Micros(30ms));
  EXPECT_EQ(link.Datagram(50ms, 958).at(0), Micros(60ms)) << "an idle link starts at once";
}

TEST(LinkTest, DropsDatagramsThatWouldWaitTooLong) {
  LinkProfile profile;
  profile.bytes_per_second = 100000;
  profile.queue_bytes = 2000;
  Link link = MakeLink(profile);

  EXPECT_EQ(link.Datagram(0ms, 958).size(), 1U);
  EXPECT_EQ(link.Datagram(0ms, 958).size(), 1U);
  EXPECT_EQ(link.Datagram(0ms, 958).size(), 0U) << "1,000 + 1,000 of 2,000 bytes are taken";
  EXPECT_EQ(link.Datagram(15ms, 958).size(), 1U) << "half a frame is left to go";
}

TEST(LinkTest, BringsALostSegmentLaterInsteadOfNever) {
  LinkProfile profile;
  profile.loss = 0.5;
  profile.retransmission = 100ms;
  Link link = MakeLink(profile);
  int at_once = 0;
  int once_more = 0;
  for (int i = 0; i < 1000; ++i) {
    const Micros arrival = link.Segment(0ms, 1000);
    at_once += arrival == Micros(0) ? 1 : 0;
    once_more += arrival == 100ms ? 1 : 0;
    const bool on_time = arrival == 0ms || arrival == 100ms || arrival == 300ms || arrival >= 700ms;
    EXPECT_TRUE(on_time) << "100 ms, then 200, then 400 later";
  }

  EXPECT_NEAR(at_once, 500, 80);
  EXPECT_NEAR(once_more, 250, 70);
}

}  // namespace
