// What a device's program sees of its connections, the same in both worlds.
#include "simulator/net/socket_fixture.h"

namespace test {
namespace {

template <typename World>
using SocketStreamTest = SocketTest<World>;
TYPED_TEST_SUITE(SocketStreamTest, Worlds, WorldNames);

// ---- connections ----

TYPED_TEST(SocketStreamTest, CarriesBytesBothWays) {
  const auto [client, server] = ConnectedPair();

  EXPECT_EQ(SendText(client, "hello"), 5);
  EXPECT_EQ(ReceiveText(server), "hello");
  EXPECT_EQ(SendText(server, "and back"), 8);
  EXPECT_EQ(ReceiveText(client), "and back");
}

TYPED_TEST(SocketStreamTest, NamesBothEndsOfAConnection) {
  const auto [client, server] = ConnectedPair();

  EXPECT_EQ(LocalName(client).address, kDevice);
  EXPECT_EQ(LocalName(client), PeerName(server));
  EXPECT_EQ(PeerName(client), LocalName(server));
}

TYPED_TEST(SocketStreamTest, TellsWhoConnected) {
  const SOCKET listener = Listener();
  const SOCKET client = Tcp();
  ASSERT_EQ(Connect(client, kDevice, LocalName(listener).port), 0);
  ce_sockaddr_in from{};
  int size = sizeof from;

  ASSERT_NE(ce_accept(listener, reinterpret_cast<ce_sockaddr*>(&from), &size), CE_INVALID_SOCKET);

  EXPECT_EQ(sim::ToEndpoint(from), LocalName(client));
  EXPECT_EQ(size, 16);
}

std::uint16_t PortWithoutListener() {
  const SOCKET listener = Listener();
  const std::uint16_t port = LocalName(listener).port;
  ce_closesocket(listener);
  return port;
}

TYPED_TEST(SocketStreamTest, IsRefusedWhereNobodyListens) {
  const std::uint16_t port = PortWithoutListener();
  const SOCKET client = Tcp();

  EXPECT_EQ(Connect(client, kDevice, port), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
}

TYPED_TEST(SocketStreamTest, CanTryAgainAfterARefusal) {
  const SOCKET client = Tcp();
  ASSERT_EQ(Connect(client, kDevice, PortWithoutListener()), CE_SOCKET_ERROR);
  const SOCKET second = Listener();

  EXPECT_EQ(Connect(client, kDevice, LocalName(second).port), 0);
}

TYPED_TEST(SocketStreamTest, KnowsNoPeerOfAddressZero) {
  const SOCKET listener = Listener();
  const std::uint16_t port = LocalName(listener).port;

  EXPECT_EQ(Connect(Tcp(), 0, port), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
  EXPECT_EQ(SendTo(Udp(), {0, 514}, "x"), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
  EXPECT_EQ(Connect(Udp(), 0, 514), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
  EXPECT_EQ(Connect(Tcp(), kDevice, 0), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
}

TYPED_TEST(SocketStreamTest, ShowsTheProgressOfANonBlockingConnectInSelect) {
  const SOCKET listener = Listener();
  const SOCKET client = Tcp();
  SetNonBlocking(client);

  // Within one host the connection may stand at once.
  if (Connect(client, kDevice, LocalName(listener).port) != 0) {
    EXPECT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
  }
  EXPECT_EQ(Select(client, For::kWrite, -1), 1);
  EXPECT_EQ(Connect(client, kDevice, LocalName(listener).port), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEISCONN);
  EXPECT_EQ(SendText(client, "x"), 1);
}

TYPED_TEST(SocketStreamTest, GivesUpAtOnceWhatANonBlockingAcceptCannotHave) {
  const SOCKET listener = Listener();
  SetNonBlocking(listener);

  EXPECT_EQ(ce_accept(listener, nullptr, nullptr), CE_INVALID_SOCKET);

  EXPECT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
}

TYPED_TEST(SocketStreamTest, FindsAListenerReadableWhenSomeoneHasConnected) {
  const SOCKET listener = Listener();
  EXPECT_EQ(Select(listener, For::kRead, 0), 0);
  ASSERT_EQ(Connect(Tcp(), kDevice, LocalName(listener).port), 0);

  EXPECT_EQ(Select(listener, For::kRead, -1), 1);
}

// ---- the end of a stream ----

TYPED_TEST(SocketStreamTest, KeepsReceivingAfterItsOwnEnd) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(SendText(client, "last words"), 10);
  ASSERT_EQ(ce_shutdown(client, CE_SD_SEND), 0);

  EXPECT_EQ(ReceiveAll(server), "last words");
  EXPECT_EQ(SendText(server, "still heard"), 11);
  EXPECT_EQ(ReceiveText(client), "still heard");
  EXPECT_EQ(SendText(client, "x"), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAESHUTDOWN);
}

TYPED_TEST(SocketStreamTest, IsReadableWithNoBytesWhenThePeerHasClosed) {
  const auto [client, server] = ConnectedPair();
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(Pending(client), 0U);
  EXPECT_EQ(ReceiveText(client, 1, CE_MSG_PEEK), "");
  EXPECT_EQ(ReceiveText(client), "");
}

TYPED_TEST(SocketStreamTest, StillDeliversWhatWasSentBeforeTheClose) {
  const auto [client, server] = ConnectedPair();
  const std::string bytes(20000, 'b');
  ASSERT_EQ(SendText(server, bytes), 20000);
  ce_closesocket(server);

  EXPECT_EQ(ReceiveAll(client), bytes);
}

TYPED_TEST(SocketStreamTest, ResetsTheConnectionWhenUnreadBytesAreLeftAtTheClose) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(SendText(client, "unread"), 6);
  ASSERT_EQ(Select(server, For::kRead, -1), 1);
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "error 10054");
  EXPECT_EQ(ReceiveText(client), "error 10054") << "a broken connection stays broken";
  EXPECT_EQ(SendText(client, "x"), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNRESET);
}

TYPED_TEST(SocketStreamTest, ResetsTheConnectionWhenOnlySomeOfTheBytesHaveBeenRead) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(SendText(client, "unread"), 6);
  ASSERT_EQ(Select(server, For::kRead, -1), 1);
  char two[2];
  ASSERT_EQ(ce_recv(server, two, 2, 0), 2);
  EXPECT_EQ(Select(server, For::kRead, 0), 1);
  EXPECT_EQ(Pending(server), 4U);
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "error 10054");
}

TYPED_TEST(SocketStreamTest, ResetsTheConnectionWhenItDoesNotLinger) {
  const auto [client, server] = ConnectedPair();
  const ce_linger at_once{1, 0};
  ASSERT_EQ(ce_setsockopt(server, CE_SOL_SOCKET, CE_SO_LINGER,
                          reinterpret_cast<const char*>(&at_once), sizeof at_once),
            0);
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "error 10054");
}

TYPED_TEST(SocketStreamTest, ReceivesNothingAfterItHasShutThatSide) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(ce_shutdown(client, CE_SD_RECEIVE), 0);

