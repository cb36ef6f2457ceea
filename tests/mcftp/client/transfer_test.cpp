// One file at a time: what can go wrong with it, and what the client makes of it.
#include "faults/faults.h"
#include "mcftp/client/client_test.h"
#include "net/network.h"
// The platform's own names come last.
#include "mcftp/registry.h"
#include "mcftp/settings.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kOackAck;
using test::kOackNak;
using test::kOackPassive;
using test::Nak;
using test::Offer;
using test::Request;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr char kWaiting[] = "Waiting for a Multicast MCFTP Server to announce a file...";
constexpr char kKey[] = "HKEY_LOCAL_MACHINE\\Software\\Corvanta\\Device Management\\MCFTP Client";

const std::string kUnknownFrame = Hex("00 90 00 00");
const std::string kErrorFrame = Hex("00 60 00 00 00 00 58 00");

class TransferTest : public MulticastTest {
 protected:
  static void SetSetting(const char* name, std::uint32_t value) {
    mcftp::Settings settings;
    ASSERT_TRUE(mcftp::LoadSettings(settings));
    mcftp::Registry registry;
    ASSERT_TRUE(registry.Create(kKey));
    ASSERT_TRUE(registry.WriteDword(name, value));
  }
  /// A file of two blocks, all but its last, from an ACKing master.
  void ReceiveAllButTheLast(Offer offer = {}) {
    offer.size = 600;
    EstablishAsMaster(offer);
    ToPrivate(Data(1, 512));
    Forget();
  }
  /// Ends a client that waits for announcements.
  void EndWaiting() { EXPECT_EQ(End(), 0); }
};

// ---- which blocks there are ----

TEST_F(TransferTest, CountsBlocksUpwards) {
  Start();
  const struct {
    std::uint64_t size;
    const char* line;
  } cases[] = {{10000, "Data blocks: 20"},
               {10240, "Data blocks: 20"},
               {10241, "Data blocks: 21"},
               {1, "Data blocks: 1"}};
  for (const auto& c : cases) {
    Offer offer;
    offer.size = c.size;
    offer.name = "\\Temp\\" + std::to_string(c.size);
    ToPublic(Announcement(offer));
    EXPECT_THAT(Log(), Contains(c.line));
    ToClient(kErrorFrame);
    Forget();
  }
  EndWaiting();
}

// ---- the output file ----

TEST_F(TransferTest, MakesTheLastFolderOfThePath) {
  Start();
  Offer offer;
  offer.name = "\\New\\a.bin";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "\\New\\a.bin",
                                 "MCT mask(s): ", "Data blocks: 3", "Opening: \\New\\a.bin (1300)",
                                 "Opening: \\New\\a.bin", "Establishing session with 10.0.0.2",
                                 "RRQ sent to 10.0.0.2"));
  EXPECT_TRUE(test::Exists("\\New\\a.bin"));
  EndWaiting();
}

TEST_F(TransferTest, DoesNotMakeTwoFoldersAndWaitsOnWithoutAReset) {
  Start();
  Offer offer;
  offer.name = "\\New\\Sub\\a.bin";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(),
              ElementsAre("Announcement on 239.1.1.1 for:", "\\New\\Sub\\a.bin",
                          "MCT mask(s): ", "Data blocks: 3", "Opening: \\New\\Sub\\a.bin (1300)",
                          "Error creating: \\New\\Sub\\a.bin", kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_THAT(Status(), ElementsAre("01 00 00 00 00 00 00 00 00 00 05 14 \\New\\Sub\\a.bin"));
  ToPublic(Announcement(offer));
  EXPECT_THAT(Log(), IsEmpty()) << "the name is still known";
  ToPublic(Announcement({}));
  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))}) << "another one is accepted";
  EndWaiting();
}

TEST_F(TransferTest, SaysWhenAFileCannotBeOpenedEvenInItsNewFolder) {
  Start();
  Offer offer;
  offer.name = "\\New\\a?.bin";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(),
              ElementsAre("Announcement on 239.1.1.1 for:", "\\New\\a?.bin",
                          "MCT mask(s): ", "Data blocks: 3", "Opening: \\New\\a?.bin (1300)",
                          "Opening: \\New\\a?.bin", "Error opening: \\New\\a?.bin", kWaiting));
  EndWaiting();
}

