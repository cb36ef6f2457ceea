// Whatever comes, from whomever, in whichever state: the client goes on, and writes nothing that
// does not belong to the file.
#include <random>

#include "mcftp/client/client_test.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Big;
using test::Data;
using test::Hex;
using test::kOackAck;
using test::kOackPassive;
using test::Offer;
using test::Request;
using test::ToHex;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class HostileFramesTest : public MulticastTest {
 protected:
  /// Sends without waiting for each.
  void Pour(const std::string& frame, const sim::Endpoint& to = test::kClient) {
    server().Send(to, frame);
    if (++poured_ % 8 == 0) Wait(milliseconds(1));
  }
  /// The client is there, and does what it always does.
  void ExpectAlive() {
    Wait(milliseconds(1));
    ToClient(Hex("00 60 00 00 00 00 58 00"));  // ends whatever there is
    Wait(milliseconds(40000));                 // a dally or a wait for a block, too
    ASSERT_FALSE(has_ended());
    Offer offer;
    offer.name = "\\Temp\\alive.bin";
    offer.size = 600;
    ToClient(kOackPassive);
    EstablishAsMaster(offer);
    ToPrivate(Data(1, 512));
    ToPrivate(Data(2, 88));
    EXPECT_THAT(Frames(), ElementsAre(ToHex(Ack(1)), ToHex(Ack(2))));
    Wait(milliseconds(5010));
    EXPECT_EQ(test::GetFile("\\Temp\\alive.bin"), std::string(512, 'A') + std::string(88, 'B'));
    EXPECT_EQ(End(), 0);
  }

 private:
  int poured_ = 0;
};

TEST_F(HostileFramesTest, DropsFramesOfEveryLengthBelowTheirFixedPart) {
  Start();
  const std::string whole = Announcement({});
  for (std::size_t length = 0; length < 53; ++length) {
    Pour(whole.substr(0, length));
    Pour(whole.substr(0, length), test::kPublicGroup);
  }
  for (std::size_t length = 53; length < whole.size(); ++length) {
    Pour(whole.substr(0, length));  // without its terminators
  }
  Wait(milliseconds(1));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());

  EstablishAsMaster();
  for (const std::string& frame : {kOackAck, Data(1, 512), Hex("00 60 00 00 00 05")}) {
    const std::size_t least = frame == kOackAck ? 10 : 6;
    for (std::size_t length = 0; length < least; ++length) {
      Pour(frame.substr(0, length));
      Pour(frame.substr(0, length), test::kPrivateGroup);
    }
  }
  for (std::size_t length = 6; length < 518; ++length) Pour(Data(1, 512).substr(0, length));
  Wait(milliseconds(1));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ExpectAlive();
}

TEST_F(HostileFramesTest, DropsAnnouncementsThatNoFileCanComeOf) {
  Start();
  const auto expect_dropped = [&](const Offer& offer, const char* why) {
    ToPublic(Announcement(offer));
    EXPECT_THAT(Log(), IsEmpty()) << why;
    EXPECT_THAT(Frames(), IsEmpty()) << why;
  };
  Offer offer;
  offer.block_size = 0;
  expect_dropped(offer, "no block size");
  offer.block_size = 1;
  offer.size = 65536;
  expect_dropped(offer, "more blocks than there are numbers");
  offer.size = 0xFFFFFFFF;
  offer.block_size = 65535;
  expect_dropped(offer, "65,538 blocks of the largest size");
  offer = {};
  offer.name = "";
  expect_dropped(offer, "no name");
  offer.name = "\\" + std::string(259, 'a');
  expect_dropped(offer, "a name that is too long");

  offer.name = "\\Temp\\" + std::string(253, 'a');
  offer.size = 65535;
  offer.block_size = 1;
  ToPublic(Announcement(offer));
  EXPECT_THAT(Frames(), ElementsAre(ToHex(Request(offer)))) << "the largest of all is taken";
  ExpectAlive();
}

