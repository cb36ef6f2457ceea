// What the server must and must not do, one rule a test.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

#include "server/multicast_script.h"

namespace server {
namespace {

class MulticastRulesTest : public LockStepScript {};

// ---- where frames come from and go to ----

TEST_F(MulticastRulesTest, AnnouncesItsOwnEndpointAndThePublicPortForThePrivateGroup) {
  BeginWith({kA});
  EXPECT_EQ(Hex(sent_[0].second.substr(42, 6)), "1b 59 0a 00 00 02");
  EXPECT_EQ(sent_[0].first, kPublic);
  EXPECT_EQ(Hex(sent_[1].second.substr(4, 6)), "1b 58 ef 01 01 02");
  Say(kA, Ack(0));
  EXPECT_EQ(sent_.back().first, kPrivate);
}

TEST_F(MulticastRulesTest, DropsWhatComesFromItsOwnAddress) {
  BeginWith({kA});
  SkipAll();
  Say({kOwn.address, 7000}, Request(0x11, kName, true));
  ExpectNothing();
  EXPECT_EQ(run_->figures().garbage, 1U);
}

TEST_F(MulticastRulesTest, RefusesGroupsThatAreNone) {
  Add(kName, "x");
  options_.private_group = kPublic.address;
  EXPECT_THROW(Begin(), std::invalid_argument);
  options_.private_group = 0x0A000001;
  EXPECT_THROW(Begin(), std::invalid_argument);
  options_.private_group = kPrivate.address;
  options_.public_group.port = 0;
  EXPECT_THROW(Begin(), std::invalid_argument);
}

TEST_F(MulticastRulesTest, NeverTellsClientsToWaitForAnAnswerForEver) {
  Add(kName, "x");
  options_.oack_wait = Micros(0);
  EXPECT_THROW(Begin(), std::invalid_argument);
}

// ---- parameters ----

TEST_F(MulticastRulesTest, RaisesTheBlockSizeSoThatNoFileHasTooManyBlocks) {
  EXPECT_EQ(ChooseBlocks(65535 * 512, 512).block_size, 512);
  EXPECT_EQ(ChooseBlocks(65535 * 512, 512).block_count, 65535U);
  EXPECT_EQ(ChooseBlocks(65535 * 512 + 1, 512).block_size, 513);
  EXPECT_LE(ChooseBlocks(65535 * 512 + 1, 512).block_count, 65535U);
  EXPECT_EQ(ChooseBlocks(0, 512).block_count, 0U);
  EXPECT_EQ(ChooseBlocks(1, 512).block_count, 1U);
  EXPECT_EQ(ChooseBlocks(65000U * 65535U, 512).block_size, 65000);
  EXPECT_EQ(ChooseBlocks(65000U * 65535U, 512).block_count, 65535U);
}

TEST_F(MulticastRulesTest, LetsWaitingDevicesHearSomethingEveryTenSeconds) {
  Add(kName, SomeBytes(2500));
  options_.start.minimum = 2;
  options_.start.longest_wait = Ms(60'000);
  options_.announce_interval = Ms(5000);
  Begin();
  Say(kA, Request(0x11, kName, true));
  Pass(Ms(9'000));
  SkipAll();
  Pass(Ms(1'999));
  std::size_t roles = 0;
  for (; seen_ < sent_.size(); ++seen_) roles += sent_[seen_].first == kA;
  EXPECT_EQ(roles, 1U);
  EXPECT_EQ(Hex(sent_[sent_.size() - 1].second), kPassive);
}

TEST_F(MulticastRulesTest, EnciphersEveryFrameWhenItIsToldTo) {
  options_.encrypt = true;
  BeginWith({kA});
  Say(kA, Bytes("80 40 5f 48 a0 27 68 25 8c 6b"));  // ACK 0
  ASSERT_EQ(sent_.size(), 4U);
  for (const auto& [to, bytes] : sent_) {
    EXPECT_EQ(static_cast<unsigned char>(bytes[0]), 0x80U);
    EXPECT_EQ(bytes.size() % 8, 2U);
  }
  EXPECT_EQ(sent_[2].second, Bytes("80 74 7d 62 39 a1 3a 38 a4 d8"));
  EXPECT_EQ(sent_[3].second.size(), 2 + 520U);
}

// ---- the states of a session ----

TEST_F(MulticastRulesTest, OffersTheMastershipFiveTimesAndThenToTheNextDevice) {
  BeginWith({kA, kB});
  SkipAll();
  Pass(Ms(2000));
  for (int i = 0; i < 4; ++i) ExpectHex(kA, kAckMaster);
  ExpectNothing();
  Pass(Ms(500));
  ExpectHex(kA, kPassive);
  ExpectHex(kB, kAckMaster);
  EXPECT_EQ(StateOf(0), "dead");
  EXPECT_EQ(Figures().devices[0].last_heard, "RRQ");
}

TEST_F(MulticastRulesTest, DrainsTheOthersWhenTheMasterFallsSilent) {
  BeginWith({kA, kB});
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  SkipAll();
  Pass(Ms(9 * 200));
  for (int i = 0; i < 9; ++i) ExpectData(2);
  Pass(Ms(200));
  ExpectHex(kA, kPassive);
  ExpectData(5);
  ExpectData(5);
  ExpectHex(kB, kNakMaster);
  EXPECT_EQ(StateOf(0), "dead");
  EXPECT_EQ(Figures().devices[0].last_heard, "ACK 1");
}

TEST_F(MulticastRulesTest, GoesBackToTheOldMasterWhenAnOverrunDeviceFallsSilent) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 120);
  Say(kB, Overrun("6750:120"));
  SkipAll();
  Pass(Ms(2000));
  for (int i = 0; i < 4; ++i) ExpectHex(kB, kNakMaster);
  Pass(Ms(500));
  ExpectHex(kB, kPassive);
  ExpectHex(kA, kAckMaster);
  Say(kA, Ack(0));
  ExpectData(121);
  EXPECT_EQ(StateOf(1), "dead");
}

TEST_F(MulticastRulesTest, ReportsADeviceThatDoesNotSayWhatItLacksAsDead) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 5);
  SkipAll();
  Pass(Ms(2000));
  for (int i = 0; i < 4; ++i) ExpectHex(kB, kNakMaster);
  Pass(Ms(500));
  ExpectHex(kB, kPassive);
  EXPECT_EQ(StateOf(1), "dead");
  EXPECT_EQ(Figures().devices[1].reason, "does not say what it lacks");
}

TEST_F(MulticastRulesTest, MarksADeviceDeadThatCannotWrite) {
  BeginWith({kA, kB});
  Say(kA, Ack(0));
  SkipAll();
  Say(kA, Bytes("00 60 00 00 00 03") + "Disk full or allocation exceeded" + std::string(1, '\0'));
  EXPECT_EQ(StateOf(0), "dead");
  EXPECT_THAT(Figures().devices[0].reason, ::testing::HasSubstr("Disk full"));
  ExpectData(5);
  ExpectData(5);
  ExpectHex(kB, kNakMaster);
}

// ---- what follows from how clients behave ----

TEST_F(MulticastRulesTest, StopsAnnouncingBeforeTheFirstBlockAndAnnouncesNoFinishedFileAgain) {
  Add(kName, SomeBytes(100));
  Add("\\Temp\\second.bin", SomeBytes(100));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, kName, false));
  Acknowledge(kA, 0, 1);
  Pass(Ms(30'000));
  std::size_t first = 0;
  for (const auto& [to, bytes] : sent_) first += bytes.find(kName) != std::string::npos;
  EXPECT_EQ(first, 1U);
}

TEST_F(MulticastRulesTest, HasOneSessionAtATime) {
  Add(kName, SomeBytes(100));
  Add("\\Temp\\second.bin", SomeBytes(100));
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, kName, false));
  Say(kA, Ack(0));
  Say(kA, Ack(1));
  SkipAll();
  Pass(Ms(499));
  ExpectNothing();
  Pass(Ms(1));
  ExpectAnnouncement();
}

TEST_F(MulticastRulesTest, ElectsWithASecondAnswerBecauseTheFirstIsNeverAnswered) {
  BeginWith({kA});
  SkipAll();
  EXPECT_EQ(Hex(sent_[1].second), kPassive);
  EXPECT_EQ(Hex(sent_[2].second), kAckMaster);
  Pass(Ms(500));
  ExpectHex(kA, kAckMaster);
}

TEST_F(MulticastRulesTest, SendsTheOnlyBlockBeforeAnybodyIsAskedWhatItLacks) {
  BeginWith({kA, kB}, 100);
  Acknowledge(kA, 0, 1);
  std::vector<std::string> after;
  for (std::size_t i = 4; i < sent_.size(); ++i) after.push_back(Hex(sent_[i].second.substr(0, 2)));
  EXPECT_THAT(after, ::testing::ElementsAre("00 30", "00 30", "00 30", "00 78"));
}

TEST_F(MulticastRulesTest, SendsTheLastBlockAgainToWhoJoinsWhileOthersAreAsked) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 5);
  Pass(Ms(10));
  Say(kC, Request(0x11, kName, true));
  SkipAll();
  Say(kB, Nak(5));
  ExpectData(5);
  ExpectData(5);
  ExpectHex(kC, kNakMaster);
  EXPECT_TRUE(Figures().devices[2].late);
}

