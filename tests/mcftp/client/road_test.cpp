// The way to the server is gone for a while, or for good: the air is silent, or the device's own
// network refuses to send and to receive.
#include "mcftp/client/transfer_test.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::kDeviceAddress;
using test::kOackNak;
using test::kOackPassive;
using test::kServerAddress;
using test::kWaiting;
using test::Nak;
using test::Request;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class RoadTest : public test::TransferTest {
 protected:
  void TakeAway() {
    network().Stall(kServerAddress, kDeviceAddress);
    network().Stall(kDeviceAddress, kServerAddress);
  }
  void GiveBack() {
    network().Release(kServerAddress, kDeviceAddress);
    network().Release(kDeviceAddress, kServerAddress);
  }
  void BreakSending() { device().faults().Add({"sendto", 1, 0, WSAENETUNREACH}); }
  void BreakReceiving() {
    device().faults().Add({"select", 1, 0, WSAENETDOWN});
    device().faults().Add({"recvfrom", 1, 0, WSAENETDOWN});
  }
  void Mend() { device().faults().Clear(); }
  void ExpectWholeFile() {
    EXPECT_EQ(test::GetFile("\\Temp\\a.bin"),
              std::string(512, 'A') + std::string(512, 'B') + std::string(276, 'C'));
  }
};

TEST_F(RoadTest, AMasterCompletesTheFileWithTheGapThatItLeaves) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  TakeAway();
  ToPrivate(Data(2, 512));
  Wait(seconds(31));
  GiveBack();
  Forget();

  ToPrivate(Data(3, 276));

  EXPECT_THAT(Log(), Contains("File transfer complete (788 bytes)."))
      << "so a server holds the last block back until all others are acknowledged";
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(3))});
  EndWaiting();
}

TEST_F(RoadTest, APassiveDeviceNamesAfterTheGapWhatItMissed) {
  Start();
  Establish();
  ToPrivate(Data(1, 512));
  TakeAway();
  ToPrivate(Data(2, 512));
  Wait(seconds(31));
  GiveBack();
  ToPrivate(Data(3, 276));

  ToClient(kOackNak);
  ToPrivate(Data(2, 512));

  EXPECT_EQ(Frames(), (Lines{ToHex(Nak(2)), ToHex(Nak(3))}));
  ExpectWholeFile();
  EndWaiting();
}

TEST_F(RoadTest, WhoIsCutOffForLongerGivesTheFileUpAndTakesItAgain) {
  Start();
  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  TakeAway();
  Forget();
  Wait(seconds(33));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));
  GiveBack();

  EstablishAsMaster();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 512));
  ToPrivate(Data(3, 276));
  ExpectWholeFile();
  EndWaiting();
}

TEST_F(RoadTest, WhoIsCutOffBehindTheRequestAsksOnUntilTheWayIsBack) {
  Start();
  ToPublic(Announcement({}));
  TakeAway();
  Forget();
  Wait(milliseconds(2500));
  EXPECT_THAT(Frames(), IsEmpty());
  GiveBack();
  Wait(milliseconds(1000));

  EXPECT_EQ(Frames(), Lines{ToHex(Request({}))});
  ToClient(kOackPassive);
  EXPECT_THAT(Log(), Contains("Private multicast group joined: 239.1.1.2"));
  EndWaiting();
}

TEST_F(RoadTest, ADallyEndsByItselfWhateverIsLost) {
  Start();
  ReceiveAllButTheLast();
  TakeAway();
  server().Send(test::kPrivateGroup, Data(2, 88));
  Wait(seconds(33));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));
  GiveBack();

  ReceiveAllButTheLast();
  ToPrivate(Data(2, 88));
  TakeAway();
  Wait(milliseconds(5001));
  EXPECT_EQ(Log().back(), kWaiting);
  EndWaiting();
}

// ---- the device's own network is gone ----

TEST_F(RoadTest, AnAnswerThatIsRefusedEndsTheFileUntilItIsAnnouncedAgain) {
  Start();
  EstablishAsMaster();
  BreakSending();
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre(kWaiting));

  ToPublic(Announcement({}));
  EXPECT_EQ(Log().back(), kWaiting) << "the request cannot go out either";
  Mend();
  EstablishAsMaster();
  for (unsigned block = 1; block <= 3; ++block) ToPrivate(Data(block, block < 3 ? 512 : 276));
  ExpectWholeFile();
  EndWaiting();
}

TEST_F(RoadTest, APassiveDeviceThatCannotSendReceivesOn) {
  Start();
  Establish();
  BreakSending();
  for (unsigned block = 1; block <= 3; ++block) ToPrivate(Data(block, block < 3 ? 512 : 276));
  Mend();
  ToClient(kOackNak);

  EXPECT_EQ(Frames(), Lines{ToHex(Nak(3))});
  ExpectWholeFile();
  EndWaiting();
}

/// Whatever the client waits for, a network that fails at once must end the client and not keep it
/// asking without a pause.
TEST_F(RoadTest, ANetworkThatFailsAtOnceEndsTheClientWithoutABusyLoop) {
  for (const char* place : {"waiting", "requested", "receiving", "dallying"}) {
    Start();
    const std::string_view where = place;
    if (where == "requested") ToPublic(Announcement({}));
    if (where == "receiving") EstablishAsMaster();
    if (where == "dallying") {
      ReceiveAllButTheLast();
      ToPrivate(Data(2, 88));
    }
    BreakSending();
    BreakReceiving();
    server().Send(test::kClient, Data(1, 1));  // wakes whoever waits already
    const std::uint64_t calls = device().faults().Count("select");

    EXPECT_EQ(End(), 0) << place;

    EXPECT_LT(device().faults().Count("select") - calls, 20U) << place;
    EXPECT_THAT(Log(), Contains("WRQ Timeout")) << place;
    Mend();
    Forget();
  }
}

TEST_F(RoadTest, ANetworkThatFailsForAMomentWhileAFileComesCostsTheFile) {
  Start();
  EstablishAsMaster();
  device().faults().Add({"recvfrom", 1, 1, WSAENETDOWN});
  ToPrivate(Data(1, 512));
  EXPECT_THAT(Log(), ElementsAre("Rx file timed out - transfer aborted", kWaiting));

  EstablishAsMaster();
  for (unsigned block = 1; block <= 3; ++block) ToPrivate(Data(block, block < 3 ? 512 : 276));
  ExpectWholeFile();
  EndWaiting();
}

}  // namespace