TEST_F(HostileFramesTest, DropsEveryFrameWithAReservedBit) {
  Start();
  EstablishAsMaster();
  for (unsigned bits = 1; bits < 8; ++bits) {
    for (unsigned opcode = 0; opcode < 16; ++opcode) {
      Pour(Big(bits << 12U | opcode << 4U, 2) + std::string(100, '\0'));
    }
  }
  Wait(milliseconds(1));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ExpectAlive();
}

TEST_F(HostileFramesTest, TakesEveryOtherHeaderInEveryState) {
  Start();
  for (unsigned word = 0; word <= 0xFFFF; word += 13) {
    if (word % 7 == 0) Pour(Announcement({}), test::kPublicGroup);
    if (word % 5 == 0) Pour(kOackPassive);
    Pour(Big(word, 2) + std::string(word % 80, static_cast<char>(word)));
  }
  ExpectAlive();
}

TEST_F(HostileFramesTest, WritesNothingBehindTheFilesLastBlock) {
  Start();
  EstablishAsMaster();
  for (unsigned block = 0; block <= 65535; block += 41) {
    for (const std::size_t length : {0, 1, 511, 512, 513}) {
      if (block <= 3 && length <= 512) continue;
      Pour(Data(block, length), test::kPrivateGroup);
    }
  }
  Wait(milliseconds(1));
  EXPECT_THAT(Frames(), IsEmpty());
  Wait(milliseconds(32000));
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), "");
  ExpectAlive();
}

TEST_F(HostileFramesTest, LivesThroughRandomBytes) {
  std::mt19937 random(11);
  Start();
  for (int i = 0; i < 4000; ++i) {
    std::string frame(random() % 120, '\0');
    for (char& byte : frame) byte = static_cast<char>(random());
    if (frame.size() > 2 && random() % 4 != 0) {
      frame[0] = static_cast<char>(random() % 2);
      frame[1] = static_cast<char>((random() % 9) << 4U | (random() % 8 & 0xEU));
    }
    Pour(frame, random() % 2 != 0 ? test::kClient : test::kPublicGroup);
    if (random() % 50 == 0) Pour(Announcement({}));
    if (random() % 20 == 0) Pour(kOackPassive);
  }
  ExpectAlive();
}

TEST_F(HostileFramesTest, LivesThroughDamagedFramesOfAWholeTransfer) {
  std::mt19937 random(12);
  Start();
  const std::vector<std::string> frames = {Announcement({}), kOackPassive, kOackAck,
                                           Data(1, 512),     Data(2, 512), Data(3, 276),
                                           test::kOackNak,   Data(2, 0)};
  for (int i = 0; i < 4000; ++i) {
    std::string frame = frames[random() % frames.size()];
    for (unsigned flips = random() % 3; flips > 0; --flips) {
      frame[random() % frame.size()] = static_cast<char>(random());
    }
    frame[1] = static_cast<char>(static_cast<unsigned char>(frame[1]) & 0xFEU);  // never the last
    if (random() % 10 == 0) frame.resize(random() % (frame.size() + 20));
    Pour(frame, random() % 2 != 0 ? test::kClient : test::kPrivateGroup);
  }
  ExpectAlive();
}

TEST_F(HostileFramesTest, DropsBrokenFramesInTheDallyAndBeforeTheOack) {
  const std::vector<std::string> frames = {Announcement({}), kOackAck, Data(1, 512),
                                           Hex("00 60 00 00 00 05")};
  const auto pour_all = [&] {
    for (const std::string& frame : frames) {
      const std::size_t least = frame == kOackAck ? 10 : frame == frames[0] ? frame.size() : 6;
      for (std::size_t length = 0; length < least; ++length) Pour(frame.substr(0, length));
    }
    for (std::size_t length = 6; length < 518; length += 5) Pour(frames[2].substr(0, length));
    Wait(milliseconds(1));
  };
  Start();
  Offer offer;
  offer.size = 600;
  offer.oack_wait_ms = 20000;
  ToPublic(Announcement(offer));
  Forget();
  pour_all();
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(kOackPassive);
  ToClient(kOackAck);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  Forget();
  pour_all();
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());
  ToClient(kOackAck);
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(2))}) << "still in the dally";
  ExpectAlive();
}

}  // namespace
