#include "faults/faults.h"
#include "http/client/http_test.h"
#include "net/network.h"
#include "net/virtual/virtual_network.h"

namespace {

using http::CSocketIO;
using std::chrono::hours;
using std::chrono::milliseconds;
using std::chrono::seconds;
using test::HttpTest;
using test::Step;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// Lets a test use the socket itself.
class OpenSocket : public CSocketIO {
 public:
  using CSocketIO::socket_handle;
};

class SocketIoTest : public HttpTest {
 protected:
  void Connect(CSocketIO& socket) {
    ASSERT_TRUE(socket.CreateTcpSocket());
    ASSERT_TRUE(socket.Connect(kServerInNetworkOrder, kPort, 10000));
    LogText();
  }

  /// Sends until neither side has room for one byte more.
  void FillBothBuffers(OpenSocket& socket) {
    server().SetDeaf(true);
    Connect(socket);
    ULONG no_waiting = 1;
    ASSERT_EQ(ioctlsocket(socket.socket_handle(), static_cast<LONG>(FIONBIO), &no_waiting), 0);
    const std::string block(1460, 'x');
    do {
      while (send(socket.socket_handle(), block.data(), 1460, 0) > 0) {
      }
      Sleep(100);  // what is under way arrives
    } while (send(socket.socket_handle(), block.data(), 1460, 0) > 0);
  }
};

// ---- GetHostIp, IPToString ----

TEST_F(SocketIoTest, ADottedHostNeverReachesNameResolution) {
  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("10.0.0.2")), kServerInNetworkOrder);

  EXPECT_EQ(device().faults().Count("gethostbyname"), 0U);
}

TEST_F(SocketIoTest, ResolvesANameToItsFirstAddress) {
  sim::VirtualNetwork(world()).AddName("upgrades", kServerAddress);

  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("upgrades")), kServerInNetworkOrder);
}

TEST_F(SocketIoTest, AHostThatDoesNotResolveHasAddressZero) {
  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("nowhere")), 0U);
  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("10.0.0.2:8080")), 0U);
  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("10.0.0.2/")), 0U);
  EXPECT_THAT(LogLines(), IsEmpty());
}

TEST_F(SocketIoTest, AnEmptyOrNullHostHasAddressZeroAndAsksNobody) {
  EXPECT_EQ(CSocketIO::GetHostIp(nullptr), 0U);
  EXPECT_EQ(CSocketIO::GetHostIp(TEXT("")), 0U);

  EXPECT_EQ(device().faults().Count("gethostbyname"), 0U);
  EXPECT_EQ(device().faults().Count("inet_addr"), 0U);
}

TEST_F(SocketIoTest, AHostOf127CharactersIsAskedForAndALongerOneIsNot) {
  std::u16string host(127, u'a');
  EXPECT_EQ(CSocketIO::GetHostIp(host.c_str()), 0U);
  EXPECT_EQ(device().faults().Count("gethostbyname"), 1U);

  host += u'a';
  EXPECT_EQ(CSocketIO::GetHostIp(host.c_str()), 0U);
  EXPECT_EQ(device().faults().Count("gethostbyname"), 1U);
}

TEST_F(SocketIoTest, ShowsAnAddressAsDottedText) {
  EXPECT_EQ(CSocketIO::IPToString(kServerInNetworkOrder).view(), "10.0.0.2");
  EXPECT_EQ(CSocketIO::IPToString(0xFFFFFFFF).view(), "255.255.255.255");
}

TEST_F(SocketIoTest, LogsAnAddressThatTheSystemRefuses) {
  device().faults().Add({"inet_ntoa"});

  EXPECT_EQ(CSocketIO::IPToString(kServerInNetworkOrder).view(), "");

  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::IPToString bad ip \r\n");
}

// ---- CreateTcpSocket, Connect ----

TEST_F(SocketIoTest, LogsASocketThatCannotBeMade) {
  device().faults().Add({"socket"});
  CSocketIO socket;

  EXPECT_FALSE(socket.CreateTcpSocket());

  EXPECT_FALSE(socket.is_open());
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::CreateTcpSocket - Error Invalid Socket\r\n");
}

TEST_F(SocketIoTest, ConnectsAndSaysSo) {
  CSocketIO socket;
  ASSERT_TRUE(socket.CreateTcpSocket());

  EXPECT_TRUE(socket.Connect(kServerInNetworkOrder, kPort, 10000));

  EXPECT_EQ(server().connections(), 1U);
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::Connect - connect established\r\n");
}

TEST_F(SocketIoTest, DoesNotConnectWithoutASocket) {
  CSocketIO socket;

  EXPECT_FALSE(socket.Connect(kServerInNetworkOrder, kPort, 10000));

  EXPECT_EQ(device().faults().Count("connect"), 0U);
  EXPECT_EQ(LogText(), "");
}