TEST_F(MulticastRulesTest, AsksAgainWhenTheNakOfTheBlockCountGotLost) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 5);
  Say(kB, Nak(3));
  SkipAll();
  Pass(Ms(500));
  ExpectHex(kB, kNakMaster);
  Say(kB, Ack(5));
  EXPECT_EQ(StateOf(1), "proven");
}

TEST_F(MulticastRulesTest, MakesTheOldMasterPassiveAndOnceMoreWhenItAnswersAllTheSame) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 120);
  Say(kB, Overrun("6750:120"));
  SkipAll();
  Say(kB, Nak(81));
  ExpectData(81);
  Say(kA, Ack(121));  // may have been on its way when A was made passive
  ExpectNothing();
  Pass(Ms(250));
  Say(kA, Ack(81));
  ExpectHex(kA, kPassive);
}

TEST_F(MulticastRulesTest, ConfirmsTheModeOfAMasterThatNamesABlockInsteadOfAcknowledgingIt) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 120);
  Say(kB, Overrun("6750:120"));
  Say(kB, Nak(122));
  SkipAll();
  Say(kB, Nak(123));  // it answers DATA 122
  ExpectHex(kB, kAckMaster);
  ExpectNothing();
  Say(kB, Ack(0));
  ExpectData(123);
}