TEST_F(TransferTest, MakesNoFolderOfTheRootOrOfNothing) {
  Start();
  for (const char* name : {"\\a?.bin", "a?.bin"}) {
    Offer offer;
    offer.name = name;
    ToPublic(Announcement(offer));
    EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", name, "MCT mask(s): ",
                                   "Data blocks: 3", "Opening: " + offer.name + " (1300)",
                                   "Error opening: " + offer.name, kWaiting));
  }
  EXPECT_EQ(device().faults().Count("CreateDirectoryW"), 1U) << "the test's own";
  EndWaiting();
}

TEST_F(TransferTest, GivesUpAFileThatItHasNoMemoryFor) {
  Start();
  ToPublic(Announcement({}));  // makes the receive buffer
  ToClient(kErrorFrame);
  Forget();
  device().faults().Add({"LocalAlloc"});

  ToPublic(Announcement({}));

  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "\\Temp\\a.bin",
                                 "MCT mask(s): ", "Data blocks: 3", kWaiting));
  EXPECT_THAT(Status(), IsEmpty()) << "nothing is being opened";
  EndWaiting();
}

TEST_F(TransferTest, ClosesTheFileOfASessionThatCameToNothingWithTheNextOne) {
  SetSetting("MaxSessionRetries", 1);
  Start();
  ToPublic(Announcement({}));
  Wait(milliseconds(1000));
  EXPECT_THAT(Log(), Contains("Server not responding to RRQ"));
  EXPECT_EQ(DeleteFileW(TEXT("\\Temp\\a.bin")), FALSE) << "still open";
  Offer next;
  next.name = "\\Temp\\b.bin";

  ToPublic(Announcement(next));

  EXPECT_NE(DeleteFileW(TEXT("\\Temp\\a.bin")), FALSE);
  EndWaiting();
}

// ---- request ----

TEST_F(TransferTest, SendsNoRequestAtAllWithRetriesSetToZero) {
  SetSetting("MaxSessionRetries", 0);
  Start();

  ToPublic(Announcement({}));

  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "\\Temp\\a.bin",
                                 "MCT mask(s): ", "Data blocks: 3", "Opening: \\Temp\\a.bin (1300)",
                                 "Establishing session with 10.0.0.2",
                                 "Server not responding to RRQ", kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  EndWaiting();
}

TEST_F(TransferTest, BeginsAnewWhenTheRequestCannotBeSent) {
  Start();
  device().faults().Add({"sendto", 2});  // the first is the status

  ToPublic(Announcement({}));

  const Lines lines = Log();
  ASSERT_GE(lines.size(), 2U);
  EXPECT_EQ(lines[lines.size() - 2], "Establishing session with 10.0.0.2");
  EXPECT_EQ(lines.back(), kWaiting);
  ToPublic(Announcement({}));
  EXPECT_THAT(Frames(), ElementsAre(ToHex(Request({})))) << "the name is forgotten";
  EndWaiting();
}

TEST_F(TransferTest, AsksAgainWhenAnotherFileIsAnnouncedMeanwhile) {
  Start();
  ToPublic(Announcement({}));
  Forget();
  Offer other;
  other.name = "\\Temp\\b.bin";

  ToPublic(Announcement(other));

  EXPECT_THAT(Log(), ElementsAre("Establishing session with 10.0.0.2", "RRQ Retry: 1",
                                 "RRQ sent to 10.0.0.2"));
  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))}) << "for the first file";
  EndWaiting();
}

TEST_F(TransferTest, BeginsAnewForAnythingButAnOackWhileItWaitsForOne) {
  Start();
  for (const std::string& frame :
       {kErrorFrame, kUnknownFrame, Data(1, 512), Ack(1), Nak(1), Request({})}) {
    ToPublic(Announcement({}));
    Forget();
    ToClient(frame);
    EXPECT_THAT(Log(), ElementsAre(kWaiting)) << ToHex(frame.substr(0, 2));
    EXPECT_THAT(Frames(), IsEmpty());
  }
  EndWaiting();
}

