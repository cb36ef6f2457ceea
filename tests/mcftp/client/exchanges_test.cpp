// The worked exchanges of the protocol from the client's side: every frame and every log line.
// Server 10.0.0.2:7001, public group 239.1.1.1:7000, private group 239.1.1.2:7000, block size 512.
#include "mcftp/client/client_test.h"

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
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class ExchangeTest : public MulticastTest {
 protected:
  Lines Sent(const std::string& frame) { return {ToHex(frame)}; }
};

TEST_F(ExchangeTest, OneClientAcknowledgesAFileThatIsTheLast) {
  Start();
  Offer offer;
  offer.header = "00 21";
  EXPECT_EQ(
      ToHex(Announcement(offer)),
      "00 21 00 00 02 00 00 00 05 14 00 00 03 e8 00 00 00 20 00 00 00 11 "
      "32 30 30 36 2d 30 33 2d 30 31 20 31 34 3a 30 35 3a 30 39 00 1b 59 0a 00 00 02 05 00 00 "
      "5c 54 65 6d 70 5c 61 2e 62 69 6e 00 00");

  ToPublic(Announcement(offer));
  EXPECT_THAT(Log(),
              ElementsAre("Last file flag set", "Announcement on 239.1.1.1 for:", "\\Temp\\a.bin",
                          "MCT mask(s): ", "Data blocks: 3", "Opening: \\Temp\\a.bin (1300)",
                          "Establishing session with 10.0.0.2", "RRQ sent to 10.0.0.2"));
  EXPECT_THAT(Status(), ElementsAre("01 00 00 00 00 00 00 00 00 00 05 14 \\Temp\\a.bin"));
  EXPECT_EQ(Frames(),
            Lines{"00 11 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 11 "
                  "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 "
                  "00 00 00 5c 54 65 6d 70 5c 61 2e 62 69 6e 00"});

  ToClient(kOackPassive);
  EXPECT_THAT(Log(),
              ElementsAre("Session established to receive file on:", "239.1.1.2   port: 7000",
                          "Private multicast group joined: 239.1.1.2"));
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(kOackAck);
  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: TRUE (ACKing)",
                                 "Client elected initial master client (ACK mode)"));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 00"});

  ToPrivate(Data(1, 512));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 01"});
  EXPECT_THAT(Status(), ElementsAre("01 00 00 27 00 00 02 00 00 00 05 14 \\Temp\\a.bin"));
  ToPrivate(Data(2, 512));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 02"});
  EXPECT_THAT(Status(), ElementsAre("01 00 00 4e 00 00 04 00 00 00 05 14 \\Temp\\a.bin"));
  EXPECT_THAT(Log(), IsEmpty());

  ToPrivate(Data(3, 276));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 03"});
  EXPECT_THAT(Status(), ElementsAre("01 00 00 64 00 00 05 14 00 00 05 14 \\Temp\\a.bin"));
  EXPECT_THAT(Log(), ElementsAre("Last block received: 3 (276 bytes)",
                                 "File transfer complete (1300 bytes).",
                                 "1 files received (1300 total bytes)", "0 file size mismatches",
                                 "Timestamp updated", "Attributes updated",
                                 "File closed: \\Temp\\a.bin", "Dallying..."));

  Wait(milliseconds(4990));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_EQ(End(), 0);
  EXPECT_THAT(Log(),
              ElementsAre("Dally timeout expired", "Leaving multicast group: 239.1.1.2",
                          "Client shutting down...", "McftpClient::StateMachineThread stopping"));
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"),
            std::string(512, 'A') + std::string(512, 'B') + std::string(276, 'C'));
  EXPECT_EQ(test::AttributesOf("\\Temp\\a.bin"), 32U);
  EXPECT_EQ(stops(), 1);
}