TEST_F(MulticastRulesTest, HandlesTheLowestPercentageFirst) {
  Add(kName, SomeBytes(102400));
  options_.start.expected = 3;
  Begin();
  for (const Peer& device : {kA, kB, kC}) Say(device, Request(0x11, kName, true));
  Pass(Ms(1200));
  Acknowledge(kA, 0, 120);
  Say(kB, Overrun("6750:120"));
  Say(kC, Overrun("3000:121"));
  Say(kB, Overrun("6900:121"));
  SkipAll();
  Say(kB, Nak(121));  // B is through: now C, which has the lowest
  ExpectHex(kB, kPassive);
  ExpectHex(kC, kNakMaster);
  Say(kC, Nak(60));
  ExpectData(60);
  EXPECT_EQ(Figures().devices[1].overruns, 2U);
}

TEST_F(MulticastRulesTest, IgnoresTheOverrunOfADeviceThatCameWhenBlocksWereFlowing) {
  BeginWith({kA}, 102400);
  Acknowledge(kA, 0, 100);
  Say(kC, Request(0x11, kName, true));
  SkipAll();
  Say(kC, Overrun("100:150"));
  ExpectNothing();
  Say(kA, Ack(101));
  ExpectData(102);
}

TEST_F(MulticastRulesTest, LetsAMasterWithGapsPaceAllBlocksButTheLast) {
  BeginWith({kA, kB}, 102400);
  Acknowledge(kA, 0, 3);
  Say(kB, Overrun("3000:4"));
  for (int i = 0; i < 5; ++i) Pass(Ms(500));  // B says nothing, A is elected again
  SkipAll();
  Say(kC, Request(0x11, kName, true));
  SkipAll();
  for (int i = 0; i < 5; ++i) Pass(Ms(500));  // nor does A
  EXPECT_EQ(StateOf(0), "dead");
  ExpectHex(kA, kAckMaster);
  SkipAll();
  Say(kC, Ack(0));
  ExpectData(4);
  Acknowledge(kC, 4, 198);
  SkipAll();
  Say(kC, Ack(199));
  ExpectHex(kC, kPassive);
  ExpectData(200);
  ExpectData(200);
  ExpectHex(kC, kNakMaster);
  Say(kC, Nak(1));
  ExpectData(1);
}