TEST_F(SocketIoTest, ARefusedConnectionLeavesTheSocketClosed) {
  server().StopAccepting();
  CSocketIO socket;
  ASSERT_TRUE(socket.CreateTcpSocket());

  EXPECT_FALSE(socket.Connect(kServerInNetworkOrder, kPort, 10000));

  EXPECT_FALSE(socket.is_open());
  EXPECT_EQ(device().network().open_sockets(), 0U);
  EXPECT_EQ(LogText(),
            "Orvenix - CSocketIO::Connect - Error !10061%\r\n"
            "Orvenix - CSocketIO::Close\r\n");
  EXPECT_EQ(DebugText(), "connect error, 10061\r\n");
}

TEST_F(SocketIoTest, DoesNotConnectToAddressZero) {
  CSocketIO socket;
  ASSERT_TRUE(socket.CreateTcpSocket());
  const milliseconds begin = Now();

  EXPECT_FALSE(socket.Connect(0, kPort, 10000));

  EXPECT_LT(Now() - begin, seconds(1)) << "there is nothing to take in before closing";
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - CSocketIO::Connect - Error !10049%",
                                      "Orvenix - CSocketIO::Close"));
}

TEST_F(SocketIoTest, LeavesASocketThatDoesNotBecomeWritableToItsCaller) {
  CSocketIO socket;
  ASSERT_TRUE(socket.CreateTcpSocket());
  device().faults().Add({"select", 1, 1, WSAENETDOWN});

  EXPECT_FALSE(socket.Connect(kServerInNetworkOrder, kPort, 10000));

  EXPECT_TRUE(socket.is_open());
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::SocketWriteable - error = !10050!\r\n");
}

// ---- waiting ----

TEST_F(SocketIoTest, WaitsForRoomNoLongerThanTheTimeout) {
  OpenSocket socket;
  FillBothBuffers(socket);
  const milliseconds begin = Now();

  EXPECT_FALSE(socket.SocketWriteable(1500));

  EXPECT_EQ(Now() - begin, milliseconds(1500));
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::SocketWriteable - timeout error\r\n");
}

TEST_F(SocketIoTest, ATimeoutOfZeroWaitsForRoomWithoutLimit) {
  OpenSocket socket;
  FillBothBuffers(socket);
  const milliseconds begin = Now();
  sim::VirtualNetwork(world()).At(world().now() + hours(24), [&] { server().SetDeaf(false); });

  EXPECT_TRUE(socket.SocketWriteable(0));

  EXPECT_GE(Now() - begin, hours(24));
  EXPECT_EQ(LogText(), "");
}

TEST_F(SocketIoTest, WaitsForDataSilently) {
  server().SetGreeting({{milliseconds(700), "hello", Step::Then::kGoOn}});
  CSocketIO socket;
  Connect(socket);
  const milliseconds begin = Now();

  EXPECT_FALSE(socket.SocketReadable(500));
  EXPECT_EQ(Now() - begin, milliseconds(500));
  EXPECT_TRUE(socket.SocketReadable(500));
  EXPECT_EQ(Now() - begin, milliseconds(700));

  char buffer[3];
  EXPECT_EQ(socket.ReadData(buffer, sizeof buffer), 3);
  EXPECT_EQ(std::string(buffer, 3), "hel");
  device().faults().Add({"select", 1, 1, WSAENETDOWN});
  EXPECT_FALSE(socket.SocketReadable(500));
  EXPECT_EQ(LogText(), "");
}

TEST_F(SocketIoTest, ATimeoutOfZeroWaitsForDataWithoutLimit) {
  server().SetGreeting({{hours(24), "x", Step::Then::kGoOn}});
  CSocketIO socket;
  Connect(socket);

  EXPECT_TRUE(socket.SocketReadable(0));

  EXPECT_GE(Now(), hours(24));
}

TEST_F(SocketIoTest, ReadsZeroBytesWhenThePeerHasClosed) {
  server().SetGreeting({{milliseconds(1), "", Step::Then::kClose}});
  CSocketIO socket;
  Connect(socket);
  char buffer[8];

  EXPECT_TRUE(socket.SocketReadable(1000));
  EXPECT_EQ(socket.ReadData(buffer, sizeof buffer), 0);
}

TEST_F(SocketIoTest, ReadsMinusOneFromABrokenConnection) {
  server().SetGreeting({{milliseconds(1), "", Step::Then::kReset}});
  CSocketIO socket;
  Connect(socket);
  char buffer[8];

  EXPECT_TRUE(socket.SocketReadable(1000));
  EXPECT_EQ(socket.ReadData(buffer, sizeof buffer), -1);
}

// ---- SendData ----

TEST_F(SocketIoTest, SendsNothingForALengthOfZero) {
  CSocketIO socket;

  EXPECT_EQ(socket.SendData("x", 0), 0U);

  EXPECT_EQ(device().faults().Count("send"), 0U);
}

