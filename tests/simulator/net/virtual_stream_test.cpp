// Connections on the network of a virtual world: how they begin, flow, stall and break.
#include "simulator/net/virtual_network_fixture.h"

namespace test {
namespace {

using namespace std::chrono_literals;  // NOLINT(google-build-using-namespace)
using sim::LinkProfile;
using sim::StreamEnd;
using sim::StreamFaultKind;
using ::testing::HasSubstr;

using VirtualStreamTest = VirtualNetworkTest;

// ---- connecting ----

TEST_F(VirtualStreamTest, RefusesAConnectionWhereNobodyListensAfterOneRoundTrip) {
  LinkProfile link;
  link.delay = 20ms;
  network_.SetDefaultLink(link);
  network_.SetHost(kServer, sim::HostState::kUp);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
  EXPECT_EQ(now(), 40ms);
}

TEST_F(VirtualStreamTest, GivesUpConnectingToAnAddressWithoutAHost) {
  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAETIMEDOUT);
  EXPECT_EQ(now(), 21s);
}

TEST_F(VirtualStreamTest, TellsOfAHostThatCannotBeReached) {
  network_.SetHost(kServer, sim::HostState::kUnreachable);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAEHOSTUNREACH);
}

TEST_F(VirtualStreamTest, ShowsAFailedNonBlockingConnectInTheThirdSet) {
  LinkProfile link;
  link.delay = 5ms;
  network_.SetDefaultLink(link);
  network_.SetHost(kServer, sim::HostState::kUp);
  const SOCKET socket = Tcp();
  SetNonBlocking(socket);
  ASSERT_EQ(Connect(socket, kServer, 80), CE_SOCKET_ERROR);
  ASSERT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
  EXPECT_EQ(Connect(socket, kServer, 80), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEALREADY);

  EXPECT_EQ(Select(socket, For::kExcept, -1), 1);
  EXPECT_EQ(Select(socket, For::kWrite, 100), 0);
  EXPECT_EQ(GetNumber(socket, CE_SOL_SOCKET, CE_SO_ERROR), WSAECONNREFUSED);
  EXPECT_EQ(GetNumber(socket, CE_SOL_SOCKET, CE_SO_ERROR), 0);
}

TEST_F(VirtualStreamTest, ConnectsInOneRoundTripAndBringsBytesAfterTheDelay) {
  LinkProfile link;
  link.delay = 20ms;
  network_.SetDefaultLink(link);
  script_.bytes = [](StreamEnd& end, std::string_view bytes) { end.Send(bytes); };
  Serve();

  const SOCKET socket = ConnectedSocket();
  EXPECT_EQ(now(), 40ms);
  SendText(socket, "echo");
  EXPECT_EQ(ReceiveText(socket), "echo");
  EXPECT_EQ(now(), 80ms);
}

TEST_F(VirtualStreamTest, RefusesNewConnectionsOfAServerThatStoppedAccepting) {
  script_.bytes = [](StreamEnd& end, std::string_view bytes) { end.Send(bytes); };
  sim::VirtualServer& server = Serve();
  const SOCKET early = ConnectedSocket();
  server.StopAccepting();

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
  SendText(early, "still");
  EXPECT_EQ(ReceiveText(early), "still");
  server.StartAccepting();
  ConnectedSocket();
  EXPECT_EQ(server.accepted(), 2U);
}

TEST_F(VirtualStreamTest, LetsAServerConnectToTheDevice) {
  const SOCKET listener = Listener();
  std::string heard;
  Script script;
  script.open = [](StreamEnd& end) { end.Send("from outside"); };
  script.bytes = [&](StreamEnd& /*end*/, std::string_view bytes) { heard += bytes; };
  sim::VirtualClient client(world(), kServer, {kDevice, LocalName(listener).port},
                            std::make_unique<Scripted>(script));

  const SOCKET socket = ce_accept(listener, nullptr, nullptr);
  EXPECT_EQ(PeerName(socket).address, kServer);
  EXPECT_EQ(ReceiveText(socket), "from outside");
  SendText(socket, "answer");
  Sleep(1);
  EXPECT_EQ(heard, "answer");
}

TEST_F(VirtualStreamTest, RefusesWhomTheBacklogHasNoRoomFor) {
  const SOCKET listener = Tcp();
  ASSERT_EQ(Bind(listener, sim::kAnyAddress), 0);
  ASSERT_EQ(ce_listen(listener, 1), 0);
  const std::uint16_t port = LocalName(listener).port;
  ASSERT_EQ(Connect(Tcp(), kDevice, port), 0);

  EXPECT_EQ(Connect(Tcp(), kDevice, port), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
}

TEST_F(VirtualStreamTest, AnswersTheNamesItWasGiven) {
  network_.AddName("Upgrade-Server", kServer);

  const ce_hostent* host = ce_gethostbyname("upgrade-server");

  ASSERT_NE(host, nullptr);
  EXPECT_EQ(std::string_view(host->h_addr_list[0], 4), std::string_view("\x7F\0\0\x02", 4));
  EXPECT_EQ(ce_gethostbyname("unknown"), nullptr);
}

// ---- the shape of a stream ----

TEST_F(VirtualStreamTest, CutsAStreamIntoSegmentsThatComeOneByOne) {
  LinkProfile link;
  link.segment_bytes = 1000;
  link.segment_gap = 10ms;
  network_.SetLink(kServer, kDevice, link);
  ServeBytes(std::string(2500, 's'));
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveText(socket).size(), 1000U);
  EXPECT_EQ(now(), 0ms);
  EXPECT_EQ(ReceiveText(socket).size(), 1000U);
  EXPECT_EQ(now(), 10ms);
  EXPECT_EQ(ReceiveText(socket).size(), 500U);
  EXPECT_EQ(now(), 20ms);
  EXPECT_EQ(ReceiveText(socket), "");
}