TEST_F(MulticastRulesTest, AsksAPassiveDeviceEvenIfItHasEverything) {
  BeginWith({kA, kB});
  Acknowledge(kA, 0, 5);
  EXPECT_EQ(StateOf(1), "joined");
  EXPECT_EQ(Hex(sent_.back().second), kNakMaster);
  EXPECT_EQ(sent_.back().first, kB);
}

TEST_F(MulticastRulesTest, AnswersARepeatedRequestWithTheRoleTheDeviceHas) {
  BeginWith({kA});
  Say(kA, Ack(0));
  SkipAll();
  Say(kA, Request(0x11, kName, true));
  ExpectHex(kA, kAckMaster);
  Say(kA, Ack(0));  // repeated: nothing is sent again
  ExpectNothing();
  EXPECT_EQ(Figures().devices.size(), 1U);
}

TEST_F(MulticastRulesTest, SetsTheLastFileFlagInEveryCopyOfTheLastFileOnly) {
  Add(kName, SomeBytes(10), "NO*");
  Add("\\Temp\\second.bin", SomeBytes(10));
  options_.announce_max = 2;
  options_.announce_min = 1;
  Begin();
  Pass(Ms(60'000));
  std::string flags;
  for (const auto& [to, bytes] : sent_) flags += Hex(bytes.substr(1, 1)) + " ";
  EXPECT_EQ(flags, "20 20 21 21 ");
  EXPECT_TRUE(run_->finished());
}

TEST_F(MulticastRulesTest, ChecksIdentifierNameAndSenderOfEveryFrame) {
  BeginWith({kA});
  SkipAll();
  Say(kB, Request(0x11, "\\Temp\\other.bin", true));
  ExpectNothing();
  Say(kB, Request(0x99, kName, true));
  ExpectHex(kB, kUnknownId);
  Say(kB, Ack(0));
  Say(kB, Nak(1));
  Say(kB, Overrun("1:200"));
  ExpectNothing();
  EXPECT_EQ(Figures().devices.size(), 1U);
  EXPECT_EQ(run_->figures().strangers, 3U);
  Say(kA, Bytes("00 40 00 00 00"));  // a byte short
  Say(kA, Ack(6));                   // behind the block count
  Say(kA, Nak(0));
  Say(kA, Bytes("10 40 00 00 00 00"));  // a reserved bit
  Say(kA, Bytes("80 40 00 00 00 00"));  // enciphered, and no whole block of the cipher
  ExpectNothing();
  EXPECT_EQ(run_->figures().garbage, 6U);
}

TEST_F(MulticastRulesTest, AnnouncesTheDestinationOnTheDevice) {
  BeginWith({kA});
  EXPECT_NE(sent_[0].second.find(std::string(kName) + '\0'), std::string::npos);
}

TEST_F(MulticastRulesTest, KeepsNoMoreDevicesThanItMay) {
  Add(kName, SomeBytes(2500));
  options_.max_devices = 10;
  Begin();
  for (std::uint32_t i = 0; i < 1000; ++i) Say({0x0A010000 + i, 7000}, Request(0x11, kName, true));
  EXPECT_EQ(Figures().devices.size(), 10U);
  EXPECT_EQ(run_->figures().turned_away, 990U);
}

TEST_F(MulticastRulesTest, TellsDevicesWhenItsFileCannotBeReadAnyMore) {
  class Broken final : public FileContent {
    [[nodiscard]] std::uint32_t size() const override { return 2500; }
    [[nodiscard]] bool Read(std::uint32_t /*offset*/, std::size_t /*size*/,
                            std::uint8_t* /*out*/) override {
      return false;
    }
  };
  Add(kName, "");
  files_[0].content = std::make_shared<Broken>();
  options_.start.expected = 1;
  Begin();
  Say(kA, Request(0x11, kName, true));
  SkipAll();
  Say(kA, Ack(0));
  Expect(kA, Bytes("00 60 00 00 00 02") + "Access violation" + std::string(1, '\0'));
  EXPECT_EQ(StateOf(0), "dead");
  Pass(Ms(500));
  EXPECT_TRUE(run_->finished());
}

}  // namespace
}  // namespace server
