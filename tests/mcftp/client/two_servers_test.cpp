// Two servers that use the same groups: whose frames a client takes, and when.
#include <utility>

#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kOackAck;
using test::kOackNak;
using test::kOackPassive;
using test::kWaiting;
using test::Nak;
using test::Offer;
using test::Request;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// The fixture's server at 10.0.0.2 is the first, at 10.0.0.3 is a second one.
class TwoServersTest : public test::TransferTest {
 protected:
  TwoServersTest()
      : second_(world(), {0x0A000003, 7001},
                [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                  at_second_.push_back(ToHex(bytes));
                }) {
    other_.name = "\\Temp\\b.bin";
    other_.id = 0x22;
  }

  void FromSecond(const std::string& frame, const sim::Endpoint& to) {
    second_.Send(to, frame);
    Wait(milliseconds(1));
  }
  Lines AtSecond() {
    const auto lock = network().Enter();
    return std::exchange(at_second_, {});
  }
  static std::string Content() {
    return std::string(512, 'A') + std::string(512, 'B') + std::string(276, 'C');
  }

  Offer other_;  ///< what the second announces when it is not the first one's file

 private:
  Lines at_second_;
  sim::VirtualPort second_;
};

TEST_F(TwoServersTest, TheFileComesFromTheOneWhoseAnnouncementCameFirst) {
  Start();
  Establish();
  Offer same;
  same.id = 0x77;
  same.size = 1200;
  same.block_size = 400;

  for (unsigned block = 1; block <= 3; ++block) {
    FromSecond(Announcement(same), test::kPublicGroup);
    FromSecond(Data(block, 400, 'z'), test::kPrivateGroup);
    ToPrivate(Data(block, block < 3 ? 512 : 276));
  }
  EXPECT_THAT(Log(), ElementsAre("Last block received: 3 (276 bytes)"));
  ToClient(kOackNak);

  EXPECT_EQ(Frames(), Lines{ToHex(Nak(3))});
  EXPECT_THAT(AtSecond(), IsEmpty());
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), Content());
  EndWaiting();
}

TEST_F(TwoServersTest, BlocksOfTheOtherOneAreNotHeardBeforeTheOack) {
  Start();
  ToPublic(Announcement({}));
  Forget();

  FromSecond(Data(1, 512, 'z'), test::kPrivateGroup);
  FromSecond(Data(1, 512, 'z'), test::kClient);
  EXPECT_THAT(Log(), IsEmpty()) << "a block of its own server would be a reset";

  ToClient(kOackPassive);
  EXPECT_THAT(Log(), Contains("Private multicast group joined: 239.1.1.2"));
  EndWaiting();
}

TEST_F(TwoServersTest, AnotherFileOfTheSecondEndsTheOneInHand) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  FromSecond(Announcement(other_), test::kPublicGroup);
  EXPECT_THAT(Log(), ElementsAre(kWaiting)) << "and is consumed by that";
  FromSecond(Announcement(other_), test::kPublicGroup);

  EXPECT_EQ(AtSecond(), Lines{ToHex(Request(other_))});
  FromSecond(kOackPassive, test::kClient);
  Forget();
  ToPrivate(Data(2, 512));
  EXPECT_THAT(Frames(), IsEmpty());
  FromSecond(Data(3, 276), test::kPrivateGroup);
  EXPECT_THAT(Log(), ElementsAre("Last block received: 3 (276 bytes)"))
      << "the first one's blocks are a stranger's now, the second one's count";
  EndWaiting();
}

TEST_F(TwoServersTest, TheFirstGetsItsClientBackWithTheNextCopyOfItsAnnouncement) {
  Start();
  EstablishAsMaster();
  FromSecond(Announcement(other_), test::kPublicGroup);
  Forget();

  ToPublic(Announcement({}));

  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))});
  EXPECT_THAT(AtSecond(), IsEmpty());
  EndWaiting();
}

TEST_F(TwoServersTest, ARequestThatGoesToTheWrongOneIsRefusedAndMadeAnew) {
  Start();
  ToPublic(Announcement({}));
  Frames();

  // Announcing another file makes the second the one that is asked, for the first one's file.
  FromSecond(Announcement(other_), test::kPublicGroup);
  EXPECT_EQ(AtSecond(), Lines{ToHex(Request({}))});
  FromSecond(Hex("00 60 00 00 00 05") + "Unknown transfer ID" + std::string(1, '\0'),
             test::kClient);
  EXPECT_EQ(Log().back(), kWaiting);

  ToPublic(Announcement({}));
  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))});
  EndWaiting();
}

TEST_F(TwoServersTest, AnOackTakesTheClientToItsSenderAndBack) {
  Start();
  EstablishAsMaster();

  FromSecond(kOackAck, test::kClient);
  EXPECT_EQ(AtSecond(), Lines{ToHex(Ack(0))});
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(kOackNak);
  EXPECT_EQ(Frames(), Lines{ToHex(Nak(1))});
  FromSecond(Data(1, 512, 'z'), test::kPrivateGroup);
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Nak(2))});
  EXPECT_THAT(AtSecond(), IsEmpty());
  EndWaiting();
}

TEST_F(TwoServersTest, AnErrorOfTheSecondEndsTheFileOfTheFirst) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  FromSecond(test::kErrorFrame, test::kClient);

  EXPECT_THAT(Log(), ElementsAre(kWaiting));
  EndWaiting();
}

TEST_F(TwoServersTest, OfTwoOnOneHostBothSendBlocksAndTheFirstIsAnswered) {
  Start();
  EstablishAsMaster();
  sim::VirtualPort neighbour(world(), {test::kServerAddress, 7002}, nullptr);

  neighbour.Send(test::kPrivateGroup, Data(2, 512, 'z'));
  Wait(milliseconds(1));

  EXPECT_EQ(Frames(), Lines{ToHex(Ack(2))}) << "two servers on one address need two groups";
  EndWaiting();
}

TEST_F(TwoServersTest, ADallyEndsWithTheSecondsCopyOfTheFile) {
  Start();
  Offer offer;
  offer.size = 512;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Log().back(), "Dallying...");

  FromSecond(Announcement(offer), test::kPublicGroup);
  EXPECT_THAT(Log(), ElementsAre(kWaiting));
  FromSecond(Announcement(offer), test::kPublicGroup);

  EXPECT_EQ(AtSecond(), Lines{ToHex(Request(offer))}) << "it has forgotten that it has the file";
  EndWaiting();
}

TEST_F(TwoServersTest, TheLastFileOfOneEndsTheClientForBoth) {
  Start();
  Offer offer;
  offer.header = "00 21";
  offer.size = 512;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  Forget();

  FromSecond(Announcement(other_), test::kPublicGroup);

  EXPECT_THAT(Log(), Contains("Client shutting down..."));
  EXPECT_EQ(End(), 0);
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), std::string(512, 'A'));
}

}  // namespace
