// Devices that answer for ever, that lie, that are none or somebody else.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "server/multicast_script.h"

namespace server {
namespace {

class MulticastStrangersTest : public LockStepScript {};

TEST_F(MulticastStrangersTest, GivesUpADeviceThatNamesTheSameBlockAgainAndAgain) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 5);
  for (int i = 0; i < 1000 && StateOf(1) == "joined"; ++i) {
    Say(kB, Nak(2));
    Pass(Ms(1));
  }
  EXPECT_EQ(StateOf(1), "released");
  EXPECT_EQ(Figures().devices[1].reason, "names block 2 again and again");
  EXPECT_LT(Figures().repair_frames, 40U);
}

TEST_F(MulticastStrangersTest, EndsWhateverDevicesGoOnSaying) {
  for (const std::uint32_t window : {1U, 64U}) {
    for (const std::size_t size : {100U, 1000U, 2500U, 60'000U}) {
      const auto count = static_cast<unsigned>((size + 511) / 512);
      for (const std::string& word :
           {Ack(0), Ack(1), Ack(count), Ack(count > 1 ? count - 1 : 1), Nak(1), Nak(count)}) {
        for (const std::vector<Peer>& devices :
             {std::vector<Peer>{kA}, std::vector<Peer>{kA, kB}}) {
          files_.clear();
          contents_.clear();
          sent_.clear();
          now_ = Micros(0);
          options_.window = window;
          BeginWith(devices, size);
          seen_ = 0;
          for (int step = 0; step < 20'000 && !run_->finished(); ++step) {
            if (seen_ == sent_.size()) {
              Pass(Ms(250));
              continue;
            }
            // Everybody says the same to everything but announcements.
            const Peer to = sent_[seen_++].first;
            if (to == kPublic) continue;
            for (const Peer& device : devices) {
              if (to == kPrivate || to == device) Say(device, word);
            }
          }
          ASSERT_TRUE(run_->finished()) << "window " << window << ", " << size << " bytes, "
                                        << devices.size() << " devices: " << Hex(word);
          ASSERT_LT(now_, std::chrono::minutes(5)) << window << " " << size << " " << Hex(word);
        }
      }
    }
  }
}

TEST_F(MulticastStrangersTest, DoesNotPlayPingPongWithADeviceThatAcknowledgesEverything) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 120);
  Say(kB, Overrun("6750:120"));
  SkipAll();
  for (int i = 0; i < 1000; ++i) Say(kB, Ack(7));
  EXPECT_LT(sent_.size() - seen_, 3U);
}

TEST_F(MulticastStrangersTest, BelievesNoReportOfABlockThatNeverWentOut) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 10);
  SkipAll();
  for (const char* numbers : {"6750:120", "6750:0", "65000:5", "1:200"}) Say(kB, Overrun(numbers));
  ExpectNothing();
  EXPECT_EQ(Figures().devices[1].overruns, 0U);
}

TEST_F(MulticastStrangersTest, AnswersASecondCopyOfARequestWithARoleUntilTheVeryEnd) {
  for (const std::uint32_t window : {1U, 64U}) {
    files_.clear();
    contents_.clear();
    sent_.clear();
    options_.window = window;
    BeginWith({kA}, 100);
    SkipAll();
    Say(kA, Request(0x11, kName, true));
    ExpectHex(kA, kAckMaster);
    Say(kA, Request(0x10, kName, true));  // of the file before
    ExpectNothing();
    Say(kA, Ack(0));
    ExpectData(1);
    Say(kA, Request(0x11, kName, true));
    ExpectHex(kA, kAckMaster);
    Say(kA, Ack(1));
    EXPECT_EQ(StateOf(0), "proven") << window;
    seen_ = 0;
  }
}

TEST_F(MulticastStrangersTest, DoesNotCallADeviceProvenThatClosesTheFileWithGaps) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 2);
  Pass(Ms(200) * 10);  // A falls silent; B is asked, and C comes
  SkipAll();
  Say(kB, Nak(1));
  Say(kB, Nak(4));
  Say(kB, Request(0x11, kName, true));  // it has begun anew
  Say(kB, Ack(5));
  EXPECT_NE(StateOf(1), "proven");
}

TEST_F(MulticastStrangersTest, TakesNoDeviceThatCannotBeOne) {
  BeginWith({kA});
  SkipAll();
  for (const Peer& nobody :
       {Peer{0, 7000}, Peer{0xEF010101, 7000}, Peer{0xFFFFFFFF, 7000}, Peer{0x0A00000E, 0}}) {
    Say(nobody, Request(0x11, kName, true));
  }
  ExpectNothing();
  EXPECT_EQ(run_->figures().garbage, 4U);
}

TEST_F(MulticastStrangersTest, SendsBlocksThroughAStormOfForgedRequests) {
  options_.window = 64;
  options_.rate = 1'000'000;
  BeginWith({kA}, 51200);
  Say(kA, Ack(0));
  const std::uint64_t before = Figures().first_pass_frames;
  for (std::uint32_t ms = 0; ms < 300; ++ms) {
    for (std::uint32_t i = 0; i < 5; ++i) {
      Say({0x0A020000 + ms * 5 + i, 7000}, Request(0x99, kName, true));
    }
    for (; seen_ < sent_.size(); ++seen_) {
      if (sent_[seen_].first == kPrivate)
        Say(kA, Ack(0).substr(0, 4) + sent_[seen_].second.substr(4, 2));
    }
    Pass(Ms(1));
  }
  EXPECT_GT(Figures().first_pass_frames, before + 30);  // of 66 that the rate allows
}

// ---- who closes the file too early ----

TEST_F(MulticastStrangersTest, AsksADeviceThatNamesTheLastBlockWhetherItHasClosedTheFile) {
  for (const bool closed : {true, false}) {
    StartAnew();
    BeginWith({kA, kB}, 102400);
    Acknowledge(kA, 0, 120);
    Say(kB, Overrun("6750:120"));
    SkipAll();
    Say(kB, Nak(200));  // in NAK mode a client closes the file with that
    ExpectHex(kB, kAckMaster);
    ExpectNothing();
    Say(kB, closed ? Ack(200) : Ack(0));
    EXPECT_EQ(StateOf(1), closed ? "released" : "joined");
    if (!closed) ExpectData(200);
  }
}

TEST_F(MulticastStrangersTest, BelievesNoMasterWithGapsThatStillAcknowledgesTheLastBlock) {
  BeginWith({kA, kB, kC}, 5120);
  Acknowledge(kA, 0, 3);
  Say(kB, Overrun("3000:4"));
  for (int i = 0; i < 10; ++i) Pass(Ms(500));  // neither B nor A says anything more
  ASSERT_EQ(StateOf(0), "dead");
  Say(kC, Ack(0));
  Acknowledge(kC, 4, 9);
  SkipAll();
  Say(kC, Ack(10));  // it has not heard that it is passive
  Pass(Ms(10));
  EXPECT_NE(StateOf(2), "proven");
}

TEST_F(MulticastStrangersTest, IsNotKeptFromBeginningByRequestsWithoutEnd) {
  Add(kName, SomeBytes(2500));
  options_.start.expected = 2;
  Begin();
  Say(kA, Request(0x11, kName, true));
  Say(kB, Request(0x11, kName, true));
  for (int i = 0; i < 30; ++i) {
    Pass(Ms(100));
    Say(kA, Request(0x11, kName, true));
  }
  EXPECT_EQ(PhaseName(Figures().phase), "streaming");
}

}  // namespace
}  // namespace server