  EXPECT_EQ(ReceiveText(client), "error 10058");
  EXPECT_EQ(ce_shutdown(client, 3), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINVAL);
  EXPECT_EQ(SendText(server, "x"), 1);
}

// ---- blocking ----

TYPED_TEST(SocketStreamTest, WouldBlockWhenNothingHasArrived) {
  const auto [client, server] = ConnectedPair();
  SetNonBlocking(client);

  EXPECT_EQ(ReceiveText(client), "error 10035");
  EXPECT_EQ(Select(client, For::kRead, 0), 0);
  EXPECT_EQ(SendText(server, "now"), 3);
  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "now");
}

TYPED_TEST(SocketStreamTest, WouldBlockWhenTheSendBufferIsFull) {
  const auto [client, server] = ConnectedPair();
  SetNonBlocking(client);
  const std::string block(8192, 'x');
  std::size_t sent = 0;
  // What finds no room at first may find some when bytes have moved on to the receiver's buffer.
  do {
    int count = 0;
    while ((count = SendText(client, block)) > 0) sent += static_cast<std::size_t>(count);
    ASSERT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
  } while (Select(client, For::kWrite, 0) == 1);

  std::size_t received = 0;
  while (received < sent) {
    const std::size_t part = ReceiveText(server, 16384).size();
    ASSERT_GT(part, 0U);
    received += part;
  }
  EXPECT_EQ(Select(client, For::kWrite, -1), 1);
  EXPECT_EQ(SendText(client, "x"), 1);
}