TEST_F(VirtualStreamTest, LetsAServerSayThingsLater) {
  script_.open = [](StreamEnd& end) {
    end.Send("head");
    end.SetTimer(end.now() + 1s);
    end.SetTimer(end.now() + 50ms);
  };
  script_.time = [](StreamEnd& end) { end.Send("body"); };
  Serve();
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveText(socket), "head");
  EXPECT_EQ(ReceiveText(socket), "body");
  EXPECT_EQ(now(), 50ms);
  EXPECT_EQ(Select(socket, For::kRead, 5000), 0) << "a new time takes the place of the old one";
}

TEST_F(VirtualStreamTest, BringsALongStreamWholeAndInOrder) {
  std::string bytes;
  for (std::uint32_t i = 0; bytes.size() < 1000000; ++i) bytes += std::to_string(i);
  LinkProfile link;
  link.delay = 3ms;
  link.jitter = 5ms;
  link.loss = 0.02;
  network_.SetDefaultLink(link);
  ServeBytes(bytes);
  const SOCKET socket = ConnectedSocket();

  EXPECT_TRUE(ReceiveAll(socket) == bytes);
}

TEST_F(VirtualStreamTest, IsLimitedByTheBandwidthOfTheLink) {
  LinkProfile link;
  link.bytes_per_second = 1514 * 100;  // a hundred full segments a second
  network_.SetLink(kServer, kDevice, link);
  ServeBytes(std::string(1460 * 300, 'w'));
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveAll(socket).size(), 1460U * 300);

  EXPECT_GE(now(), 3s);
  EXPECT_LE(now(), 3s + 30ms);
}

TEST_F(VirtualStreamTest, IsLimitedByTheReceiveBufferOverALongWay) {
  LinkProfile link;
  link.delay = 50ms;
  network_.SetDefaultLink(link);
  ServeBytes(std::string(32768 * 10, 'w'));
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveAll(socket).size(), 32768U * 10);

  EXPECT_GE(now(), 950ms) << "32,768 bytes a round trip of 100 ms";
  EXPECT_LE(now(), 1500ms);
}

TEST_F(VirtualStreamTest, HoldsBackASenderWhoseReceiverTakesNothing) {
  std::size_t taken = 0;
  script_.open = [](StreamEnd& end) {
    end.SetPaused(true);
    end.SetTimer(end.now() + 10s);
  };
  script_.bytes = [&](StreamEnd& /*end*/, std::string_view bytes) { taken += bytes.size(); };
  script_.time = [](StreamEnd& end) { end.SetPaused(false); };
  Serve();
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(SendText(socket, std::string(200000, 'p')), 200000);

  EXPECT_EQ(now(), 10s) << "the send waited for room";
  Sleep(1);
  EXPECT_EQ(taken, 200000U);
}

TEST_F(VirtualStreamTest, MovesSixteenMebibytesInFewSteps) {
  std::string bytes(16 << 20, '\0');
  for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 31 + i / 977);
  ServeBytes(bytes);
  const SOCKET socket = ConnectedSocket();
  std::string received;
  received.reserve(bytes.size());
  std::size_t calls = 0;

  for (std::string part; !(part = ReceiveText(socket, 16384)).empty(); ++calls) received += part;

  EXPECT_TRUE(received == bytes);
  EXPECT_LE(calls, 2048U) << "a receive gives all that is there";
}

// ---- trouble ----

TEST_F(VirtualStreamTest, ResetsAConnectionAtTheByteATestNames) {
  network_.AddFault({kServer, kDevice, 2000, StreamFaultKind::kReset, 0ms, 2});
  ServeBytes(std::string(5000, 'r'));
  EXPECT_EQ(ReceiveAll(ConnectedSocket()).size(), 5000U) << "the second connection it is";
  poured_ = 0;

  EXPECT_THAT(ReceiveAll(ConnectedSocket()), HasSubstr("error 10054"));
  poured_ = 0;
  EXPECT_EQ(ReceiveAll(ConnectedSocket()).size(), 5000U) << "the third is whole again";
}

TEST_F(VirtualStreamTest, EndsAStreamAtTheByteATestNames) {
  network_.AddFault({kServer, kDevice, 2000, StreamFaultKind::kEnd});
  ServeBytes(std::string(5000, 'e'));

  EXPECT_EQ(ReceiveAll(ConnectedSocket()), std::string(2000, 'e'));
}