TEST_F(ExchangeTest, ALostAcknowledgementIsSentAgainWithTheDuplicateMark) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 512));
  Forget();

  ToPrivate(Data(2, 512, 'x'));

  EXPECT_THAT(Log(), ElementsAre("Duplicate frame received, block #2"));
  EXPECT_EQ(Frames(), Lines{"01 40 00 00 00 02"});
  ToPrivate(Data(3, 276));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 03"}) << "the mark is gone";
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"),
            std::string(512, 'A') + std::string(512, 'B') + std::string(276, 'C'))
      << "the duplicate was not written";
  ToPrivate(Data(1, 512));  // ends the dally
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

/// The second of three clients: passive, loses blocks, and is repaired by NAKs.
TEST_F(ExchangeTest, AClientThatLostBlocksNamesThemOneByOne) {
  Start(std::string(test::kOptions) + " -HV=TQ52");
  Offer offer;
  offer.size = 2500;
  offer.id = 0x12;
  offer.masks = "TQ5*";
  ToPublic(Announcement(offer));
  EXPECT_THAT(Log(),
              ElementsAre("Device MCT: TQ52", "MCT mask(s) in Announcement: TQ5*",
                          "MCT mask in Announcement: TQ5*", "MCT and mask compare, receiving file",
                          "Announcement on 239.1.1.1 for:", "\\Temp\\a.bin", "MCT mask(s): TQ5*",
                          "Data blocks: 5", "Opening: \\Temp\\a.bin (2500)",
                          "Establishing session with 10.0.0.2", "RRQ sent to 10.0.0.2"));
  EXPECT_EQ(Frames(), Sent(Request(offer)));
  ToPublic(Announcement(offer));
  EXPECT_THAT(Log(), IsEmpty()) << "a repeat is dropped";
  ToClient(kOackPassive);
  Forget();

  ToPrivate(Data(1, 512));
  ToPrivate(Data(3, 512));
  ToPrivate(Data(5, 452));  // the second copy
  EXPECT_THAT(Log(), ElementsAre("Last block received: 5 (452 bytes)"));
  EXPECT_THAT(Frames(), IsEmpty()) << "a passive client is silent";

  ToClient(kOackNak);
  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: TRUE (NAKing)",
                                 "Client elected master client (NAK mode)", "NAKing block 2 of 5"));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 02"});
  ToPrivate(Data(2, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 4 of 5"));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 04"});
  ToPrivate(Data(4, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 5 of 5", "File transfer complete (2500 bytes).",
                                 "1 files received (2500 total bytes)", "0 file size mismatches",
                                 "Timestamp updated", "Attributes updated",
                                 "File closed: \\Temp\\a.bin", "Dallying..."));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 05"});

  // The NAK that ended the file was lost.
  ToClient(kOackNak);
  EXPECT_THAT(Log(), ElementsAre("Resending ACK for block number 5 (last)"));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 05"});
  Wait(milliseconds(5000));
  EXPECT_THAT(Log(), ElementsAre("Dally timeout expired", kWaiting));
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