TYPED_TEST(SocketStreamTest, SendsAllBytesOfABlockingSend) {
  const auto [client, server] = ConnectedPair();
  const std::string bytes(3000000, 's');
  std::string received;
  const SOCKET reader = server;
  this->OnceTheTestWaits([&received, reader] {
    received = ReceiveAll(reader);
    ce_shutdown(reader, CE_SD_SEND);
  });

  EXPECT_EQ(SendText(client, bytes), 3000000);
  ce_shutdown(client, CE_SD_SEND);
  EXPECT_EQ(ReceiveText(client, 1), "") << "the helper's end";

  EXPECT_EQ(received.size(), bytes.size());
}

TYPED_TEST(SocketStreamTest, WakesWhoReceivesWhenTheSocketIsClosed) {
  const auto [client, server] = ConnectedPair();
  const SOCKET closing = client;
  this->OnceTheTestWaits([closing] { EXPECT_EQ(ce_closesocket(closing), 0); });

  EXPECT_EQ(ReceiveText(client), "error 10004");
  EXPECT_EQ(ReceiveText(client), "error 10038") << "the next call finds no socket";
  EXPECT_EQ(ReceiveText(server), "");
}

TYPED_TEST(SocketStreamTest, WakesWhoSelectsWhenTheSocketIsClosed) {
  const SOCKET socket = Udp();
  ASSERT_EQ(Bind(socket, sim::kAnyAddress), 0);
  this->OnceTheTestWaits([socket] { EXPECT_EQ(ce_closesocket(socket), 0); });

  EXPECT_EQ(Select(socket, For::kRead, -1), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINTR);
}

TYPED_TEST(SocketStreamTest, WakesWhoAcceptsWhenWinsockIsCleanedUp) {
  const SOCKET listener = Listener();
  this->OnceTheTestWaits([] { EXPECT_EQ(ce_WSACleanup(), 0); });

  EXPECT_EQ(ce_accept(listener, nullptr, nullptr), CE_INVALID_SOCKET);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINTR);
  EXPECT_EQ(this->device().network().open_sockets(), 0U);
}

TYPED_TEST(SocketStreamTest, WakesWhoSelectsWhenBytesArrive) {
  const auto [client, server] = ConnectedPair();
  const SOCKET writer = server;
  this->OnceTheTestWaits([writer] { SendText(writer, "at last"); });

  EXPECT_EQ(Select(client, For::kRead, 600000), 1);
  EXPECT_EQ(ReceiveText(client), "at last");
}

TYPED_TEST(SocketStreamTest, SelectsAmongManySockets) {
  const auto [client, server] = ConnectedPair();
  const SOCKET idle = Udp();
  ASSERT_EQ(Bind(idle, sim::kAnyAddress), 0);
  SendText(server, "x");
  ASSERT_EQ(Select(client, For::kRead, -1), 1);
  ce_fd_set read{3, {idle, client, server}};
  ce_fd_set write{2, {idle, client}};
  ce_fd_set except{1, {client}};

  EXPECT_EQ(ce_select(0, &read, &write, &except, nullptr), 3);

  ASSERT_EQ(read.fd_count, 1U);
  EXPECT_EQ(read.fd_array[0], client);
  EXPECT_EQ(write.fd_count, 2U);
  EXPECT_EQ(except.fd_count, 0U);
}

// ---- looking ahead ----

TYPED_TEST(SocketStreamTest, PeeksWithoutTaking) {
  const auto [client, server] = ConnectedPair();
  SendText(server, "peeked");
  ASSERT_EQ(Select(client, For::kRead, -1), 1);

  EXPECT_EQ(ReceiveText(client, 3, CE_MSG_PEEK), "pee");
  EXPECT_EQ(Pending(client), 6U);
  EXPECT_EQ(ReceiveText(client), "peeked");
  EXPECT_EQ(Pending(client), 0U);
}

TYPED_TEST(SocketStreamTest, GivesAStreamPiecewise) {
  const auto [client, server] = ConnectedPair();
  SendText(server, "abcdef");
  ASSERT_EQ(Select(client, For::kRead, -1), 1);

  EXPECT_EQ(ReceiveText(client, 2), "ab");
  EXPECT_EQ(ReceiveText(client, 3), "cde");
  EXPECT_EQ(ReceiveText(client, 3), "f");
}

}  // namespace
}  // namespace test
