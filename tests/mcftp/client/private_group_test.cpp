// The group of a file, and the role in it.
#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kErrorFrame;
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

using PrivateGroupTest = test::TransferTest;

// ---- the private group ----

TEST_F(PrivateGroupTest, BeginsAnewWhenTheGroupCannotBeJoined) {
  Start();
  ToPublic(Announcement({}));
  Forget();

  ToClient(Hex("00 70 00 00 1b 58 0a 00 00 09"));  // 10.0.0.9 is no group

  EXPECT_THAT(Log(), ElementsAre("Session established to receive file on:", "10.0.0.9   port: 7000",
                                 "Failed to join private multicast group: 10.0.0.9", kWaiting));
  EndWaiting();
}

TEST_F(PrivateGroupTest, ReceivesFromAGroupWithAPortOfItsOwn) {
  Start();
  Offer offer;
  offer.size = 600;
  ToPublic(Announcement(offer));
  ToClient(Hex("00 70 00 00 1b 59 ef 01 01 02"));  // port 7001
  EXPECT_THAT(Log(), Contains("239.1.1.2   port: 7001"));
  ToClient(Hex("00 74 00 00 1b 59 ef 01 01 02"));
  Forget();

  Send(Data(1, 512), {0xEF010102, 7001});
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ToPrivate(Data(2, 88));
  EXPECT_THAT(Frames(), IsEmpty()) << "nobody is member of the group at the public port";
  Send(Data(2, 88), {0xEF010102, 7001});
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(2))});
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), std::string(512, 'A') + std::string(88, 'B'));

  // The next file has its group at the public port again.
  ToClient(kErrorFrame);
  offer.name = "\\Temp\\b.bin";
  const std::size_t sockets = device().network().open_sockets();
  ToPublic(Announcement(offer));
  ToClient(kOackAck);
  EXPECT_EQ(device().network().open_sockets(), sockets - 1);
  Forget();
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  EndWaiting();
}

TEST_F(PrivateGroupTest, ServesBothSocketsInTurn) {
  Start();
  Offer offer;
  offer.size = 512 * 60;
  ToPublic(Announcement(offer));
  ToClient(Hex("00 70 00 00 1b 59 ef 01 01 02"));
  ToClient(Hex("00 74 00 00 1b 59 ef 01 01 02"));
  Forget();

  // All at once: twenty blocks, and the master's role taken away behind them.
  for (unsigned block = 1; block <= 20; ++block) {
    network().At(world().now() + milliseconds(1), [this, block] {
      server().Send({0xEF010102, 7001}, Data(block, 512));
    });
  }
  network().At(world().now() + milliseconds(1),
               [this] { server().Send(test::kClient, Hex("00 70 00 00 1b 59 ef 01 01 02")); });
  Wait(milliseconds(10));

  EXPECT_LT(Frames().size(), 5U) << "the flood on one socket does not keep the other waiting";
  EndWaiting();
}

TEST_F(PrivateGroupTest, BeginsAnewWhenThereIsNoSocketForTheGroupsPort) {
  Start();
  for (const char* call : {"socket", "bind", "setsockopt"}) {
    ToPublic(Announcement({}));
    Forget();
    device().faults().Add({call});
    ToClient(Hex("00 70 00 00 1b 59 ef 01 01 02"));
    device().faults().Clear();
    EXPECT_THAT(Log(), Contains("Failed to join private multicast group: 239.1.1.2")) << call;
    EXPECT_EQ(device().network().open_sockets(), 3U) << call;
  }
  ToPublic(Announcement({}));
  Forget();
  ToClient(Hex("00 70 00 00 00 00 ef 01 01 02"));
  EXPECT_THAT(Log(), Contains("Failed to join private multicast group: 239.1.1.2")) << "port 0";
  EndWaiting();
}

