// One run of a client through every cell of its state table that can be reached: how it gets there,
// and the line by which the cell's action makes itself known.
#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kErrorFrame;
using test::kOackAck;
using test::kOackPassive;
using test::kUnknownFrame;
using test::kWaiting;
using test::Offer;
using ::testing::Contains;
using ::testing::ElementsAre;

class EveryCellTest : public test::TransferTest {
 protected:
  /// A reset makes no line of its own, but then the name is forgotten: the same file is taken
  /// again.
  void ExpectReset(const char* cell) {
    EXPECT_EQ(Log().back(), kWaiting) << cell;
    ToPublic(Announcement({}));
    EXPECT_EQ(Log().back(), "RRQ sent to 10.0.0.2") << cell;
  }
  void Join() { ToClient(kOackPassive); }
};

TEST_F(EveryCellTest, IsEnteredInOneRun) {
  SetSetting("MaxSessionRetries", 2);
  Start(test::kOptions, true);
  EXPECT_EQ(Log().back(), kWaiting)
      << "(0,0) Reset at the start, (1,6) AwaitAnnouncement behind it";

  Offer bad;
  bad.name = "\\No\\Such\\a.bin";
  ToPublic(Announcement(bad));
  EXPECT_EQ(Log().back(), kWaiting) << "(1,11) AwaitAnnouncement behind a file that does not open";
  ToPublic(Announcement(bad));
  EXPECT_THAT(Log(), ElementsAre()) << "without a reset";

  ToPublic(Announcement({}));
  EXPECT_THAT(Log(), Contains("Establishing session with 10.0.0.2")) << "(2,2) Request";
  Wait(milliseconds(1000));
  EXPECT_THAT(Log(), Contains("RRQ Retry: 1"))
      << "(2,9) Request behind a time-out, (3,1) AwaitOack";
  Wait(milliseconds(1000));
  EXPECT_THAT(Log(), ElementsAre("Timeout waiting for Option Ack, retrying...",
                                 "Establishing session with 10.0.0.2",
                                 "Server not responding to RRQ", kWaiting))
      << "(1,10) AwaitAnnouncement behind the last retry";

  Offer other;
  other.name = "\\Temp\\b.bin";
  ToPublic(Announcement(other));
  ToPublic(Announcement({}));
  EXPECT_THAT(Log(), Contains("RRQ Retry: 1")) << "(2,2) Request, interrupted by an announcement";

  ToClient(Data(1, 512));
  ExpectReset("(0,5) DATA before the OACK");
  ToClient(kErrorFrame);
  ExpectReset("(0,4) ERROR");
  ToClient(Hex("00 70 00 00 1b 58 0a 00 00 09"));
  ExpectReset("(0,7) no group");
  ToClient(kUnknownFrame);
  ExpectReset("(0,0) anything else");

  Join();
  EXPECT_EQ(Log().back(), "Private multicast group joined: 239.1.1.2");
  ToPrivate(Data(1, 512));
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre("Duplicate frame received, block #1"))
      << "(4,3) Receive the first block, (4,5) and the next";
  ToPublic(Announcement(other));
  ExpectReset("(0,2) another announcement");
  Join();
  Wait(milliseconds(32000));
  ExpectReset("(0,9) no block in time");

  Join();
  ToClient(kOackAck);
  ToPrivate(Data(3, 276));
  EXPECT_EQ(Log().back(), "Dallying...") << "(5,8) Dally";
  ToPrivate(Data(3, 276));
  ExpectReset("(0,9) the dally is over");
  ToClient(kErrorFrame);

  Offer last;
  last.header = "00 21";
  last.size = 0;
  ToPublic(Announcement(last));
  EXPECT_THAT(Log(), Contains("Client shutting down...")) << "(6,12) Shutdown";
  EXPECT_EQ(End(), 0);
}

}  // namespace
