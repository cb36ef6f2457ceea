// Conversations with a window, frame by frame: the first pass and the repair.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "server/multicast_script.h"

namespace server {
namespace {

class MulticastPipelineTest : public PipelineScript {};

// ---- the first pass ----

TEST_F(MulticastPipelineTest, BringsAFileToOneDevice) {
  BeginWith({kA}, 5);
  ExpectAnnouncement();
  ExpectHex(kA, kPassive);
  ExpectHex(kA, kAckMaster);
  Say(kA, Ack(0));
  for (unsigned block = 1; block <= 3; ++block) ExpectData(block);
  ExpectNothing();
  for (unsigned block = 1; block <= 3; ++block) Say(kA, Ack(block));
  ExpectHex(kA, kAckMaster);  // for the end
  Say(kA, Ack(0));
  ExpectData(4);
  ExpectNothing();
  Say(kA, Ack(4));
  ExpectData(5);
  Say(kA, Ack(5));
  ExpectNothing();
  EXPECT_EQ(StateOf(0), "proven");
}

TEST_F(MulticastPipelineTest, SendsABlockAgainAtOnceThatLaterOnesHaveOvertakenOnALoneDevicesWay) {
  BeginWith({kA}, 20);
  Say(kA, Ack(0));
  SkipAll();
  for (const unsigned block : {2U, 3U}) Say(kA, Ack(block));
  EXPECT_EQ(Count(kPrivate, Data(1)), 0U);
  Say(kA, Ack(4));
  EXPECT_EQ(Count(kPrivate, Data(1)), 1U);
}

TEST_F(MulticastPipelineTest, LeavesALostBlockToTheRepairWhenThereAreOthers) {
  BeginWith({kA, kB}, 20);
  Say(kA, Ack(0));
  SkipAll();
  for (unsigned block = 2; block <= 18; ++block) Say(kA, Ack(block));
  EXPECT_EQ(Count(kPrivate, Data(1)), 0U);
  EXPECT_EQ(PhaseName(Figures().phase), "repairing");
}

TEST_F(MulticastPipelineTest, IsNotMisledByAcknowledgementsThatTheNetworkRepeats) {
  BeginWith({kA}, 100);
  Say(kA, Ack(0));
  for (unsigned block = 1; block < 90; ++block) {
    Say(kA, Ack(block));
    Say(kA, Bytes("01 40 00 00") + Word(block));  // it had the block: a second copy of one frame
  }
  SkipAll();
  for (const unsigned block : {91U, 92U, 93U}) Say(kA, Ack(block));
  EXPECT_EQ(Count(kPrivate, Data(90)), 1U) << "it is still worth sending a block again";
}

TEST_F(MulticastPipelineTest, AsksASilentMasterBeforeItSendsMore) {
  BeginWith({kA}, 100);
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  SkipAll();
  Await();
  ExpectHex(kA, kAckMaster);
  ExpectNothing();
  Say(kA, Ack(0));
  EXPECT_EQ(sent_[seen_].first, kPrivate);
}

TEST_F(MulticastPipelineTest, WaitsTwiceAsLongAfterABurstOfLossesAndNotLongerForEachOfThem) {
  BeginWith({kA, kB}, 400);
  Say(kA, Ack(0));
  for (int round = 0; round < 8; ++round) AnswerBlocks(kA);
  // Everything in flight is lost, but the device is heard all the same: no silence.
  Pass(Ms(1));
  Say(kA, Ack(1));
  const auto wait = [this] { return *run_->deadline(now_) - now_; };
  const std::uint64_t before = Figures().first_pass_frames;
  Pass(wait());
  ASSERT_GT(Figures().first_pass_frames, before + 4) << "a burst, replaced by new blocks";
  EXPECT_LE(wait(), Ms(100));
}

TEST_F(MulticastPipelineTest, MakesADeviceMasterThatIsOverrunTwice) {
  BeginWith({kA, kB}, 300);
  Say(kA, Ack(0));
  for (unsigned block = 1; block <= 120; ++block) Say(kA, Ack(block));
  SkipAll();
  Say(kB, Overrun("7000:110"));
  EXPECT_EQ(Count(kB, Bytes(kAckMaster)), 0U) << "a lower pace may do";
  Say(kB, Overrun("6900:120"));
  ExpectHex(kA, kPassive);
  ExpectHex(kB, kAckMaster);
  ExpectNothing();
}

TEST_F(MulticastPipelineTest, MakesADeviceMasterAtOnceThatGetsLessThanHalf) {
  BeginWith({kA, kB}, 300);
  Say(kA, Ack(0));
  for (unsigned block = 1; block <= 120; ++block) Say(kA, Ack(block));
  SkipAll();
  Say(kB, Overrun("4900:110"));
  ExpectHex(kA, kPassive);
  ExpectHex(kB, kAckMaster);
}

TEST_F(MulticastPipelineTest, ElectsTheNextDeviceWhenTheMasterCannotWrite) {
  BeginWith({kA, kB}, 100);
  Say(kA, Ack(0));
  SkipAll();
  Say(kA, Bytes("00 60 00 00 00 03") + "Disk full" + std::string(1, '\0'));
  EXPECT_EQ(StateOf(0), "dead");
  ExpectHex(kB, kAckMaster);
  ExpectNothing();
}

TEST_F(MulticastPipelineTest, OffersTheMastershipToMoreAndMoreWhenTheFirstAreSilent) {
  std::vector<Peer> devices;
  for (std::uint32_t i = 0; i < 8; ++i) devices.push_back({0x0A000064 + i, 7000});
  BeginWith(devices, 100);
  for (int i = 0; i < 20 && Figures().first_pass_frames == 0; ++i) {
    Pass(Ms(500));
    Say(devices[7], Ack(0));  // the only one who is there
  }
  EXPECT_GT(Figures().first_pass_frames, 0U) << "four silent devices do not end the first pass";
  EXPECT_LT(now_, Ms(1125 + 5000));
}

TEST_F(MulticastPipelineTest, MakesTheMasterPassiveWhenOthersAreToBeRepaired) {
  BeginWith({kA, kB}, 10);
  Say(kA, Ack(0));
  SkipAll();
  for (unsigned block = 1; block <= 8; ++block) Say(kA, Ack(block));
  EXPECT_EQ(Count(kA, Bytes(kPassive)), 1U);
  EXPECT_EQ(Count(kB, Bytes(kNakMaster)), 1U);
}

TEST_F(MulticastPipelineTest, DoesNotTakeAMasterForWholeThatBeganAnewInTheMiddle) {
  BeginWith({kA, kB}, 10);
  Say(kA, Ack(0));
  for (unsigned block = 1; block <= 4; ++block) Say(kA, Ack(block));
  Say(kA, Request(0x11, kName, true));  // it has lost what it had
  SkipAll();
  Say(kA, Ack(0));
  for (unsigned block = 5; block <= 8; ++block) Say(kA, Ack(block));
  Pass(Ms(400));
  EXPECT_EQ(PhaseName(Figures().phase), "repairing");
  EXPECT_GE(Count(kA, Bytes(kNakMaster)), 1U) << "it is asked what it lacks";
}

TEST_F(MulticastPipelineTest, KeepsItsMasterWhenTheRateIsLowered) {
  BeginWith({kA, kB}, 600);
  int masters = 0;
  run_->SetListener([&masters](const MulticastEvent& event) {
    masters += event.kind == MulticastEventKind::kMaster;
  });
  Say(kA, Ack(0));
  SkipAll();
  const auto answer = [this](int milliseconds) {
    for (int ms = 0; ms < milliseconds; ++ms) {
      for (; seen_ < sent_.size(); ++seen_) {
        if (sent_[seen_].first == kPrivate) {
          Say(kA, Bytes("00 40 00 00") + sent_[seen_].second.substr(4, 2));
        }
      }
      Pass(Ms(1));
      if (Figures().first_pass_frames > 300 && run_->figures().rate == 0) return;
    }
  };
  answer(2000);
  run_->SetRate(50'000, now_);
  answer(9000);
  EXPECT_EQ(masters, 1);
  EXPECT_EQ(StateOf(0), "joined");
}

// ---- the repair ----

TEST_F(MulticastPipelineTest, RepairsABlockOnceForAllWhoLackIt) {
  BeginWith({kA, kB, kC}, 10);
  EndFirstPass(10);
  Say(kB, Nak(3));
  ExpectData(3);
  Say(kC, Nak(3));
  ExpectNothing();
  Say(kB, Nak(9));  // the guard: it has all others
  ExpectHex(kB, kPassive);
  Say(kC, Nak(7));
  ExpectData(7);
  Say(kC, Nak(9));
  ExpectHex(kC, kPassive);
  ExpectNothing();
  BeginClosing({kA, kB, kC});
  ExpectData(9);
}

TEST_F(MulticastPipelineTest, SendsABlockAgainOnlyWhenItCannotBeUnderWay) {
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);
  Say(kB, Nak(3));
  ExpectData(3);
  Say(kB, Nak(3));
  ExpectNothing();
  Await();
  ExpectHex(kB, kNakMaster);  // it may have got lost, or its answer: the device knows
  Say(kB, Nak(3));
  ExpectData(3);
}

TEST_F(MulticastPipelineTest, AsksADeviceAgainThatItsOwnOverrunRecordMadeAcknowledge) {
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);
  Say(kB, Nak(3));
  ExpectData(3);
  Say(kB, Ack(3));
  ExpectNothing();
  Await();
  ExpectHex(kB, kNakMaster);
}

TEST_F(MulticastPipelineTest, GivesUpADeviceThatAcknowledgesInsteadOfNamingWhatItLacks) {
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);
  for (int i = 0; i < 100 && StateOf(1) == "joined"; ++i) {
    Pass(Ms(600));
    Say(kB, Ack(7));
  }
  EXPECT_EQ(StateOf(1), "dead");
  EXPECT_LT(now_, Ms(20'000));
}

TEST_F(MulticastPipelineTest, ReleasesADeviceThatHasClosedTheFileTooEarly) {
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);
  Say(kB, Ack(10));  // it may have been under way when B was asked
  EXPECT_EQ(StateOf(1), "joined");
  for (int i = 0; i < 10 && StateOf(1) == "joined"; ++i) {
    Pass(Ms(300));
    Say(kB, Ack(10));
  }
  EXPECT_EQ(StateOf(1), "released");
  EXPECT_EQ(Figures().devices[1].reason, "has closed the file before it had every block");
}

TEST_F(MulticastPipelineTest, BeginsTheRepairWithAFewBlocksAndNoBurst) {
  BeginWith({kA}, 300);
  Say(kA, Ack(0));
  for (int round = 0; round < 6; ++round) AnswerBlocks(kA);
  Say(kB, Request(0x11, kName, true));  // it lacks what has gone out
  EndFirstPass(300);
  Say(kB, Nak(1));
  EXPECT_LE(sent_.size() - seen_, 5U);
  EXPECT_GE(Count(kPrivate, Data(1)), 1U);
}

TEST_F(MulticastPipelineTest, SendsNoFileToALateDeviceThatSaysNothingMore) {
  BeginWith({kA}, 300);
  Say(kA, Ack(0));
  for (int round = 0; round < 6; ++round) AnswerBlocks(kA);
  Say(kB, Request(0x11, kName, true));
  EndFirstPass(300);
  Say(kB, Nak(1));
  Pass(Ms(15'000));
  EXPECT_EQ(StateOf(1), "dead");
  EXPECT_LT(Figures().repair_frames, 20U);
}

TEST_F(MulticastPipelineTest, KeepsTheDevicesThatWaitForTheirTurnToBeAsked) {
  options_.poll_group = 1;
  options_.silence_limit = std::chrono::seconds(38);
  BeginWith({kA, kB, kC}, 10);
  EndFirstPass(10);
  Pass(Ms(39'000));  // B says nothing, and nobody gets a block
  EXPECT_EQ(StateOf(1), "dead");
  EXPECT_GE(Count(kA, Bytes(kPassive)), 3U) << "the master of before waits as well";
  EXPECT_LE(Count(kA, Bytes(kPassive)), 4U);
}

TEST_F(MulticastPipelineTest, AsksFewOfManyDevicesAtOnce) {
  std::vector<Peer> devices;
  for (std::uint32_t i = 0; i < 1000; ++i) devices.push_back({0x0A000064 + i, 7000});
  devices[0] = kA;
  options_.poll_group = 8;
  BeginWith(devices, 10);
  EndFirstPass(10);
  Pass(Ms(400));
  EXPECT_LT(sent_.size() - seen_, 8U * 16U * 4U);
  Pass(std::chrono::minutes(3));
  EXPECT_EQ(Figures().Count(DeviceState::kDead), 1000U) << "A as well, in the end";
}

// ---- who comes late, and who comes back ----

TEST_F(MulticastPipelineTest, TakesNobodyBackWhoWasReleased) {
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);
  for (int i = 0; i < 1000 && StateOf(1) == "joined"; ++i) {
    Say(kB, Nak(3));
    Pass(Ms(10));
  }
  ASSERT_EQ(StateOf(1), "released");
  SkipAll();
  Say(kB, Request(0x11, kName, true));
  EXPECT_EQ(Count(kB, Bytes(kUnknownId)), 1U);
  EXPECT_EQ(StateOf(1), "released");
}

TEST_F(MulticastPipelineTest, TakesADeadDeviceBackThatAsksWhileOthersAreRepaired) {
  BeginWith({kA, kB, kC}, 10);
  EndFirstPass(10);
  for (int i = 0; i < 100 && StateOf(1) == "joined"; ++i) {
    Say(kC, Nak(3));  // B is silent, C goes on
    Pass(Ms(500));
  }
  ASSERT_EQ(StateOf(1), "dead");
  SkipAll();
  Say(kB, Request(0x11, kName, true));
  EXPECT_EQ(Count(kB, Bytes(kPassive)), 1U);
  EXPECT_EQ(StateOf(1), "joined");
}

TEST_F(MulticastPipelineTest, TakesNoNewDeviceWhenTheRepairHasGoneOnForLong) {
  options_.silence_limit = std::chrono::seconds(60);
  BeginWith({kA, kB}, 10);
  EndFirstPass(10);  // and B keeps all waiting
  Pass(Ms(29'000));
  Say(kC, Request(0x11, kName, true));
  EXPECT_EQ(Figures().devices.size(), 2U + 1U);
  Pass(Ms(2'000));
  SkipAll();
  const Peer late{0x0A00000E, 7000};
  Say(late, Request(0x11, kName, true));
  EXPECT_EQ(Count(late, Bytes(kUnknownId)), 1U);
  EXPECT_EQ(Figures().devices.size(), 3U);
}

TEST_F(MulticastPipelineTest, SaysThatAProvenDeviceHasAskedForTheFileAgain) {
  BeginWith({kA}, 1);
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  ASSERT_EQ(StateOf(0), "proven");
  SkipAll();
  Say(kA, Request(0x11, kName, true));
  ExpectHex(kA, kUnknownId);
  EXPECT_EQ(Figures().devices[0].reason, "has asked for the file again");
}

}  // namespace
}  // namespace server