/// The third: passive, and has everything.
TEST_F(ExchangeTest, APassiveClientWithEverythingEndsWithANakOfTheLastBlock) {
  Start();
  Offer offer;
  offer.size = 2500;
  Establish(offer);
  for (unsigned block = 1; block <= 4; ++block) ToPrivate(Data(block, 512));
  ToPrivate(Data(5, 452));
  ToPrivate(Data(5, 452));
  EXPECT_THAT(
      Log(), ElementsAre("Last block received: 5 (452 bytes)", "Last block received: 5 (452 bytes)",
                         "Duplicate frame received, block #5"));
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(kOackNak);

  EXPECT_THAT(
      Log(),
      ElementsAre("OACK Received", "Change in Master Client status", "Master Client: TRUE (NAKing)",
                  "Client elected master client (NAK mode)", "NAKing block 5 of 5",
                  "File transfer complete (2500 bytes).", "1 files received (2500 total bytes)",
                  "0 file size mismatches", "Timestamp updated", "Attributes updated",
                  "File closed: \\Temp\\a.bin", "Dallying..."));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 05"});
  ToPrivate(Data(1, 512));
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

/// Why a server repeats the last block before it polls: the NAK of the last block ends the file.
TEST_F(ExchangeTest, AFileWithoutItsLastBlockCompletesWithTheWrongSize) {
  Start();
  Offer offer;
  offer.size = 2500;
  Establish(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(3, 512));
  ToClient(kOackNak);
  ToPrivate(Data(2, 512));
  Forget();

  ToPrivate(Data(4, 512));

  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 05"});
  EXPECT_THAT(
      Log(),
      ElementsAre("NAKing block 5 of 5", "Rx size mismatch (Tx size: 2500, Rx bytes: 2048)",
                  "File transfer complete (2048 bytes).", "0 files received (2048 total bytes)",
                  "1 file size mismatches", "Timestamp updated", "Attributes updated",
                  "File closed: \\Temp\\a.bin", "Dallying..."));
  ToPrivate(Data(1, 512));
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, APassiveClientReportsOverrunAndIsRepaired) {
  Start();
  Offer offer;
  offer.size = 102400;
  offer.step_percent = 0;
  Establish(offer);
  for (unsigned block = 1; block <= 80; ++block) ToPrivate(Data(block, 512));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_THAT(Frames(), IsEmpty());

  ToPrivate(Data(120, 512));
  EXPECT_THAT(Log(), ElementsAre("<< OVERRUN ERROR: 67.50 at 120"));
  EXPECT_EQ(Frames(),
            Lines{"00 60 00 00 00 40 4f 76 65 72 72 75 6e 3a 36 37 35 30 3a 31 32 30 00"});
  ToPrivate(Data(121, 512));
  EXPECT_THAT(Frames(), IsEmpty());

  ToClient(kOackNak);
  EXPECT_THAT(
      Log(),
      ElementsAre("OACK Received", "Change in Master Client status", "Master Client: TRUE (NAKing)",
                  "Client elected master client (NAK mode)", "NAKing block 81 of 200"));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 51"});
  for (unsigned block = 81; block <= 118; ++block) {
    ToPrivate(Data(block, 512));
    EXPECT_EQ(Frames(), Sent(Nak(block + 1)));
  }
  Forget();
  ToPrivate(Data(119, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 122 of 200", "Transitioning from NAK to ACK mode"));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 7a"});
  for (unsigned block = 122; block <= 200; ++block) {
    ToPrivate(Data(block, 512));
    EXPECT_EQ(Frames(), Sent(Ack(block)));
  }
  Forget();
  ToPrivate(Data(200, 512));  // ends the dally
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin").value_or("").size(), 102400U);
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

/// The master from which the role is taken while another client is repaired.
TEST_F(ExchangeTest, AMasterThatIsMadePassiveStaysSilentUntilItIsPolled) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  Forget();

  ToClient(kOackPassive);
  EXPECT_THAT(Log(),
              ElementsAre("OACK Received", "Change in Master Client status",
                          "Master Client: FALSE (Passive)", "Client transitioned to passive mode"));
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre("Duplicate frame received, block #1"));
  ToPrivate(Data(2, 512));
  ToPrivate(Data(3, 276));
  EXPECT_THAT(Frames(), IsEmpty());
  ToClient(kOackNak);
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 03"});
  ToPrivate(Data(1, 512));
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, AnEmptyLastFileEndsTheClient) {
  Start();
  Offer offer;
  offer.header = "00 21";
  offer.size = 0;
  offer.id = 0x14;
  offer.name = "\\Temp\\e.bin";
  McastLog();

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(),
              ElementsAre("Last file flag set", "Announcement on 239.1.1.1 for:", "\\Temp\\e.bin",
                          "MCT mask(s): ", "Data blocks: 0", "Opening: \\Temp\\e.bin (0)",
                          "Establishing session with 10.0.0.2", "RRQ sent to 10.0.0.2",
                          "Zero length file announced: \\Temp\\e.bin",
                          "Last file flag is set, shutting down state machine",
                          "Client shutting down...", "McftpClient::StateMachineThread stopping"));
  EXPECT_THAT(McastLog(), ElementsAre("Last file flag is set, shutting down state machine"));
  EXPECT_THAT(Status(), ElementsAre("01 00 00 00 00 00 00 00 00 00 00 00 \\Temp\\e.bin",
                                    "01 00 00 64 00 00 00 00 00 00 00 01 \\Temp\\e.bin"));
  EXPECT_EQ(Frames(), Sent(Request(offer)));
  EXPECT_EQ(End(), 0);
  EXPECT_EQ(test::GetFile("\\Temp\\e.bin"), "");
}