TEST_F(SocketIoTest, SendsInPiecesOfOneSegment) {
  CSocketIO socket;
  Connect(socket);
  const std::string data = test::Noise(2 * 1460 + 1);

  EXPECT_EQ(socket.SendData(data.data(), static_cast<std::uint32_t>(data.size())), data.size());

  EXPECT_EQ(device().faults().Count("send"), 3U);
  Sleep(10);
  EXPECT_EQ(server().unfinished(), data);
}

TEST_F(SocketIoTest, DoublesTheWaitWhileTheSendBufferIsFullAndDoesNotGiveUp) {
  CSocketIO socket;
  Connect(socket);
  device().network().FillSendBuffer(/*calls=*/11);

  EXPECT_EQ(socket.SendData("x", 1), 1U);

  EXPECT_THAT(Sleeps(), ElementsAre(40, 80, 160, 320, 640, 1280, 2560, 5120, 10240, 10240, 10240));
}

TEST_F(SocketIoTest, ShortensTheWaitByAStepWithEverySuccess) {
  CSocketIO socket;
  Connect(socket);
  const std::string data(4 * 1460, 'x');
  // Full, full, sent, sent, full, sent, sent.
  device().faults().Add({"send", 1, 2, WSAEWOULDBLOCK});
  device().faults().Add({"send", 5, 1, WSAEWOULDBLOCK});

  EXPECT_EQ(socket.SendData(data.data(), static_cast<std::uint32_t>(data.size())), data.size());

  EXPECT_THAT(Sleeps(), ElementsAre(40, 80, /* (80 - 2 * 20) * 2 = */ 80));
}

TEST_F(SocketIoTest, StopsSendingAtAnyOtherFailure) {
  CSocketIO socket;
  Connect(socket);
  const std::string data(3 * 1460, 'x');
  device().faults().Add({"send", 2, 1, WSAECONNRESET});

  EXPECT_EQ(socket.SendData(data.data(), static_cast<std::uint32_t>(data.size())), 1460U);

  EXPECT_THAT(Sleeps(), IsEmpty());
  EXPECT_EQ(LogText(), "");
}

TEST_F(SocketIoTest, SendsNothingWithoutASocket) {
  CSocketIO socket;

  EXPECT_EQ(socket.SendData("abc", 3), 0U);
}

// ---- Close ----

TEST_F(SocketIoTest, ClosingWithoutASocketDoesNothing) {
  CSocketIO socket;

  EXPECT_FALSE(socket.Close());

  EXPECT_EQ(LogText(), "");
}

TEST_F(SocketIoTest, TakesInWhatThePeerStillSendsBeforeItCloses) {
  server().SetGreeting({{milliseconds(0), test::Noise(100000), Step::Then::kGoOn}});
  CSocketIO socket;
  Connect(socket);
  const milliseconds begin = Now();

  EXPECT_TRUE(socket.Close());

  EXPECT_FALSE(socket.is_open());
  EXPECT_EQ(server().goodbyes(), 1);
  EXPECT_GT(device().faults().Count("recv"), 100U) << "512 bytes at a time";
  EXPECT_LT(Now() - begin, seconds(1));
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::Close\r\n");
}

TEST_F(SocketIoTest, StopsWaitingForAPeerThatNeitherSendsNorCloses) {
  server().set_stubborn(true);
  CSocketIO socket;
  Connect(socket);
  const milliseconds begin = Now();

  EXPECT_TRUE(socket.Close());

  EXPECT_EQ(Now() - begin, seconds(10)) << "the socket's time-out";
  EXPECT_EQ(LogText(), "Orvenix - CSocketIO::Close\r\n");
}

TEST_F(SocketIoTest, StopsTakingInAfterAMinute) {
  server().set_stubborn(true);
  server().SetGreeting(test::Answer(100, {seconds(1), "x", Step::Then::kGoOn}));
  for (const std::uint32_t timeout_ms : {10000U, 0U, 120000U}) {
    CSocketIO socket;
    socket.set_timeout_ms(timeout_ms);
    Connect(socket);
    const milliseconds begin = Now();

    EXPECT_TRUE(socket.Close());

    EXPECT_GE(Now() - begin, seconds(60)) << timeout_ms;
    EXPECT_LE(Now() - begin, seconds(61)) << timeout_ms;
  }
}

TEST_F(SocketIoTest, ClosesAtOnceWithoutGoodbyeOrLogLine) {
  server().set_stubborn(true);
  CSocketIO socket;
  Connect(socket);
  const milliseconds begin = Now();

  socket.CloseAtOnce();

  EXPECT_EQ(Now(), begin);
  EXPECT_FALSE(socket.is_open());
  EXPECT_EQ(device().faults().Count("shutdown"), 0U);
  EXPECT_EQ(LogText(), "");
}

}  // namespace
