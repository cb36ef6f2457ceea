// Enciphered frames: the client speaks as it was spoken to last.
#include "mcftp/client/client_test.h"

namespace {

using test::Ack;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kOackPassive;
using test::Offer;
using test::Request;
using test::ToHex;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

// OACK role 1 for 239.1.1.2:7000, ACK 0, ACK 5 and NAK 2 as the key of all clients makes them
const std::string kSealedOackAck = Hex("80 74 7d 62 39 a1 3a 38 a4 d8");
constexpr char kSealedAck0[] = "80 40 5f 48 a0 27 68 25 8c 6b";

class CipherTest : public MulticastTest {
 protected:
  void EndWaiting() { EXPECT_EQ(End(), 0); }
};

TEST_F(CipherTest, AnswersAnEncipheredFrameEnciphered) {
  Start();
  Establish();

  ToClient(kSealedOackAck);

  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: TRUE (ACKing)",
                                 "Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{kSealedAck0});
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))}) << "and one in the clear in the clear";
  EndWaiting();
}

TEST_F(CipherTest, FollowsEvenAFrameThatItDrops) {
  Start();
  EstablishAsMaster();

  // A block from a stranger, enciphered: ACK 5's body, which makes block 5.
  sim::VirtualPort stranger(world(), {0x0A000009, 7001}, nullptr);
  stranger.Send(test::kPrivateGroup, Hex("80 30 5b 7c ed 9d cb 76 89 c0"));
  Wait(std::chrono::milliseconds(1));
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(Hex("00 30"));  // too short, and in the clear
  ToClient(kSealedOackAck);
  EXPECT_EQ(Frames(), Lines{kSealedAck0});
  EndWaiting();
}

TEST_F(CipherTest, DropsABodyThatIsNoMultipleOfItsBlocks) {
  Start();
  Establish();

  ToClient(kSealedOackAck + "x");
  ToClient(kSealedOackAck.substr(0, 9));

  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_THAT(Log(), IsEmpty());
  EndWaiting();
}

TEST_F(CipherTest, IgnoresThePaddingBehindAFrame) {
  Start();
  Establish();

  ToClient(kSealedOackAck + std::string(8, 'x'));

  EXPECT_EQ(Frames(), Lines{kSealedAck0});
  EndWaiting();
}

TEST_F(CipherTest, ReservedBitsAreLookedAtBeforeTheCipher) {
  Start();
  EstablishAsMaster();

  ToClient(Hex("90 74 7d 62 39 a1 3a 38 a4 d8"));
  EXPECT_THAT(Frames(), IsEmpty());

  // Nothing was switched: the answer that cannot come would be in the clear.
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  EndWaiting();
}

TEST_F(CipherTest, AFrameInTheClearOverrulesTheSetting) {
  SetSetting("EncryptionEnabled", 1);
  Start();

  ToPublic(Announcement({}));

  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))});
  EndWaiting();
}

}  // namespace
