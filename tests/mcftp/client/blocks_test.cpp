// Blocks, from the right server and from others, and the progress they make.
#include "mcftp/client/transfer_test.h"
#include "trace/trace.h"

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
using test::kUnknownFrame;
using test::kWaiting;
using test::Nak;
using test::Offer;
using test::Request;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

using BlocksTest = test::TransferTest;

// ---- blocks ----

TEST_F(BlocksTest, CountsABlockWithoutDataAsWritten) {
  Start();
  EstablishAsMaster();

  ToPrivate(Data(1, 0));

  EXPECT_THAT(Log(), ElementsAre("WARNING: Data length = 0"));
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(1))});
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre("Duplicate frame received, block #1"));
  EndWaiting();
}

TEST_F(BlocksTest, SaysOnceThatABlockCannotBeWrittenAndBeginsAnew) {
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

TEST_F(BlocksTest, DropsBlocksThatCannotBelongToTheFile) {
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

TEST_F(BlocksTest, DropsBlocksFromAnybodyButTheServer) {
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

TEST_F(BlocksTest, AnswersWhoeverSentTheLastFrameThatWasNoBlock) {
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

TEST_F(BlocksTest, DoesNotSendToTheEndpointThatTheAnnouncementNames) {
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

TEST_F(BlocksTest, BeginsAnewForAnythingThatIsNeitherBlockNorOack) {
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

TEST_F(BlocksTest, GivesUpAFileWhenNoFrameComes) {
  SetSetting("ReceiveTimeout", 2000);
  Start();
  Establish();

  Wait(milliseconds(1990));
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(20));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));
  EndWaiting();
}

TEST_F(BlocksTest, DroppedFramesUseUpTheWait) {
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

TEST_F(BlocksTest, EmptyDatagramsNeitherEndNorRenewTheWait) {
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

TEST_F(BlocksTest, EachFrameThatCountsRenewsTheWait) {
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

// ---- overrun ----

TEST_F(BlocksTest, SendsAnOverrunReportAsOftenAsItIsSet) {
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

TEST_F(BlocksTest, AMasterDoesNotReportOverrun) {
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

TEST_F(BlocksTest, ReportsOnlyTheEndWithoutSteps) {
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

TEST_F(BlocksTest, ReportsByPercentagePoints) {
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

TEST_F(BlocksTest, ReportsByKib) {
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

TEST_F(BlocksTest, BeginsEachFileAtZeroPercent) {
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

TEST_F(BlocksTest, WritesTheLastBlockOfTheLargestFileThereIs) {
  std::vector<std::string> seeks;
  Start();
  Offer offer;
  offer.block_size = 65535;
  offer.size = 65534U * 65535U + 1;
  EstablishAsMaster(offer);
  device().trace().SetSink([&](std::string_view line) {
    if (line.find("SetFilePointer") != std::string_view::npos) seeks.emplace_back(line);
  });

  ToPrivate(Data(65535, 1));
  device().trace().SetSink({});

  ASSERT_EQ(seeks.size(), 1U);
  EXPECT_THAT(seeks[0], ::testing::HasSubstr("\"distance\":-196606")) << "4,294,770,690 as 32 bits";
  EXPECT_THAT(seeks[0], ::testing::HasSubstr("\"error\":0")) << "with the upper half";
  EndWaiting();
}

TEST_F(BlocksTest, APassiveClientWithEverythingLeavesForAnotherFileWithoutCompletingItsOwn) {
  Start();
  Offer offer;
  offer.size = 600;
  Establish(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  Forget();
  Offer other;
  other.name = "\\Temp\\b.bin";

  ToPublic(Announcement(other));

  EXPECT_THAT(Log(), ElementsAre(kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), std::string(512, 'A') + std::string(88, 'B'));
  EndWaiting();
}

TEST_F(BlocksTest, ReportsOverrunAgainAndForgetsItWhenCaughtUp) {
  SetSetting("RxBlocksBeforeOverrun", 4);
  Start();
  Offer offer;
  offer.size = 512 * 40;
  offer.step_percent = 0;
  Establish(offer);
  ToPrivate(Data(5, 512));
  ToPrivate(Data(9, 512));
  EXPECT_EQ(Frames().size(), 1U) << "not more than 4 behind the first";
  ToPrivate(Data(10, 512));
  EXPECT_THAT(Log(), ElementsAre("<< OVERRUN ERROR: 20.00 at 5", "<< OVERRUN ERROR: 30.00 at 10"));
  EXPECT_EQ(Frames().size(), 1U);

  for (const unsigned block : {1U, 2U, 3U, 4U, 6U, 7U, 8U, 11U}) ToPrivate(Data(block, 512));
  EXPECT_THAT(Log(), IsEmpty());
  ToPrivate(Data(14, 512));  // 12 of 14: caught up, and checked again only behind 10 + 4
  ToPrivate(Data(30, 512));
  EXPECT_THAT(Log(), ElementsAre("<< OVERRUN ERROR: 43.33 at 30"));
  EndWaiting();
}

TEST_F(BlocksTest, KeepsTheOverrunOnRecordWhileItIsAMaster) {
  SetSetting("RxBlocksBeforeOverrun", 1);
  Start();
  Offer offer;
  offer.size = 512 * 40;
  Establish(offer);
  ToPrivate(Data(4, 512));
  ToClient(kOackAck);
  Forget();

  for (const unsigned block : {20U, 30U}) ToPrivate(Data(block, 512));
  EXPECT_THAT(Log(), IsEmpty()) << "a master does not check";
  EXPECT_EQ(Frames(), (Lines{ToHex(Ack(20)), ToHex(Ack(30))}));
  ToClient(kOackNak);
  Forget();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 2 of 40", "NAKing block 3 of 40"));
  ToPrivate(Data(3, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 5 of 40", "Transitioning from NAK to ACK mode"));
  EndWaiting();
}

TEST_F(BlocksTest, BackInAckModeOnlyAnAcknowledgementEndsTheFile) {
  SetSetting("RxBlocksBeforeOverrun", 1);
  Start();
  Offer offer;
  offer.size = 512 * 4;
  Establish(offer);
  ToPrivate(Data(4, 512));  // reported at the last block
  ToClient(kOackNak);
  for (const unsigned block : {1U, 2U}) ToPrivate(Data(block, 512));
  Forget();

  ToPrivate(Data(3, 512));
  EXPECT_THAT(Log(), ElementsAre("NAKing block 4 of 4", "Transitioning from NAK to ACK mode"))
      << "the change comes first, and then no ACK of the last block has gone out";
  ToPrivate(Data(4, 512));
  EXPECT_THAT(Log(), Contains("File transfer complete (2048 bytes)."));
  EXPECT_EQ(Frames(), (Lines{ToHex(Nak(4)), "01 40 00 00 00 04"}));
  EndWaiting();
}

/// What is named in answer for the file before counts in the next file, when that has as many
/// blocks.
TEST_F(BlocksTest, ANakForTheFileBeforeStandsForTheNextOne) {
  Start();
  Offer offer;
  offer.size = 100;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 100));
  ToPrivate(Data(1, 100));
  ToClient(kOackNak);
  EXPECT_THAT(Log(), Contains("Resending NAK for block number 1 (last)"));
  offer.name = "\\Temp\\b.bin";
  ToPublic(Announcement(offer));
  ToClient(kOackNak);
  Forget();

  ToClient(kOackNak);

  EXPECT_THAT(Log(),
              ElementsAre("Client elected master client (NAK mode)",
                          "Rx size mismatch (Tx size: 100, Rx bytes: 0)",
                          "File transfer complete (0 bytes).", "1 files received (100 total bytes)",
                          "1 file size mismatches", "Timestamp updated", "Attributes updated",
                          "File closed: \\Temp\\b.bin", "Dallying..."));
  EXPECT_THAT(Frames(), IsEmpty());
  EndWaiting();
}

TEST_F(BlocksTest, ReportsThatCannotBeSentChangeNothing) {
  SetSetting("RxBlocksBeforeOverrun", 1);
  Start();
  Offer offer;
  offer.size = 512 * 40;
  offer.step_percent = 0;
  Establish(offer);
  device().faults().Add({"sendto"});
  ToPrivate(Data(4, 512));
  EXPECT_THAT(Log(), ElementsAre("<< OVERRUN ERROR: 25.00 at 4"));
  device().faults().Clear();
  device().faults().Add({"WriteFile", 1, 1, ERROR_ACCESS_DENIED});
  device().faults().Add({"sendto"});
  ToPrivate(Data(5, 512));
  EXPECT_THAT(Log(), ElementsAre("Failed to write block #5", kWaiting));
  EndWaiting();
}

}  // namespace