TEST_F(PrivateGroupTest, StaysInTheGroupFromFileToFile) {
  Start();
  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  const std::uint64_t options = device().faults().Count("setsockopt");
  ToPrivate(Data(2, 88));  // ends the dally
  Offer next;
  next.name = "\\Temp\\b.bin";
  ToPublic(Announcement(next));
  Forget();

  ToClient(kOackPassive);

  EXPECT_THAT(Log(),
              ElementsAre("OACK Received", "Change in Master Client status",
                          "Master Client: FALSE (Passive)",
                          "Session established to receive file on:", "239.1.1.2   port: 7000",
                          "Private multicast group joined: 239.1.1.2"));
  EXPECT_EQ(device().faults().Count("setsockopt"), options) << "a member already";
  EndWaiting();
}

TEST_F(PrivateGroupTest, LeavesTheGroupOfTheFileBeforeForAnother) {
  Start();
  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  ToPrivate(Data(2, 88));
  Offer next;
  next.name = "\\Temp\\b.bin";
  ToPublic(Announcement(next));
  Forget();

  ToClient(Hex("00 70 00 00 1b 58 ef 01 01 03"));

  EXPECT_THAT(Log(), Contains("Private multicast group joined: 239.1.1.3"));
  ToClient(Hex("00 74 00 00 1b 58 ef 01 01 03"));
  Forget();
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Frames(), IsEmpty()) << "left";
  Send(Data(1, 512), {0xEF010103, 7000});
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  EXPECT_EQ(End(), 0);
  EXPECT_THAT(Log(), Contains("Leaving multicast group: 239.1.1.3"));
}

TEST_F(PrivateGroupTest, StaysInThePublicGroupWhenThatIsThePrivateOne) {
  Start();
  ToPublic(Announcement({}));
  ToClient(Hex("00 70 00 00 1b 58 ef 01 01 01"));
  EXPECT_THAT(Log(), Contains("Private multicast group joined: 239.1.1.1"));
  ToClient(Hex("00 74 00 00 1b 58 ef 01 01 01"));
  Forget();
  ToPublic(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ToClient(kErrorFrame);

  Offer next;
  next.name = "\\Temp\\b.bin";
  ToPublic(Announcement(next));
  EXPECT_EQ(Frames(), Lines{ToHex(Request(next))}) << "still a member";
  EndWaiting();
}

TEST_F(PrivateGroupTest, TakesTheGroupFromTheFirstOackOfASessionOnly) {
  Start();
  Establish();

  ToClient(Hex("00 74 00 00 1b 58 ef 01 01 09"));

  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))}) << "the role counts";
  Forget();
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  EndWaiting();
}

// ---- roles ----

TEST_F(PrivateGroupTest, NeverAnswersTheFirstOackWhateverRoleItGives) {
  Start();
  ToPublic(Announcement({}));
  Forget();

  ToClient(kOackAck);

  EXPECT_THAT(Log(),
              ElementsAre("OACK Received", "Change in Master Client status",
                          "Master Client: TRUE (ACKing)", "Session established to receive file on:",
                          "239.1.1.2   port: 7000", "Private multicast group joined: 239.1.1.2"));
  EXPECT_THAT(Frames(), IsEmpty());
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))}) << "but takes the role on";
  EndWaiting();
}

TEST_F(PrivateGroupTest, AnswersAnElectionInTheMiddleOfAFileWithBlockZero) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  ToClient(kOackAck);

  EXPECT_THAT(Log(), ElementsAre("Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  EndWaiting();
}

TEST_F(PrivateGroupTest, MarksTheAnswerToAnElectionBehindADuplicateAsOne) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(1, 512));
  Forget();

  ToClient(kOackAck);

  EXPECT_EQ(Frames(), Lines{"01 40 00 00 00 00"});
  EndWaiting();
}

TEST_F(PrivateGroupTest, KeepsItsRoleWhenAnOackNamesNone) {
  Start();
  EstablishAsMaster();

  ToClient(Hex("00 7c 00 00 1b 58 ef 01 01 02"));

  EXPECT_THAT(Log(), ElementsAre("Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  EndWaiting();
}

TEST_F(PrivateGroupTest, KeepsItsRoleForTheNextFile) {
  Start();
  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  ToPrivate(Data(2, 88));
  Offer next;
  next.name = "\\Temp\\b.bin";
  ToPublic(Announcement(next));
  ToClient(kOackAck);
  Forget();

  ToPrivate(Data(1, 512));

  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))}) << "nothing was logged or asked in between";
  EndWaiting();
}

