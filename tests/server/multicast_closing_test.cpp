// How files end on devices, with a window: frame by frame.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "server/multicast_script.h"

namespace server {
namespace {

using ::testing::HasSubstr;

class MulticastClosingTest : public PipelineScript {
 protected:
  /// One device, five blocks; it lacks the last two.
  void BeginAlone() {
    BeginWith({kA}, 5);
    Say(kA, Ack(0));
    SkipAll();
    for (unsigned block = 1; block <= 3; ++block) Say(kA, Ack(block));
  }
};

TEST_F(MulticastClosingTest, OffersTheRoleAgainUntilItIsTaken) {
  BeginAlone();
  ExpectHex(kA, kAckMaster);
  Await();
  ExpectHex(kA, kAckMaster);
  Say(kA, Ack(0));
  ExpectData(4);
}

TEST_F(MulticastClosingTest, SendsTheGuardAgainWithTheRole) {
  BeginAlone();
  BeginClosing({kA});
  ExpectData(4);
  Await();  // the block, or its acknowledgement, was lost
  ExpectHex(kA, kAckMaster);
  ExpectData(4);
  Say(kA, Ack(4));
  ExpectData(5);
}

TEST_F(MulticastClosingTest, AsksByARoleWhetherTheLastBlockHasCome) {
  BeginAlone();
  BeginClosing({kA});
  Say(kA, Ack(4));
  SkipAll();
  Await();
  ExpectHex(kA, kAckMaster);
  ExpectNothing();
  Say(kA, Ack(0));  // it has not
  ExpectData(5);
  Say(kA, Ack(5));
  EXPECT_EQ(StateOf(0), "proven");
}

TEST_F(MulticastClosingTest, TakesTheWordOfADallyAndNotThatOfADeviceThatHasLeft) {
  for (const bool dallies : {true, false}) {
    StartAnew();
    BeginAlone();
    BeginClosing({kA});
    Say(kA, Ack(4));
    SkipAll();
    Await();
    ExpectHex(kA, kAckMaster);
    Say(kA, Ack(5));  // in its dally, or waiting for the next file
    ExpectHex(kA, kNakMaster);
    EXPECT_EQ(StateOf(0), "joined");
    Say(kA, dallies ? Ack(5) : Nak(2));
    EXPECT_EQ(StateOf(0), dallies ? "proven" : "dead");
  }
  EXPECT_EQ(Figures().devices[0].reason, "has given the file up");
}

TEST_F(MulticastClosingTest, SendsNobodyTheLastBlockAgainBeforeEverybodysStateIsKnown) {
  BeginWith({kA, kB}, 5);
  EndFirstPass(5);
  Say(kB, Nak(4));
  SkipAll();
  BeginClosing({kA, kB});
  for (const Peer& device : {kA, kB}) Say(device, Ack(4));
  EXPECT_EQ(Count(kPrivate, Data(5)), 1U);
  SkipAll();
  Pass(Ms(100));
  EXPECT_GE(Count(kA, Bytes(kAckMaster)), 1U);
  EXPECT_GE(Count(kB, Bytes(kAckMaster)), 1U);
  Say(kA, Ack(0));  // A lacks it; B may be in its dally, which the block would end
  EXPECT_EQ(Count(kPrivate, Data(5)), 0U);
  Say(kB, Ack(5));
  Say(kB, Ack(5));
  EXPECT_EQ(StateOf(1), "proven");
  EXPECT_EQ(Count(kPrivate, Data(5)), 1U);
}

TEST_F(MulticastClosingTest, ClosesAGroupAfterTheOther) {
  options_.poll_group = 1;
  BeginWith({kA, kB}, 5);
  EndFirstPass(5);
  Say(kB, Nak(4));
  SkipAll();
  BeginClosing({kA});
  ExpectData(4);
  Say(kA, Ack(4));
  ExpectData(5);
  Say(kA, Ack(5));
  ExpectHex(kB, kAckMaster);
  Say(kB, Ack(0));
  ExpectData(4);
  Say(kB, Ack(4));
  ExpectData(5);
  Say(kB, Ack(5));
  EXPECT_EQ(Figures().Count(DeviceState::kProven), 2U);
}

TEST_F(MulticastClosingTest, BuriesADeviceThatBeginsAnewWhileItIsClosed) {
  BeginAlone();
  BeginClosing({kA});
  Pass(Ms(1500));  // no second copy of the first request comes so late
  Say(kA, Request(0x11, kName, true));
  EXPECT_EQ(StateOf(0), "dead");
  EXPECT_THAT(Figures().devices[0].reason, HasSubstr("asked for the file again"));
}

TEST_F(MulticastClosingTest, EndsWhenTheDeviceFallsSilentInAnyOfItsSteps) {
  const std::vector<unsigned> answers = {0, 4, 5};
  for (std::size_t given = 0; given <= answers.size(); ++given) {
    StartAnew();
    BeginAlone();
    for (std::size_t i = 0; i < given; ++i) Say(kA, Ack(answers[i]));
    Pass(Ms(30'000));
    EXPECT_TRUE(run_->finished()) << given;
    EXPECT_EQ(StateOf(0), given == answers.size() ? "proven" : "dead") << given;
  }
}

}  // namespace
}  // namespace server