TEST_F(VirtualStreamTest, EndsAStreamBeforeItsFirstByte) {
  network_.AddFault({kServer, kDevice, 0, StreamFaultKind::kEnd});
  ServeBytes("never");

  EXPECT_EQ(ReceiveAll(ConnectedSocket()), "");
}

TEST_F(VirtualStreamTest, StallsAStreamForAsLongAsATestSays) {
  network_.AddFault({kServer, kDevice, 2000, StreamFaultKind::kStall, 30s});
  ServeBytes(std::string(5000, 't'));
  const SOCKET socket = ConnectedSocket();

  std::size_t received = 0;
  while (received < 2000) received += ReceiveText(socket).size();
  EXPECT_EQ(received, 2000U);
  EXPECT_EQ(Select(socket, For::kRead, 29000), 0);
  EXPECT_EQ(ReceiveAll(socket).size(), 3000U);
  EXPECT_EQ(now(), 30s);
}

TEST_F(VirtualStreamTest, StallsForEverWithoutATime) {
  network_.AddFault({kServer, kDevice, 0, StreamFaultKind::kStall});
  ServeBytes("never");
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(Select(socket, For::kRead, 3600000), 0);
}

TEST_F(VirtualStreamTest, HoldsALinkUntilItIsReleased) {
  script_.bytes = [](StreamEnd& end, std::string_view bytes) { end.Send(bytes); };
  Serve();
  const SOCKET socket = ConnectedSocket();
  network_.Stall(kServer, kDevice);
  SendText(socket, "held");
  EXPECT_EQ(Select(socket, For::kRead, 60000), 0);
  network_.At(now() + 1s, [this] { network_.Release(kServer, kDevice); });

  EXPECT_EQ(ReceiveText(socket), "held");
  EXPECT_EQ(now(), 61s);
}

TEST_F(VirtualStreamTest, TimesOutConnectingOverALinkThatHoldsEverything) {
  Serve();
  network_.Stall(kDevice, kServer);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAETIMEDOUT);
}

TEST_F(VirtualStreamTest, ResetsTheOpenConnectionsOfTwoHosts) {
  int broken = 0;
  script_.broken = [&](int error) { broken = error; };
  sim::VirtualServer& server = Serve();
  const SOCKET socket = ConnectedSocket();

  network_.ResetConnections(kDevice, kServer);

  EXPECT_EQ(ReceiveText(socket), "error 10054");
  EXPECT_EQ(broken, WSAECONNRESET);
  EXPECT_EQ(server.open_connections(), 0U);
}

TEST_F(VirtualStreamTest, TellsAServerThatTheDeviceHasEndedItsStream) {
  script_.end = [](StreamEnd& end) {
    end.Send("goodbye");
    end.Close();
  };
  sim::VirtualServer& server = Serve();
  const SOCKET socket = ConnectedSocket();
  ce_shutdown(socket, CE_SD_SEND);

  EXPECT_EQ(ReceiveAll(socket), "goodbye");
  ce_closesocket(socket);
  EXPECT_EQ(server.open_connections(), 0U);
  EXPECT_EQ(network_.open_connections(), 0U);
}

TEST_F(VirtualStreamTest, BreaksTheServersEndWhenTheDeviceClosesOnUnreadBytes) {
  int broken = 0;
  script_.open = [](StreamEnd& end) { end.Send("unread"); };
  script_.broken = [&](int error) { broken = error; };
  Serve();
  const SOCKET socket = ConnectedSocket();
  ASSERT_EQ(Select(socket, For::kRead, -1), 1);
  ce_closesocket(socket);
  Sleep(1);

  EXPECT_EQ(broken, WSAECONNRESET);
}

TEST_F(VirtualStreamTest, ClosesTheDevicesSocketsWhenItLosesItsPower) {
  bool ended = false;
  script_.end = [&](StreamEnd& end) {
    ended = true;
    end.Close();
  };
  Serve();
  ConnectedSocket();

  Restart();
  Sleep(1);

  EXPECT_TRUE(ended);
  EXPECT_EQ(device().network().open_sockets(), 0U);
}

TEST_F(VirtualStreamTest, LetsTimePassForAProgramThatAsksAgainAndAgain) {
  LinkProfile link;
  link.delay = 1ms;
  network_.SetDefaultLink(link);
  ServeBytes("slow");
  const SOCKET socket = ConnectedSocket();
  int looks = 0;
  while (Select(socket, For::kRead, 0) == 0) ++looks;
  EXPECT_LE(looks, 2000);

  const SOCKET second = ConnectedSocket();
  SetNonBlocking(second);
  looks = 0;
  while (ReceiveText(second) == "error 10035") ++looks;
  EXPECT_LE(looks, 2000);

  poured_ = 0;
  const SOCKET third = ConnectedSocket();
  looks = 0;
  while (Pending(third) == 0) ++looks;
  EXPECT_LE(looks, 2000);
}

}  // namespace
}  // namespace test
