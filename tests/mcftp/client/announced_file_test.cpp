// From an announcement to the request: which files are taken, and what is made of them.
#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
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

using AnnouncedFileTest = test::TransferTest;

// ---- which blocks there are ----

TEST_F(AnnouncedFileTest, CountsBlocksUpwards) {
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

TEST_F(AnnouncedFileTest, MakesTheLastFolderOfThePath) {
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

TEST_F(AnnouncedFileTest, DoesNotMakeTwoFoldersAndWaitsOnWithoutAReset) {
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

TEST_F(AnnouncedFileTest, SaysWhenAFileCannotBeOpenedEvenInItsNewFolder) {
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

TEST_F(AnnouncedFileTest, MakesNoFolderOfTheRootOrOfNothing) {
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

TEST_F(AnnouncedFileTest, GivesUpAFileThatItHasNoMemoryFor) {
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

TEST_F(AnnouncedFileTest, ClosesTheFileOfASessionThatCameToNothingWithTheNextOne) {
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

TEST_F(AnnouncedFileTest, SendsNoRequestAtAllWithRetriesSetToZero) {
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

TEST_F(AnnouncedFileTest, BeginsAnewWhenTheRequestCannotBeSent) {
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

TEST_F(AnnouncedFileTest, AsksAgainWhenAnotherFileIsAnnouncedMeanwhile) {
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

TEST_F(AnnouncedFileTest, BeginsAnewForAnythingButAnOackWhileItWaitsForOne) {
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

TEST_F(AnnouncedFileTest, WaitsForAnOackForEverWhenTheServerSaysZero) {
  Start();
  Offer offer;
  offer.oack_wait_ms = 0;
  ToPublic(Announcement(offer));
  Forget();

  Wait(std::chrono::hours(5));
  EXPECT_THAT(Log(), IsEmpty());

  ToClient(kErrorFrame);
  EndWaiting();
}

// ---- waiting for a file ----

TEST_F(AnnouncedFileTest, AnswersForNoFileAsIfItHadHadNone) {
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

TEST_F(AnnouncedFileTest, EveryFrameThatCountsRenewsTheWaitForAnAnnouncement) {
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

TEST_F(AnnouncedFileTest, AcceptsEveryFileWithoutAnMct) {
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

TEST_F(AnnouncedFileTest, ListsTheMasksUpToTheFirstThatMatches) {
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

TEST_F(AnnouncedFileTest, RejectsAFileWithAListOfSeparatorsOnly) {
  Start(std::string(test::kOptions) + " -HV=MR41");
  Offer offer;
  offer.masks = " ; ";

  ToPublic(Announcement(offer));

  EXPECT_THAT(Log(), Contains("MCT and mask did NOT compare, NOT receiving file"));
  EndWaiting();
}

TEST_F(AnnouncedFileTest, TellsNamesApartByTheirLetters) {
  Start();
  ToPublic(Announcement({}));
  Forget();
  Offer other;
  other.name = "\\Temp\\A.bin";

  ToPublic(Announcement(other));

  EXPECT_THAT(Log(), Contains("RRQ Retry: 1")) << "another file, which interrupts";
  EndWaiting();
}

TEST_F(AnnouncedFileTest, ARejectedOneIsNotTheFileBefore) {
  Start(std::string(test::kOptions) + " -HV=MR41");
  Offer offer;
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  ToPrivate(Data(2, 88));
  Offer rejected;
  rejected.masks = "XX*";
  rejected.stamp = "2011-11-11 11:11:11";
  ToPublic(Announcement(rejected));
  Forget();

  ToClient(test::kOackAck);

  EXPECT_EQ(Frames(), Lines{ToHex(Ack(2))}) << "not of the 3 blocks that were offered";
  offer.name = "\\Temp\\b.bin";
  offer.stamp = "";
  ToPublic(Announcement(offer));
  ToClient(test::kOackAck);
  ToPrivate(Data(2, 88));
  WIN32_FIND_DATAW found;
  FindClose(FindFirstFileW(TEXT("\\Temp\\b.bin"), &found));
  SYSTEMTIME time = {};
  FileTimeToSystemTime(&found.ftLastWriteTime, &time);
  EXPECT_EQ(time.wYear, 2006) << "nor its time stamp";
  EndWaiting();
}

TEST_F(AnnouncedFileTest, SaysWhenTheFolderIsThereAndTheFileStillDoesNotOpen) {
  test::PutFile("\\Temp\\a.bin", "old");
  test::SetAttributesOf("\\Temp\\a.bin", FILE_ATTRIBUTE_READONLY);
  Start();

  ToPublic(Announcement({}));

  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "\\Temp\\a.bin",
                                 "MCT mask(s): ", "Data blocks: 3", "Opening: \\Temp\\a.bin (1300)",
                                 "Error creating: \\Temp\\a.bin", kWaiting));
  EndWaiting();
}

/// A server that repeats itself faster than it answers keeps nobody waiting.
TEST_F(AnnouncedFileTest, RepeatedAnnouncementsDoNotPutTheNextRequestOff) {
  Start();
  sim::VirtualPort stranger(world(), {0x0A000009, 7001},
                            [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {});
  const milliseconds begin = Now();
  ToPublic(Announcement({}));
  Forget();

  while (Now() - begin < milliseconds(960)) {
    Wait(milliseconds(95));
    ToPublic(Announcement({}));
    stranger.Send(test::kClient, Data(1, 512));
  }
  EXPECT_THAT(Log(), IsEmpty());
  Wait(milliseconds(1010) - (Now() - begin));

  EXPECT_THAT(Log(), ElementsAre("Timeout waiting for Option Ack, retrying...",
                                 "Establishing session with 10.0.0.2", "RRQ Retry: 1",
                                 "RRQ sent to 10.0.0.2"));
  EndWaiting();
}

TEST_F(AnnouncedFileTest, AnswersForTheFileBeforeEvenWhenTheyCannotBeSent) {
  Start();
  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  device().faults().Add({"sendto", 1, 0});
  ToClient(test::kOackAck);
  EXPECT_THAT(Log(), Contains("Resending ACK for block number 2 (last)")) << "in the dally";
  ToPrivate(Data(2, 88));
  Forget();
  ToClient(test::kOackAck);
  ToClient(test::kOackNak);
  EXPECT_THAT(Log(), ElementsAre("Resending ACK for block number 2 (last)", "OACK Received",
                                 "Change in Master Client status", "Master Client: TRUE (NAKing)",
                                 "Resending NAK for block number 2 (last)", "NAKing block 2 of 2"));
  EXPECT_FALSE(has_ended());
  device().faults().Clear();
  EndWaiting();
}

}  // namespace
