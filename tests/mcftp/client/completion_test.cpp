// The end of a file, and the dally behind it.
#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::kErrorFrame;
using test::kOackPassive;
using test::kUnknownFrame;
using test::kWaiting;
using test::Offer;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

using CompletionTest = test::TransferTest;

// ---- completion ----

TEST_F(CompletionTest, SetsTheLastWriteTimeAsItIsGiven) {
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

TEST_F(CompletionTest, GivesAFileWithoutATimeStampThatOfTheFileBefore) {
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

TEST_F(CompletionTest, SaysWhatOfTheCompletionFailed) {
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

TEST_F(CompletionTest, CountsOverAllFiles) {
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

TEST_F(CompletionTest, EndsTheDallyOfAFileThatIsNotTheLastForAnyFrame) {
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

TEST_F(CompletionTest, EndsTheDallyOfTheLastFileAndItselfForAnyFrame) {
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

TEST_F(CompletionTest, DalliesAsLongAsItIsSet) {
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

TEST_F(CompletionTest, TakesASizeThatCannotBeReadForAWrongOne) {
  Start();
  ReceiveAllButTheLast();
  device().faults().Add({"FlushFileBuffers"});
  device().faults().Add({"GetFileSize"});

  ToPrivate(Data(2, 88));

  EXPECT_THAT(Log(), Contains("Rx size mismatch (Tx size: 600, Rx bytes: 0)"));
  EndWaiting();
}

TEST_F(CompletionTest, NoticesALastBlockThatIsLongerThanItShouldBe) {
  Start();
  ReceiveAllButTheLast();

  ToPrivate(Data(2, 512));

  EXPECT_THAT(Log(), Contains("Rx size mismatch (Tx size: 600, Rx bytes: 1024)"));
  EXPECT_THAT(Status(), ElementsAre("01 00 00 aa 00 00 04 00 00 00 02 58 \\Temp\\a.bin"))
      << "170 percent";
  EndWaiting();
}

}  // namespace
