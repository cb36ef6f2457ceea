// Whole conversations in lock-step, every frame of them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "server/multicast_script.h"

namespace server {
namespace {

class MulticastExchangeTest : public MulticastScript {};

TEST_F(MulticastExchangeTest, BringsAFileToOneDeviceInAckMode) {
  Add("\\Temp\\a.bin", SomeBytes(1300));
  options_.start.expected = 1;
  Begin();
  ExpectHex(kPublic,
            "00 21 00 00 02 00 00 00 05 14 00 00 03 e8 00 00 00 20 00 00 00 11"
            "32 30 30 36 2d 30 33 2d 30 31 20 31 34 3a 30 35 3a 30 39 00"
            "1b 59 0a 00 00 02 05 00 00 5c 54 65 6d 70 5c 61 2e 62 69 6e 00 00");
  Say(kA,
      Bytes("00 11 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 11"
            "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"
            "5c 54 65 6d 70 5c 61 2e 62 69 6e 00"));
  ExpectHex(kA, kPassive);
  ExpectHex(kA, kAckMaster);
  ExpectNothing();

  Say(kA, Bytes("00 40 00 00 00 00"));
  ExpectData(1);
  Say(kA, Bytes("00 40 00 00 00 01"));
  ExpectData(2);
  Say(kA, Bytes("00 40 00 00 00 02"));
  EXPECT_EQ(Hex(sent_[seen_].second.substr(0, 6)), "00 30 01 14 00 03");
  ExpectData(3);
  Say(kA, Bytes("00 40 00 00 00 03"));
  ExpectNothing();
  EXPECT_EQ(StateOf(0), "proven");

  Pass(Ms(500));
  ExpectNothing();
  EXPECT_TRUE(run_->finished());
}

TEST_F(MulticastExchangeTest, SendsABlockAgainWhenItOrItsAcknowledgementIsLost) {
  Add("\\Temp\\a.bin", SomeBytes(1300));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, "\\Temp\\a.bin", true));
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  SkipAll();
  Pass(Ms(199));  // four round trips, but not less than 200 ms
  ExpectNothing();
  Pass(Ms(1));
  ExpectData(2);

  Say(kA, Bytes("01 40 00 00 00 02"));  // it had the block: a duplicate
  ExpectData(3);
}

TEST_F(MulticastExchangeTest, RepairsForOneWhatAnotherHasAndAsksTheThirdWhetherItIsDone) {
  options_.first_transfer_id = 0x12;
  Add("\\Temp\\b.bin", SomeBytes(2500), "TQ5*");
  Begin();
  const std::string announcement = sent_[0].second;
  EXPECT_EQ(Hex(announcement.substr(6, 4)), "00 00 09 c4");
  EXPECT_EQ(Hex(announcement.substr(announcement.size() - 5)), "54 51 35 2a 00");
  SkipAll();
  for (const Peer& device : {kA, kB, kC}) {
    Say(device, Request(0x12, "\\Temp\\b.bin", true));
    ExpectHex(device, kPassive);
  }
  Pass(Ms(2000));
  Expect(kPublic, announcement);
  Pass(Ms(2000));
  Expect(kPublic, announcement);
  Pass(Ms(1999));
  ExpectNothing();
  Pass(Ms(1));
  ExpectHex(kA, kAckMaster);
  Say(kA, Ack(0));
  for (unsigned block = 1; block <= 5; ++block) {
    ExpectData(block);
    Say(kA, Ack(block));
  }
  EXPECT_EQ(StateOf(0), "proven");
  ExpectData(5);
  ExpectData(5);
  ExpectHex(kB, kNakMaster);
  Say(kB, Nak(2));
  ExpectData(2);
  Say(kB, Nak(4));
  ExpectData(4);
  Say(kB, Nak(5));
  EXPECT_EQ(StateOf(1), "proven");
  ExpectHex(kC, kNakMaster);
  Say(kC, Nak(5));
  EXPECT_EQ(StateOf(2), "proven");
  ExpectNothing();
}

TEST_F(MulticastExchangeTest, TakesTheDallysAcknowledgementForANakThatGotLost) {
  Add("\\Temp\\b.bin", SomeBytes(2500));
  options_.start.expected = 2;
  Begin();
  Say(kA, Request(0x11, "\\Temp\\b.bin", true));
  Say(kB, Request(0x11, "\\Temp\\b.bin", true));
  Pass(Ms(1200));
  for (unsigned block = 0; block <= 5; ++block) Say(kA, Ack(block));
  SkipAll();
  Pass(Ms(500));
  ExpectHex(kB, kNakMaster);  // the NAK of the block count that answered the first one is lost

  Say(kB, Ack(5));

  EXPECT_EQ(StateOf(1), "proven");
  ExpectNothing();
}