TEST_F(TransferTest, WaitsForAnOackForEverWhenTheServerSaysZero) {
  Start();
  Offer offer;
  offer.oack_wait_ms = 0;
  ToPublic(Announcement(offer));
  Forget();

  Wait(std::chrono::hours(100));
  EXPECT_THAT(Log(), IsEmpty());

  ToClient(kErrorFrame);
  EndWaiting();
}

// ---- the private group ----

TEST_F(TransferTest, BeginsAnewWhenTheGroupCannotBeJoined) {
  Start();
  ToPublic(Announcement({}));
  Forget();

  ToClient(Hex("00 70 00 00 1b 58 0a 00 00 09"));  // 10.0.0.9 is no group

  EXPECT_THAT(Log(), ElementsAre("Session established to receive file on:", "10.0.0.9   port: 7000",
                                 "Failed to join private multicast group: 10.0.0.9", kWaiting));
  EndWaiting();
}

TEST_F(TransferTest, ReceivesFromAGroupWithAPortOfItsOwn) {
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

TEST_F(TransferTest, ServesBothSocketsInTurn) {
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

TEST_F(TransferTest, BeginsAnewWhenThereIsNoSocketForTheGroupsPort) {
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

TEST_F(TransferTest, StaysInTheGroupFromFileToFile) {
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

TEST_F(TransferTest, LeavesTheGroupOfTheFileBeforeForAnother) {
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

TEST_F(TransferTest, StaysInThePublicGroupWhenThatIsThePrivateOne) {
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

TEST_F(TransferTest, TakesTheGroupFromTheFirstOackOfASessionOnly) {
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

TEST_F(TransferTest, NeverAnswersTheFirstOackWhateverRoleItGives) {
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

TEST_F(TransferTest, AnswersAnElectionInTheMiddleOfAFileWithBlockZero) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  ToClient(kOackAck);

  EXPECT_THAT(Log(), ElementsAre("Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  EndWaiting();
}

TEST_F(TransferTest, MarksTheAnswerToAnElectionBehindADuplicateAsOne) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(1, 512));
  Forget();

  ToClient(kOackAck);

  EXPECT_EQ(Frames(), Lines{"01 40 00 00 00 00"});
  EndWaiting();
}

TEST_F(TransferTest, KeepsItsRoleWhenAnOackNamesNone) {
  Start();
  EstablishAsMaster();

  ToClient(Hex("00 7c 00 00 1b 58 ef 01 01 02"));

  EXPECT_THAT(Log(), ElementsAre("Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  EndWaiting();
}

TEST_F(TransferTest, KeepsItsRoleForTheNextFile) {
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

TEST_F(TransferTest, CompletesAFileWithGapsWhenItAcknowledgesTheLastBlock) {
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

TEST_F(TransferTest, ShowsWhatItMissesWhenABlockComesFromBehindIt) {
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

TEST_F(TransferTest, NaksTheLastBlockOnceAFile) {
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

TEST_F(TransferTest, BeginsAnewWhenAnAnswerCannotBeSent) {
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

// ---- blocks ----

TEST_F(TransferTest, CountsABlockWithoutDataAsWritten) {
  Start();
  EstablishAsMaster();

  ToPrivate(Data(1, 0));

  EXPECT_THAT(Log(), ElementsAre("WARNING: Data length = 0"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre("Duplicate frame received, block #1"));
  EndWaiting();
}

TEST_F(TransferTest, SaysOnceThatABlockCannotBeWrittenAndBeginsAnew) {
  Start();
  EstablishAsMaster();
  device().faults().Add({"WriteFile", 1, 1, ERROR_ACCESS_DENIED});

  ToPrivate(Data(1, 512));

  EXPECT_THAT(Log(), ElementsAre("Failed to write block #1", kWaiting));
  EXPECT_EQ(Frames(), Lines{ToHex(Hex("00 60 00 00 00 03") + "Disk full or allocation exceeded" +
                                  std::string(1, '\0'))});

  EstablishAsMaster();
  device().faults().Add({"SetFilePointer"});
  ToPrivate(Data(2, 512));
  EXPECT_THAT(Log(), ElementsAre("WriteBlockToFile - SetFilePointer call failed",
                                 "Failed to write block #2", kWaiting));
  EXPECT_EQ(Frames().size(), 1U);
  EndWaiting();
}

TEST_F(TransferTest, DropsBlocksThatCannotBelongToTheFile) {
  Start();
  EstablishAsMaster();

  ToPrivate(Data(0, 512));
  ToPrivate(Data(4, 512));
  ToPrivate(Data(65535, 512));
  ToPrivate(Data(1, 513));
  ToPrivate(Hex("00 30 02 00 00 01") + std::string(511, 'x'));  // says 512
  ToPrivate(Hex("00 30 00 00 00"));

  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_THAT(Log(), IsEmpty());
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  EndWaiting();
}

TEST_F(TransferTest, DropsBlocksFromAnybodyButTheServer) {
  Start();
  EstablishAsMaster();
  sim::VirtualPort stranger(world(), {0x0A000009, 7001}, nullptr);
  sim::VirtualPort other_port(world(), {test::kServerAddress, 9999}, nullptr);

  stranger.Send(test::kPrivateGroup, Data(1, 512, 'x'));
  Wait(milliseconds(1));
  EXPECT_THAT(Frames(), IsEmpty());

  other_port.Send(test::kPrivateGroup, Data(1, 512));
  Wait(milliseconds(1));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))}) << "the server's address counts, not its port";
  EndWaiting();
}

TEST_F(TransferTest, AnswersWhoeverSentTheLastFrameThatWasNoBlock) {
  Start();
  EstablishAsMaster();
  Lines at_other;
  sim::VirtualPort other(world(), {0x0A000009, 5000},
                         [&](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                           at_other.push_back(ToHex(bytes));
                         });

  other.Send(test::kClient, kOackAck);
  Wait(milliseconds(1));

  EXPECT_THAT(at_other, ElementsAre(ToHex(Ack(0))));
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Frames(), IsEmpty()) << "and takes blocks from there";
  other.Send(test::kPrivateGroup, Data(1, 512));
  Wait(milliseconds(1));
  EXPECT_THAT(at_other, ElementsAre(ToHex(Ack(0)), ToHex(Ack(1))));
  EndWaiting();
}

TEST_F(TransferTest, DoesNotSendToTheEndpointThatTheAnnouncementNames) {
  Start();
  Offer offer;
  offer.address = 0x0A000009;
  offer.port = 1;
  Lines at_other;
  sim::VirtualPort other(world(), {0x0A000009, 1},
                         [&](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                           at_other.push_back(ToHex(bytes));
                         });

  ToPublic(Announcement(offer));
  EXPECT_EQ(Frames(), Lines{ToHex(Request(offer))});
  ToClient(kErrorFrame);
  offer.address = 0;
  ToPublic(Announcement(offer));
  EXPECT_EQ(Frames(), Lines{ToHex(Request(offer))});
  EXPECT_THAT(at_other, IsEmpty());
  EndWaiting();
}

TEST_F(TransferTest, BeginsAnewForAnythingThatIsNeitherBlockNorOack) {
  Start();
  Offer other;
  other.name = "\\Temp\\b.bin";
  for (const std::string& frame :
       {kErrorFrame, kUnknownFrame, Ack(1), Nak(1), Request({}), Announcement(other)}) {
    EstablishAsMaster();
    ToClient(frame);
    EXPECT_THAT(Log(), ElementsAre(kWaiting)) << ToHex(frame.substr(0, 2));
    EXPECT_THAT(Frames(), IsEmpty());
    ToClient(kOackPassive);
    Forget();
  }
  EndWaiting();
}

TEST_F(TransferTest, GivesUpAFileWhenNoFrameComes) {
  SetSetting("ReceiveTimeout", 2000);
  Start();
  Establish();

  Wait(milliseconds(1990));
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(20));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));
  EndWaiting();
}

TEST_F(TransferTest, DroppedFramesUseUpTheWait) {
  SetSetting("ReceiveTimeout", 2000);
  Start();
  Establish();

  for (int i = 0; i < 19; ++i) {
    Wait(milliseconds(95));
    ToPublic(Announcement({}));
    ToPrivate(Hex("10 30 00 00 00 01"));
  }
  Wait(milliseconds(200));

  EXPECT_THAT(Log(), Contains("Rx file timed out - transfer aborted"));
  EndWaiting();
}

TEST_F(TransferTest, EmptyDatagramsNeitherEndNorRenewTheWait) {
  SetSetting("ReceiveTimeout", 2000);
  Start();
  Establish();

  for (int i = 0; i < 3000; ++i) server().Send(test::kClient, "");
  Wait(milliseconds(1900));
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(200));
  EXPECT_THAT(Log(), Contains("Rx file timed out - transfer aborted"));
  EndWaiting();
}

TEST_F(TransferTest, EachFrameThatCountsRenewsTheWait) {
  SetSetting("ReceiveTimeout", 2000);
  Start();
  Establish();

  for (int i = 0; i < 5; ++i) {
    Wait(milliseconds(1900));
    ToClient(kOackPassive);
  }

  EXPECT_THAT(Log(), Not(Contains("Rx file timed out - transfer aborted")));
  EndWaiting();
}

// ---- completion ----

TEST_F(TransferTest, SetsTheLastWriteTimeAsItIsGiven) {
  Start();
  Offer offer;
  offer.stamp = "2004-02-29 23:59:58";
  ReceiveAllButTheLast(offer);
  ToPrivate(Data(2, 88));

  WIN32_FIND_DATAW found;
  FindClose(FindFirstFileW(TEXT("\\Temp\\a.bin"), &found));
  SYSTEMTIME time = {};
  FileTimeToSystemTime(&found.ftLastWriteTime, &time);
  EXPECT_EQ(time.wYear, 2004);
  EXPECT_EQ(time.wMonth, 2);
  EXPECT_EQ(time.wDay, 29);
  EXPECT_EQ(time.wHour, 23);
  EXPECT_EQ(time.wMinute, 59);
  EXPECT_EQ(time.wSecond, 58);
  ToPrivate(Data(2, 88));
  EndWaiting();
}

TEST_F(TransferTest, GivesAFileWithoutATimeStampThatOfTheFileBefore) {
  Start();
  Offer offer;
  offer.stamp = "";
  ReceiveAllButTheLast(offer);
  ToPrivate(Data(2, 88));
  EXPECT_THAT(Log(), Contains("Failed to update timestamp")) << "there was none before";
  ToPrivate(Data(2, 88));

  offer.stamp = "2004-02-29 23:59:58";
  offer.name = "\\Temp\\b.bin";
  ReceiveAllButTheLast(offer);
  ToPrivate(Data(2, 88));
  ToPrivate(Data(2, 88));
  offer.stamp = "";
  offer.name = "\\Temp\\c.bin";
  ReceiveAllButTheLast(offer);
  ToPrivate(Data(2, 88));

  EXPECT_THAT(Log(), Contains("Timestamp updated"));
  WIN32_FIND_DATAW found;
  FindClose(FindFirstFileW(TEXT("\\Temp\\c.bin"), &found));
  SYSTEMTIME time = {};
  FileTimeToSystemTime(&found.ftLastWriteTime, &time);
  EXPECT_EQ(time.wYear, 2004);
  ToPrivate(Data(2, 88));
  EndWaiting();
}

TEST_F(TransferTest, SaysWhatOfTheCompletionFailed) {
  Start();
  Offer offer;
  offer.stamp = "2006-13-01 00:00:00";
  ReceiveAllButTheLast(offer);
  device().faults().Add({"SetFileAttributesW"});
  ToPrivate(Data(2, 88));
  EXPECT_THAT(
      Log(), ElementsAre("Last block received: 2 (88 bytes)", "File transfer complete (600 bytes).",
                         "1 files received (600 total bytes)", "0 file size mismatches",
                         "Failed to update timestamp", "Failed to update attributes",
                         "File closed: \\Temp\\a.bin", "Dallying..."));
  ToPrivate(Data(2, 88));

  ReceiveAllButTheLast();
  device().faults().Clear();
  device().faults().Add({"CloseHandle"});
  ToPrivate(Data(2, 88));
  EXPECT_THAT(
      Log(), ElementsAre("Last block received: 2 (88 bytes)", "File transfer complete (600 bytes).",
                         "2 files received (1200 total bytes)", "0 file size mismatches",
                         "Timestamp updated", "Failed to close: \\Temp\\a.bin", "Dallying..."));
  device().faults().Clear();
  ToPrivate(Data(2, 88));
  EndWaiting();
}

TEST_F(TransferTest, CountsOverAllFiles) {
  Start();
  for (const char* name : {"\\Temp\\a.bin", "\\Temp\\b.bin"}) {
    Offer offer;
    offer.name = name;
    ReceiveAllButTheLast(offer);
    ToPrivate(Data(2, 88));
    ToPrivate(Data(2, 88));
  }
  EXPECT_THAT(Log(), Contains("2 files received (1200 total bytes)"));
  EXPECT_EQ(Status().back(), "01 00 00 64 00 00 04 b0 00 00 02 58 \\Temp\\b.bin");
  EndWaiting();
}

TEST_F(TransferTest, EndsTheDallyOfAFileThatIsNotTheLastForAnyFrame) {
  Start();
  Offer other;
  other.name = "\\Temp\\b.bin";
  for (const std::string& frame : {kErrorFrame, kUnknownFrame, Ack(1), Announcement({}),
                                   Announcement(other), kOackPassive, Data(1, 512)}) {
    ReceiveAllButTheLast();
    ToPrivate(Data(2, 88));
    Forget();
    ToClient(frame);
    EXPECT_EQ(Log().back(), kWaiting) << ToHex(frame.substr(0, 2));
    EXPECT_THAT(Frames(), IsEmpty());
  }
  EndWaiting();
}

TEST_F(TransferTest, EndsTheDallyOfTheLastFileAndItselfForAnyFrame) {
  Offer other;
  other.name = "\\Temp\\b.bin";
  for (const std::string& frame : {kErrorFrame, kUnknownFrame, Ack(1), Announcement({}),
                                   Announcement(other), kOackPassive, Data(1, 512)}) {
    Start();
    Offer offer;
    offer.header = "00 21";
    ReceiveAllButTheLast(offer);
    ToPrivate(Data(2, 88));
    Forget();
    ToClient(frame);
    EXPECT_THAT(Log(), Contains("Client shutting down...")) << ToHex(frame.substr(0, 2));
    EXPECT_THAT(Frames(), IsEmpty());
    EXPECT_EQ(End(), 0);
  }
}

TEST_F(TransferTest, DalliesAsLongAsItIsSet) {
  SetSetting("DallyTimeout", 100);
  Start();
  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  Forget();

  Wait(milliseconds(98));
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(3));
  EXPECT_THAT(Log(), ElementsAre("Dally timeout expired", kWaiting));
  EndWaiting();
}

// ---- waiting for a file ----

TEST_F(TransferTest, AnswersForNoFileAsIfItHadHadNone) {
  Start();

  ToClient(kOackAck);
  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: TRUE (ACKing)",
                                 "Resending ACK for block number 0 (last)"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  ToClient(kOackNak);
  EXPECT_THAT(Log(), Contains("Resending NAK for block number 0 (last)"));
  EXPECT_THAT(Frames(), IsEmpty()) << "that block counts as named already";
  EndWaiting();
}

TEST_F(TransferTest, EveryFrameThatCountsRenewsTheWaitForAnAnnouncement) {
  Start();
  Wait(milliseconds(299000));
  ToClient(kErrorFrame);
  Wait(milliseconds(299000));
  ToClient(kOackPassive);
  Wait(milliseconds(299000));
  EXPECT_FALSE(has_ended());
  EXPECT_THAT(Log(), IsEmpty());
  EndWaiting();
}

TEST_F(TransferTest, AcceptsEveryFileWithoutAnMct) {
  Start();
  Offer offer;
  offer.masks = "XX*";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(),
              ElementsAre("Announcement on 239.1.1.1 for:", "\\Temp\\a.bin", "MCT mask(s): XX*",
                          "Data blocks: 3", "Opening: \\Temp\\a.bin (1300)",
                          "Establishing session with 10.0.0.2", "RRQ sent to 10.0.0.2"));
  EndWaiting();
}

TEST_F(TransferTest, ListsTheMasksUpToTheFirstThatMatches) {
  Start(std::string(test::kOptions) + " -HV=MR41");
  Offer offer;
  offer.masks = " XX*;;MR?? YY";

  ToPublic(Announcement(offer));

  const Lines lines = Log();
  EXPECT_THAT(Lines(lines.begin(), lines.begin() + 5),
              ElementsAre("Device MCT: MR41", "MCT mask(s) in Announcement:  XX*;;MR?? YY",
                          "MCT mask in Announcement: XX*", "MCT mask in Announcement: MR??",
                          "MCT and mask compare, receiving file"));
  EndWaiting();
}

TEST_F(TransferTest, RejectsAFileWithAListOfSeparatorsOnly) {
  Start(std::string(test::kOptions) + " -HV=MR41");
  Offer offer;
  offer.masks = " ; ";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(), Contains("MCT and mask did NOT compare, NOT receiving file"));
  EndWaiting();
}

TEST_F(TransferTest, TellsNamesApartByTheirLetters) {
  Start();
  ToPublic(Announcement({}));
  Forget();
  Offer other;
  other.name = "\\Temp\\A.bin";

  ToPublic(Announcement(other));

  EXPECT_THAT(Log(), Contains("RRQ Retry: 1")) << "another file, which interrupts";
  EndWaiting();
}

// ---- overrun ----

TEST_F(TransferTest, SendsAnOverrunReportAsOftenAsItIsSet) {
  SetSetting("OverrunErrorMessages", 3);
  SetSetting("RxBlocksBeforeOverrun", 1);
  Start();
  Offer offer;
  offer.size = 5120;
  Establish(offer);

  ToPrivate(Data(4, 512));

  EXPECT_EQ(Frames(),
            Lines(3, ToHex(Hex("00 60 00 00 00 40") + "Overrun:2500:4" + std::string(1, '\0'))));
  EXPECT_THAT(Log(), ElementsAre("<< OVERRUN ERROR: 25.00 at 4"));
  EndWaiting();
}

TEST_F(TransferTest, AMasterDoesNotReportOverrun) {
  SetSetting("RxBlocksBeforeOverrun", 1);
  Start();
  Offer offer;
  offer.size = 5120;
  EstablishAsMaster(offer);

  ToPrivate(Data(4, 512));

  EXPECT_EQ(Frames(), Lines{ToHex(Ack(4))});
  EndWaiting();
}

// ---- progress ----

TEST_F(TransferTest, ReportsOnlyTheEndWithoutSteps) {
  Start();
  Offer offer;
  offer.step_percent = 0;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 512));
  EXPECT_THAT(Status(), IsEmpty());
  ToPrivate(Data(3, 276));
  EXPECT_THAT(Status(), ElementsAre("01 00 00 64 00 00 05 14 00 00 05 14 \\Temp\\a.bin"));
  ToPrivate(Data(3, 276));
  EndWaiting();
}

TEST_F(TransferTest, ReportsByPercentagePoints) {
  Start();
  Offer offer;
  offer.block_size = 10;
  offer.size = 1000;
  offer.step_percent = 25;
  EstablishAsMaster(offer);
  Lines status;
  for (unsigned block = 1; block <= 100; ++block) {
    ToPrivate(Data(block, 10));
    for (const std::string& line : Status()) status.push_back(line.substr(6, 5));
  }
  EXPECT_THAT(status, ElementsAre("00 19", "00 32", "00 4b", "00 64"));
  ToPrivate(Data(3, 10));
  EndWaiting();
}

TEST_F(TransferTest, ReportsByKib) {
  Start();
  Offer offer;
  offer.block_size = 512;
  offer.size = 512 * 100;
  offer.step_percent = 0;
  offer.step_kib = 2;
  EstablishAsMaster(offer);
  Lines status;
  for (unsigned block = 1; block <= 12; ++block) {
    ToPrivate(Data(block, 512));
    for (const std::string& line : Status()) status.push_back(line.substr(6, 5));
  }
  EXPECT_THAT(status, ElementsAre("00 05", "00 0a")) << "more than 2,048 bytes: five blocks";
  EndWaiting();
}

TEST_F(TransferTest, BeginsEachFileAtZeroPercent) {
  Start();
  for (const char* name : {"\\Temp\\a.bin", "\\Temp\\b.bin"}) {
    Offer offer;
    offer.name = name;
    offer.step_percent = 80;
    ReceiveAllButTheLast(offer);  // 85 percent
    ToPrivate(Data(2, 88));
    ToPrivate(Data(2, 88));
    EXPECT_EQ(Status().size(), 1U);
  }
  EndWaiting();
}

}  // namespace
