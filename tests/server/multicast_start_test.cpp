// When files begin and end, round after round, and how fast their blocks go out.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

#include "server/multicast_script.h"

namespace server {
namespace {

class MulticastStartTest : public LockStepScript {
 protected:
  /// The flags of all announcements so far: 1 with the last file's, 0 without.
  [[nodiscard]] std::string Flags() const {
    std::string flags;
    for (const auto& [to, bytes] : sent_) {
      if (to == kPublic) flags += (bytes[1] & 1) != 0 ? '1' : '0';
    }
    return flags;
  }
};

// ---- when a file begins ----

TEST_F(MulticastStartTest, WaitsForTheMinimumUntilTheLongestWait) {
  Add(kName, SomeBytes(2500));
  options_.start.minimum = 2;
  options_.start.longest_wait = Ms(60'000);
  Begin();
  Say(kA, Request(0x11, kName, true));
  Pass(Ms(59'999));
  EXPECT_EQ(PhaseName(Figures().phase), "announced");
  EXPECT_EQ(Figures().announcements, 30U);
  Pass(Ms(1));
  EXPECT_EQ(PhaseName(Figures().phase), "streaming");
}

TEST_F(MulticastStartTest, BeginsAtOnceWhenItIsToldTo) {
  Add(kName, SomeBytes(2500));
  options_.start.expected = 5;
  Begin();
  run_->StartNow(now_);  // nobody is there: it goes on waiting
  EXPECT_EQ(PhaseName(Figures().phase), "announced");
  Say(kA, Request(0x11, kName, true));
  SkipAll();
  run_->StartNow(now_);
  Pass(Ms(0));
  ExpectHex(kA, kAckMaster);
}

TEST_F(MulticastStartTest, EndsWhenItIsStopped) {
  BeginWith({kA});
  Say(kA, Ack(0));
  run_->Stop(now_);
  Pass(Ms(0));
  EXPECT_TRUE(run_->finished());
  EXPECT_EQ(StateOf(0), "joined");
}

TEST_F(MulticastStartTest, ServesThoseWhoComeLaterInAnotherRound) {
  Add(kName, SomeBytes(100));
  options_.start.expected = 1;
  options_.rounds = 2;
  Begin();
  Say(kA, Request(0x11, kName, true));
  Acknowledge(kA, 0, 1);
  SkipAll();
  Pass(Ms(500));
  ExpectAnnouncement();
  EXPECT_EQ(run_->figures().round, 2U);
  Say(kB, Request(0x12, kName, true));
  Acknowledge(kB, 0, 1);
  EXPECT_EQ(StateOf(0, 1), "proven");
  Pass(Ms(500));
  EXPECT_TRUE(run_->finished());
}

TEST_F(MulticastStartTest, WaitsForTheAnswersOfThoseWhoHaveAskedEvenWhenItIsToBeginAtOnce) {
  Add(kName, SomeBytes(2500));
  options_.start.expected = 5;
  Begin();
  Say(kA, Request(0x11, kName, true));
  Pass(Ms(100));
  Say(kB, Request(0x11, kName, true));
  run_->StartNow(now_);
  Pass(Ms(1124));
  EXPECT_EQ(PhaseName(Figures().phase), "announced") << "B may not have heard its answer";
  Pass(Ms(1));
  EXPECT_EQ(PhaseName(Figures().phase), "streaming");
}

TEST_F(MulticastStartTest, RefusesToWaitForMoreDevicesThanItKeepsApart) {
  Add(kName, "x");
  options_.max_devices = 10;
  options_.start.expected = 11;
  EXPECT_THROW(Begin(), std::invalid_argument);
  options_.start.expected = 10;
  EXPECT_NO_THROW(Begin());
}

TEST_F(MulticastStartTest, EndsEachRoundWithTheLastFilesMark) {
  Add(kName, SomeBytes(100));
  Add("\\Temp\\second.bin", SomeBytes(100));
  options_.start.expected = 1;
  options_.rounds = 2;
  Begin();
  for (const unsigned file : {0x11U, 0x12U, 0x13U, 0x14U}) {
    const Peer& device = file < 0x13 ? kA : kB;
    const bool last = (file & 1U) == 0;
    Say(device, Request(file, last ? "\\Temp\\second.bin" : kName, last));
    Acknowledge(device, 0, 1);
    Pass(Ms(500));
  }
  EXPECT_EQ(Flags(), "0101");
  EXPECT_TRUE(run_->finished());
}

TEST_F(MulticastStartTest, ServesADeviceThatComesDuringTheLastFileOfARoundWithThatFile) {
  Add(kName, SomeBytes(100));
  Add("\\Temp\\second.bin", SomeBytes(100));
  options_.start.expected = 1;
  options_.announce_max = 3;
  Begin();
  Say(kA, Request(0x11, kName, false));
  Acknowledge(kA, 0, 1);
  Pass(Ms(500));
  Say(kB, Request(0x12, "\\Temp\\second.bin", true));
  Acknowledge(kB, 0, 1);
  EXPECT_EQ(Figures(0).devices.size(), 1U);
  EXPECT_EQ(StateOf(0, 1), "proven");
  EXPECT_EQ(Figures(1).devices[0].peer, kB);
}

TEST_F(MulticastStartTest, CutsARoundShortThatNobodyComesTo) {
  for (int i = 0; i < 3; ++i) Add("\\Temp\\" + std::to_string(i), SomeBytes(100));
  options_.start.expected = 1;
  options_.announce_max = 2;
  options_.rounds = 3;
  Begin();
  for (unsigned i = 0; i < 3; ++i) {
    Say(kA, Request(0x11 + i, "\\Temp\\" + std::to_string(i), i == 2));
    Acknowledge(kA, 0, 1);
    Pass(Ms(500));
  }
  Pass(Ms(10'000));
  EXPECT_TRUE(run_->finished());
  EXPECT_EQ(Flags(), "00100") << "two copies of the second round's first file";
}

TEST_F(MulticastStartTest, EndsARoundWithItsLastFileWhenADeviceWaitsForIt) {
  for (int i = 0; i < 3; ++i) Add("\\Temp\\" + std::to_string(i), SomeBytes(100));
  options_.start.expected = 1;
  options_.announce_max = 2;
  options_.rounds = 2;
  Begin();
  for (unsigned i = 0; i < 3; ++i) {
    Say(kA, Request(0x11 + i, "\\Temp\\" + std::to_string(i), i == 2));
    Acknowledge(kA, 0, 1);
    Pass(Ms(500));
  }
  Say(kB, Request(0x14, "\\Temp\\0", false));  // and does not ask for the second file
  Acknowledge(kB, 0, 1);
  Pass(Ms(20'000));
  EXPECT_TRUE(run_->finished());
  EXPECT_EQ(Flags().back(), '1');
  EXPECT_EQ(run_->figures().files.size(), 6U);
}

TEST_F(MulticastStartTest, CountsABlockThatEndsTheDalliesAsNoRepair) {
  Add(kName, SomeBytes(100));
  Add("\\Temp\\second.bin", SomeBytes(100));
  options_.window = 64;
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, kName, false));
  Acknowledge(kA, 0, 1);
  EXPECT_EQ(Figures().first_pass_frames, 1U);
  EXPECT_EQ(Figures().repair_frames, 0U);
  EXPECT_EQ(Figures().farewell_frames, 1U);
}

// ---- pace ----

TEST_F(MulticastStartTest, SendsNoMoreThanFourBlocksInARowAndKeepsTheRate) {
  options_.window = 64;
  options_.rate = 1'000'000;
  BeginWith({kA}, 51200);
  Say(kA, Ack(0));
  std::size_t blocks = 0;
  for (std::size_t i = seen_; i < sent_.size(); ++i) blocks += sent_[i].first == kPrivate;
  EXPECT_LE(blocks, 4U);
  const std::uint64_t before = run_->figures().wire_bytes;
  for (int ms = 0; ms < 300; ++ms) {
    for (; seen_ < sent_.size(); ++seen_) {
      if (sent_[seen_].first != kPrivate) continue;
      Say(kA, Bytes("00 40 00 00") + sent_[seen_].second.substr(4, 2));
    }
    Pass(Ms(1));
  }
  const double bits = static_cast<double>(run_->figures().wire_bytes - before) * 8;
  EXPECT_NEAR(bits, 300'000, 15'000);  // 0.3 s, and what the bucket held
}

TEST_F(MulticastStartTest, ChangesItsPaceWhileItRuns) {
  options_.window = 64;
  options_.rate = 10'000;
  BeginWith({kA}, 51200);
  Say(kA, Ack(0));
  SkipAll();
  Pass(Ms(100));
  ExpectNothing();
  run_->SetRate(0, now_);
  Pass(Ms(0));
  EXPECT_GT(sent_.size(), seen_);
  EXPECT_EQ(run_->figures().rate, 0U);
}

}  // namespace
}  // namespace server