TEST_F(PrivateGroupTest, CompletesAFileWithGapsWhenItAcknowledgesTheLastBlock) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  ToPrivate(Data(3, 276));

  EXPECT_THAT(Log(), ElementsAre("Last block received: 3 (276 bytes)",
                                 "File transfer complete (788 bytes).",
                                 "1 files received (788 total bytes)", "0 file size mismatches",
                                 "Timestamp updated", "Attributes updated",
                                 "File closed: \\Temp\\a.bin", "Dallying..."))
      << "the size is right, and nobody looks at the middle";
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(3))});
  ToPrivate(Data(3, 276));
  EndWaiting();
}

TEST_F(PrivateGroupTest, ShowsWhatItMissesWhenABlockComesFromBehindIt) {
  Start();
  Establish();
  ToClient(kOackNak);
  EXPECT_EQ(Frames(), Lines{ToHex(Nak(1))});
  Forget();

  ToPrivate(Data(2, 512));

  EXPECT_THAT(Log(), ElementsAre("***************************************",
                                 "************** NAK ERROR **************",
                                 "***************************************",
                                 "m_pFrame->data.wBlockNumber: 2", "m_wNAKBlock: 1",
                                 "NAKing block 1 of 3"));
  EXPECT_EQ(Frames(), Lines{ToHex(Nak(1))});
  EndWaiting();
}

TEST_F(PrivateGroupTest, NaksTheLastBlockOnceAFile) {
  Start();
  Offer offer;
  offer.size = 600;
  Establish(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  ToClient(kOackNak);
  EXPECT_EQ(Frames(), Lines{ToHex(Nak(2))});
  EXPECT_THAT(Log(), Contains("Dallying..."));
  EndWaiting();
}

TEST_F(PrivateGroupTest, BeginsAnewWhenAnAnswerCannotBeSent) {
  Start();
  Offer offer;
  offer.step_percent = 0;
  EstablishAsMaster(offer);
  device().faults().Add({"sendto"});
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre(kWaiting));

  EstablishAsMaster(offer);
  device().faults().Add({"sendto"});
  ToClient(kOackAck);
  EXPECT_THAT(Log(), ElementsAre("Client elected initial master client (ACK mode)", kWaiting));

  ToPublic(Announcement(offer));
  ToClient(kOackPassive);
  Forget();
  device().faults().Add({"sendto"});
  ToClient(kOackNak);
  EXPECT_EQ(Log().back(), kWaiting);
  EndWaiting();
}

TEST_F(PrivateGroupTest, IsLeftAtTheEndWhereverItIs) {
  const struct {
    std::string oack;
    const char* group;
  } cases[] = {{Hex("00 70 00 00 1b 59 ef 01 01 02"), "239.1.1.2"},   // a port of its own
               {Hex("00 70 00 00 1b 58 ef 01 01 01"), "239.1.1.1"}};  // the public group itself
  for (const auto& c : cases) {
    Start();
    ToPublic(Announcement({}));
    ToClient(c.oack);
    ToClient(kErrorFrame);
    Offer empty;
    empty.header = "00 21";
    empty.size = 0;
    Forget();
    ToPublic(Announcement(empty));
    EXPECT_THAT(Log(), Contains(std::string("Leaving multicast group: ") + c.group));
    EXPECT_EQ(End(), 0);
  }
}

TEST_F(PrivateGroupTest, IsNotLeftWhenItCouldNotBeJoined) {
  Start();
  Establish();
  ToClient(kErrorFrame);
  ToPublic(Announcement({}));
  ToClient(Hex("00 70 00 00 1b 58 0a 00 00 09"));
  EXPECT_THAT(Log(), Contains("Failed to join private multicast group: 10.0.0.9"));
  EXPECT_EQ(End(), 0);
  EXPECT_THAT(Log(), Not(Contains(::testing::StartsWith("Leaving"))));
}

}  // namespace