TEST_F(ExchangeTest, AnEmptyFileThatIsNotTheLastIsAskedForAndForgotten) {
  Start();
  Offer offer;
  offer.size = 0;
  offer.name = "\\Temp\\e.bin";

  ToPublic(Announcement(offer));

  const Lines accepted = Log();
  EXPECT_THAT(accepted, ElementsAre("Announcement on 239.1.1.1 for:", "\\Temp\\e.bin",
                                    "MCT mask(s): ", "Data blocks: 0", "Opening: \\Temp\\e.bin (0)",
                                    "Establishing session with 10.0.0.2", "RRQ sent to 10.0.0.2",
                                    "Zero length file announced: \\Temp\\e.bin", kWaiting));
  EXPECT_EQ(Frames(), Sent(Request(offer)));
  ToPublic(Announcement(offer));
  EXPECT_EQ(Log(), accepted) << "its name was forgotten";
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, AFileForOtherDevicesIsNotAskedFor) {
  Start(std::string(test::kOptions) + " -HV=MR41");
  Offer offer;
  offer.masks = "TQ5* MV??";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(), ElementsAre("Device MCT: MR41", "MCT mask(s) in Announcement: TQ5* MV??",
                                 "MCT mask in Announcement: TQ5*", "MCT mask in Announcement: MV??",
                                 "MCT and mask did NOT compare, NOT receiving file", kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_THAT(Status(), IsEmpty());
  EXPECT_FALSE(test::Exists("\\Temp\\a.bin"));

  offer.header = "00 21";
  ToPublic(Announcement(offer));
  EXPECT_THAT(
      Log(), ElementsAre("Last file flag set", "Device MCT: MR41",
                         "MCT mask(s) in Announcement: TQ5* MV??", "MCT mask in Announcement: TQ5*",
                         "MCT mask in Announcement: MV??",
                         "MCT and mask did NOT compare, NOT receiving file",
                         "Client shutting down...", "McftpClient::StateMachineThread stopping"));
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, ALostOackIsAskedForAgain) {
  Start();
  Offer offer;
  offer.id = 0x18;
  ToPublic(Announcement(offer));
  Forget();

  Wait(milliseconds(998));
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(2));
  EXPECT_THAT(Log(), ElementsAre("Timeout waiting for Option Ack, retrying...",
                                 "Establishing session with 10.0.0.2", "RRQ Retry: 1",
                                 "RRQ sent to 10.0.0.2"));
  EXPECT_EQ(Frames(), Sent(Request(offer)));
  ToClient(kOackPassive);
  EXPECT_THAT(Log(),
              ElementsAre("Session established to receive file on:", "239.1.1.2   port: 7000",
                          "Private multicast group joined: 239.1.1.2"));

  // The first OACK, late.
  ToClient(kOackPassive);
  EXPECT_THAT(Log(), ElementsAre("Client transitioned to passive mode"));
  EXPECT_THAT(Frames(), IsEmpty());
  Wait(milliseconds(32000));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));
  Wait(milliseconds(300000));
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, AServerThatIsGoneIsAskedEightTimesAndItsFileNotHeardOfAgain) {
  Start();
  const Offer offer;
  const milliseconds begin = Now();
  ToPublic(Announcement(offer));
  Log();
  Lines expected;
  for (int retry = 1; retry <= 7; ++retry) {
    Wait(milliseconds(1000));
    expected = {"Timeout waiting for Option Ack, retrying...", "Establishing session with 10.0.0.2",
                "RRQ Retry: " + std::to_string(retry), "RRQ sent to 10.0.0.2"};
    EXPECT_EQ(Log(), expected);
  }
  EXPECT_EQ(Frames(), Lines(8, ToHex(Request(offer))));
  Wait(milliseconds(1000));
  EXPECT_THAT(Log(), ElementsAre("Timeout waiting for Option Ack, retrying...",
                                 "Establishing session with 10.0.0.2",
                                 "Server not responding to RRQ", kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());

  ToPublic(Announcement(offer));
  EXPECT_THAT(Log(), IsEmpty()) << "there was no reset: the name is still known";

  EXPECT_EQ(End(), 0);
  EXPECT_THAT(Log(), ElementsAre("WRQ Timeout", "Client shutting down...",
                                 "McftpClient::StateMachineThread stopping"));
  EXPECT_NEAR(static_cast<double>((Now() - begin).count()), 8000 + 300000, 260)
      << "the repeat has used up the wait like any dropped frame";
}

TEST_F(ExchangeTest, ARequestThatComesTooLateIsAnsweredWithAnError) {
  Start();
  ToPublic(Announcement({}));
  Forget();

  ToClient(Hex("00 60 00 00 00 05 55 6e 6b 6e 6f 77 6e 20 74 72 61 6e 73 66 65 72 20 49 44 00"));

  EXPECT_THAT(Log(), ElementsAre(kWaiting));
  ToPublic(Announcement({}));
  EXPECT_EQ(Frames(), Sent(Request({}))) << "the reset has forgotten the name";
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, ALostLastAcknowledgementIsRepeatedInTheDally) {
  Start();
  Offer offer;
  offer.header = "00 21";
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  EXPECT_EQ(Frames(), (Lines{"00 40 00 00 00 01", "00 40 00 00 00 02"}));
  Forget();

  Wait(milliseconds(4000));
  ToClient(kOackAck);
  EXPECT_THAT(Log(), ElementsAre("Resending ACK for block number 2 (last)"));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 02"});
  Wait(milliseconds(4990));
  EXPECT_THAT(Log(), IsEmpty()) << "the dally has begun anew";

  EXPECT_EQ(End(), 0);
  EXPECT_THAT(Log(),
              ElementsAre("Dally timeout expired", "Leaving multicast group: 239.1.1.2",
                          "Client shutting down...", "McftpClient::StateMachineThread stopping"));
}

TEST_F(ExchangeTest, TheLastBlockOnceMoreEndsTheDallyWithoutAnAnswer) {
  Start();
  Offer offer;
  offer.header = "00 21";
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  Forget();

  ToPrivate(Data(2, 88));

  EXPECT_THAT(Log(),
              ElementsAre("Last block received: 2 (88 bytes)", "Leaving multicast group: 239.1.1.2",
                          "Client shutting down...", "McftpClient::StateMachineThread stopping"));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, AnswersForTheFileBeforeWhileItWaitsForTheNext) {
  Start();
  Offer offer;
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  Wait(milliseconds(5000));
  Forget();

  ToClient(kOackAck);
  EXPECT_THAT(Log(), ElementsAre("Resending ACK for block number 2 (last)"));
  EXPECT_EQ(Frames(), Lines{"00 40 00 00 00 02"});
  ToClient(kOackNak);
  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: TRUE (NAKing)",
                                 "Resending NAK for block number 2 (last)", "NAKing block 2 of 2"));
  EXPECT_EQ(Frames(), Lines{"00 50 00 00 00 02"});
  ToClient(kOackPassive);
  EXPECT_THAT(Log(), ElementsAre("OACK Received", "Change in Master Client status",
                                 "Master Client: FALSE (Passive)"));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_EQ(End(), 0);
}

TEST_F(ExchangeTest, TheNextFileBeginsWithTheSecondCopyOfItsAnnouncement) {
  Start();
  Offer offer;
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  Forget();
  Offer next;
  next.name = "\\Temp\\b.bin";

  ToPublic(Announcement(next));
  EXPECT_THAT(Log(), ElementsAre(kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  ToPublic(Announcement(next));
  EXPECT_EQ(Frames(), Sent(Request(next)));
  EXPECT_EQ(End(), 0);
}

}  // namespace