TEST_F(MulticastExchangeTest, RepairsADeviceThatIsOverrunAndLetsItSetThePace) {
  options_.first_transfer_id = 0x13;
  Add("\\Temp\\c.bin", SomeBytes(102400));
  options_.start.expected = 2;
  Begin();
  Say(kA, Request(0x13, "\\Temp\\c.bin", true));
  Say(kB, Request(0x13, "\\Temp\\c.bin", true));
  Pass(Ms(1200));
  for (unsigned block = 0; block <= 119; ++block) Say(kA, Ack(block));
  EXPECT_EQ(sent_.back().second, Data(120));
  Say(kA, Ack(120));
  EXPECT_EQ(sent_.back().second, Data(121));  // already on its way when the report comes
  SkipAll();

  Say(kB, Bytes("00 60 00 00 00 40 4f 76 65 72 72 75 6e 3a 36 37 35 30 3a 31 32 30 00"));
  ExpectHex(kA, kPassive);
  ExpectHex(kB, kNakMaster);
  ExpectNothing();
  for (unsigned block = 81; block <= 119; ++block) {
    Say(kB, Nak(block));
    ExpectData(block);
  }
  Say(kB, Nak(122));
  for (unsigned block = 122; block <= 200; ++block) {
    ExpectData(block);
    Say(kB, Ack(block));
  }
  EXPECT_EQ(StateOf(1), "proven");
  ExpectData(200);
  ExpectData(200);
  ExpectHex(kA, kNakMaster);
  Say(kA, Nak(200));
  EXPECT_EQ(StateOf(0), "proven");
  ExpectNothing();
}

TEST_F(MulticastExchangeTest, CountsTheRequestForAnEmptyFileAsItsReceipt) {
  options_.first_transfer_id = 0x14;
  Add("\\Temp\\e.bin", "");
  options_.start.expected = 1;
  Begin();
  EXPECT_EQ(Hex(sent_[0].second.substr(0, 2)), "00 21");
  EXPECT_EQ(Hex(sent_[0].second.substr(6, 4)), "00 00 00 00");
  ExpectAnnouncement();

  Say(kA, Request(0x14, "\\Temp\\e.bin", true));

  ExpectNothing();
  EXPECT_EQ(StateOf(0), "proven");
  Pass(Ms(5999));
  ExpectAnnouncement();
  ExpectAnnouncement();
  ExpectNothing();
  Pass(Ms(501));
  ExpectNothing();
  EXPECT_TRUE(run_->finished());
}

TEST_F(MulticastExchangeTest, GivesUpAFileThatNobodyTakes) {
  Add("\\Temp\\a.bin", SomeBytes(1300), "TQ5* MV??");
  Begin();
  Pass(Ms(20'000));
  for (int copy = 0; copy < 10; ++copy) ExpectAnnouncement();
  ExpectNothing();
  EXPECT_FALSE(run_->finished());
  Pass(Ms(500));
  EXPECT_TRUE(run_->finished());
  EXPECT_TRUE(Figures().devices.empty());
}

TEST_F(MulticastExchangeTest, AnswersARepeatedRequestOnceMoreAndKnowsTheDevice) {
  options_.first_transfer_id = 0x18;
  Add("\\Temp\\f.bin", SomeBytes(1300));
  Begin();
  ExpectAnnouncement();
  Pass(Ms(1));
  Say(kA, Request(0x18, "\\Temp\\f.bin", true));
  ExpectHex(kA, kPassive);
  Pass(Ms(1000));
  Say(kA, Request(0x18, "\\Temp\\f.bin", true));
  ExpectHex(kA, kPassive);
  EXPECT_EQ(Figures().devices.size(), 1U);
  EXPECT_EQ(Figures().devices[0].requests, 2U);
}

TEST_F(MulticastExchangeTest, TellsARequestThatComesTooLateThatTheTransferIsUnknown) {
  Add("\\Temp\\a.bin", SomeBytes(100));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, "\\Temp\\a.bin", true));
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  SkipAll();

  Say(kB, Request(0x11, "\\Temp\\a.bin", true));

  ExpectHex(kB, kUnknownId);
  EXPECT_EQ(Figures().devices.size(), 1U);
}

TEST_F(MulticastExchangeTest, AsksForTheLastAcknowledgementByARoleAndNotByTheBlock) {
  Add("\\Temp\\g.bin", SomeBytes(600));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, "\\Temp\\g.bin", true));
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  ExpectAnnouncement();
  ExpectHex(kA, kPassive);
  ExpectHex(kA, kAckMaster);
  ExpectData(1);
  ExpectData(2);
  Pass(Ms(200));
  ExpectHex(kA, kAckMaster);
  ExpectNothing();

  Say(kA, Ack(2));

  EXPECT_EQ(StateOf(0), "proven");
  ExpectNothing();
}

TEST_F(MulticastExchangeTest, SendsTheLastBlockAgainWhenTheDeviceSaysThatItNeverCame) {
  Add("\\Temp\\g.bin", SomeBytes(600));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, "\\Temp\\g.bin", true));
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  Pass(Ms(200));
  SkipAll();

  Say(kA, Ack(0));

  ExpectData(2);
  Say(kA, Ack(2));
  EXPECT_EQ(StateOf(0), "proven");
}

}  // namespace
}  // namespace server
