// What a device's program sees of its sockets, the same in both worlds.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <utility>

#include "faults/faults.h"
#include "simulator/net/sockets.h"

namespace {

using namespace test;  // NOLINT(google-build-using-namespace)

struct VirtualWorld {
  static constexpr WorldKind kKind = WorldKind::kVirtual;
};
struct RealWorld {
  static constexpr WorldKind kKind = WorldKind::kReal;
};

struct WorldNames {
  template <typename World>
  static std::string GetName(int /*index*/) {
    return World::kKind == WorldKind::kVirtual ? "Virtual" : "RealThreadsTest";
  }
};

template <typename World>
class SocketTest : public DeviceTest {
 protected:
  SocketTest() : DeviceTest(World::kKind) { StartWinsock(); }

  /// Runs `action` on a thread of its own once the test's thread waits in a call.
  void OnceTheTestWaits(std::function<void()> action) {
    const sim::SimThread* waiter = sim::World::Current();
    const auto lock = world().Acquire();
    world().Spawn(
        device(), "helper",
        [this, waiter, action = std::move(action)] {
          while (!Waits(*waiter)) Sleep(1);
          action();
          return 0U;
        },
        /*suspended=*/false);
  }

 private:
  bool Waits(const sim::SimThread& thread) {
    const auto lock = world().Acquire();
    return thread.state == sim::SimThread::State::kBlocked;
  }
};
using Worlds = ::testing::Types<VirtualWorld, RealWorld>;
TYPED_TEST_SUITE(SocketTest, Worlds, WorldNames);

// ---- connections ----

TYPED_TEST(SocketTest, CarriesBytesBothWays) {
  const auto [client, server] = ConnectedPair();

  EXPECT_EQ(SendText(client, "hello"), 5);
  EXPECT_EQ(ReceiveText(server), "hello");
  EXPECT_EQ(SendText(server, "and back"), 8);
  EXPECT_EQ(ReceiveText(client), "and back");
}

TYPED_TEST(SocketTest, NamesBothEndsOfAConnection) {
  const auto [client, server] = ConnectedPair();

  EXPECT_EQ(LocalName(client).address, kDevice);
  EXPECT_EQ(LocalName(client), PeerName(server));
  EXPECT_EQ(PeerName(client), LocalName(server));
}

TYPED_TEST(SocketTest, TellsWhoConnected) {
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

TYPED_TEST(SocketTest, IsRefusedWhereNobodyListens) {
  const std::uint16_t port = PortWithoutListener();
  const SOCKET client = Tcp();

  EXPECT_EQ(Connect(client, kDevice, port), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
}

TYPED_TEST(SocketTest, CanTryAgainAfterARefusal) {
  const SOCKET client = Tcp();
  ASSERT_EQ(Connect(client, kDevice, PortWithoutListener()), CE_SOCKET_ERROR);
  const SOCKET second = Listener();

  EXPECT_EQ(Connect(client, kDevice, LocalName(second).port), 0);
}

TYPED_TEST(SocketTest, KnowsNoPeerOfAddressZero) {
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

TYPED_TEST(SocketTest, ShowsTheProgressOfANonBlockingConnectInSelect) {
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

TYPED_TEST(SocketTest, GivesUpAtOnceWhatANonBlockingAcceptCannotHave) {
  const SOCKET listener = Listener();
  SetNonBlocking(listener);

  EXPECT_EQ(ce_accept(listener, nullptr, nullptr), CE_INVALID_SOCKET);

  EXPECT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
}

TYPED_TEST(SocketTest, FindsAListenerReadableWhenSomeoneHasConnected) {
  const SOCKET listener = Listener();
  EXPECT_EQ(Select(listener, For::kRead, 0), 0);
  ASSERT_EQ(Connect(Tcp(), kDevice, LocalName(listener).port), 0);

  EXPECT_EQ(Select(listener, For::kRead, -1), 1);
}

// ---- the end of a stream ----

TYPED_TEST(SocketTest, KeepsReceivingAfterItsOwnEnd) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(SendText(client, "last words"), 10);
  ASSERT_EQ(ce_shutdown(client, CE_SD_SEND), 0);

  EXPECT_EQ(ReceiveAll(server), "last words");
  EXPECT_EQ(SendText(server, "still heard"), 11);
  EXPECT_EQ(ReceiveText(client), "still heard");
  EXPECT_EQ(SendText(client, "x"), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAESHUTDOWN);
}

TYPED_TEST(SocketTest, IsReadableWithNoBytesWhenThePeerHasClosed) {
  const auto [client, server] = ConnectedPair();
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(Pending(client), 0U);
  EXPECT_EQ(ReceiveText(client, 1, CE_MSG_PEEK), "");
  EXPECT_EQ(ReceiveText(client), "");
}

TYPED_TEST(SocketTest, StillDeliversWhatWasSentBeforeTheClose) {
  const auto [client, server] = ConnectedPair();
  const std::string bytes(20000, 'b');
  ASSERT_EQ(SendText(server, bytes), 20000);
  ce_closesocket(server);

  EXPECT_EQ(ReceiveAll(client), bytes);
}

TYPED_TEST(SocketTest, ResetsTheConnectionWhenUnreadBytesAreLeftAtTheClose) {
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

TYPED_TEST(SocketTest, ResetsTheConnectionWhenItDoesNotLinger) {
  const auto [client, server] = ConnectedPair();
  const ce_linger at_once{1, 0};
  ASSERT_EQ(ce_setsockopt(server, CE_SOL_SOCKET, CE_SO_LINGER,
                          reinterpret_cast<const char*>(&at_once), sizeof at_once),
            0);
  ce_closesocket(server);

  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "error 10054");
}

TYPED_TEST(SocketTest, ReceivesNothingAfterItHasShutThatSide) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(ce_shutdown(client, CE_SD_RECEIVE), 0);

  EXPECT_EQ(ReceiveText(client), "error 10058");
  EXPECT_EQ(ce_shutdown(client, 3), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINVAL);
  EXPECT_EQ(SendText(server, "x"), 1);
}

// ---- blocking ----

TYPED_TEST(SocketTest, WouldBlockWhenNothingHasArrived) {
  const auto [client, server] = ConnectedPair();
  SetNonBlocking(client);

  EXPECT_EQ(ReceiveText(client), "error 10035");
  EXPECT_EQ(Select(client, For::kRead, 0), 0);
  EXPECT_EQ(SendText(server, "now"), 3);
  EXPECT_EQ(Select(client, For::kRead, -1), 1);
  EXPECT_EQ(ReceiveText(client), "now");
}

TYPED_TEST(SocketTest, WouldBlockWhenTheSendBufferIsFull) {
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

TYPED_TEST(SocketTest, SendsAllBytesOfABlockingSend) {
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

TYPED_TEST(SocketTest, WakesWhoReceivesWhenTheSocketIsClosed) {
  const auto [client, server] = ConnectedPair();
  const SOCKET closing = client;
  this->OnceTheTestWaits([closing] { EXPECT_EQ(ce_closesocket(closing), 0); });

  EXPECT_EQ(ReceiveText(client), "error 10004");
  EXPECT_EQ(ReceiveText(client), "error 10038") << "the next call finds no socket";
  EXPECT_EQ(ReceiveText(server), "");
}

TYPED_TEST(SocketTest, WakesWhoSelectsWhenTheSocketIsClosed) {
  const SOCKET socket = Udp();
  ASSERT_EQ(Bind(socket, sim::kAnyAddress), 0);
  this->OnceTheTestWaits([socket] { EXPECT_EQ(ce_closesocket(socket), 0); });

  EXPECT_EQ(Select(socket, For::kRead, -1), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINTR);
}

TYPED_TEST(SocketTest, WakesWhoAcceptsWhenWinsockIsCleanedUp) {
  const SOCKET listener = Listener();
  this->OnceTheTestWaits([] { EXPECT_EQ(ce_WSACleanup(), 0); });

  EXPECT_EQ(ce_accept(listener, nullptr, nullptr), CE_INVALID_SOCKET);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEINTR);
  EXPECT_EQ(this->device().network().open_sockets(), 0U);
}

TYPED_TEST(SocketTest, WakesWhoSelectsWhenBytesArrive) {
  const auto [client, server] = ConnectedPair();
  const SOCKET writer = server;
  this->OnceTheTestWaits([writer] { SendText(writer, "at last"); });

  EXPECT_EQ(Select(client, For::kRead, 600000), 1);
  EXPECT_EQ(ReceiveText(client), "at last");
}

TYPED_TEST(SocketTest, SelectsAmongManySockets) {
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

TYPED_TEST(SocketTest, PeeksWithoutTaking) {
  const auto [client, server] = ConnectedPair();
  SendText(server, "peeked");
  ASSERT_EQ(Select(client, For::kRead, -1), 1);

  EXPECT_EQ(ReceiveText(client, 3, CE_MSG_PEEK), "pee");
  EXPECT_EQ(Pending(client), 6U);
  EXPECT_EQ(ReceiveText(client), "peeked");
  EXPECT_EQ(Pending(client), 0U);
}

TYPED_TEST(SocketTest, GivesAStreamPiecewise) {
  const auto [client, server] = ConnectedPair();
  SendText(server, "abcdef");
  ASSERT_EQ(Select(client, For::kRead, -1), 1);

  EXPECT_EQ(ReceiveText(client, 2), "ab");
  EXPECT_EQ(ReceiveText(client, 3), "cde");
  EXPECT_EQ(ReceiveText(client, 3), "f");
}

// ---- datagrams ----

TYPED_TEST(SocketTest, KeepsDatagramsApart) {
  const SOCKET receiver = Udp();
  ASSERT_EQ(Bind(receiver, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(receiver).port;
  const SOCKET sender = Udp();
  EXPECT_EQ(SendTo(sender, {kDevice, port}, "one"), 3);
  EXPECT_EQ(SendTo(sender, {kDevice, port}, ""), 0);
  EXPECT_EQ(SendTo(sender, {kDevice, port}, "three"), 5);
  sim::Endpoint from;

  ASSERT_EQ(Select(receiver, For::kRead, -1), 1);
  EXPECT_EQ(Pending(receiver), 3U);
  EXPECT_EQ(ReceiveFrom(receiver, from), "one");
  EXPECT_EQ(from, (sim::Endpoint{kDevice, LocalName(sender).port}));
  ASSERT_EQ(Select(receiver, For::kRead, -1), 1) << "an empty datagram is one too";
  EXPECT_EQ(Pending(receiver), 0U);
  EXPECT_EQ(ReceiveFrom(receiver, from), "");
  EXPECT_EQ(ReceiveFrom(receiver, from), "three");
}

TYPED_TEST(SocketTest, CutsADatagramThatIsLongerThanTheBuffer) {
  const SOCKET receiver = Udp();
  ASSERT_EQ(Bind(receiver, kDevice), 0);
  const SOCKET sender = Udp();
  SendTo(sender, LocalName(receiver), "too long");
  SendTo(sender, LocalName(receiver), "next");
  char bytes[6] = "#####";
  ce_sockaddr_in from{};
  int size = sizeof from;

  EXPECT_EQ(ce_recvfrom(receiver, bytes, 3, 0, reinterpret_cast<ce_sockaddr*>(&from), &size),
            CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAEMSGSIZE);
  EXPECT_EQ(std::string(bytes), "too##");
  EXPECT_EQ(sim::ToEndpoint(from).port, LocalName(sender).port);
  EXPECT_EQ(ReceiveText(receiver), "next");
}

TYPED_TEST(SocketTest, HearsOnlyItsPeerOnceItIsConnected) {
  const SOCKET receiver = Udp();
  ASSERT_EQ(Bind(receiver, kDevice), 0);
  const SOCKET friendly = Udp();
  const SOCKET stranger = Udp();
  ASSERT_EQ(Bind(friendly, kDevice), 0);
  ASSERT_EQ(Connect(receiver, kDevice, LocalName(friendly).port), 0);
  SendTo(stranger, LocalName(receiver), "stranger");
  SendTo(friendly, LocalName(receiver), "friend");

  ASSERT_EQ(Select(receiver, For::kRead, -1), 1);
  EXPECT_EQ(Pending(receiver), 6U);
  EXPECT_EQ(ReceiveText(receiver), "friend");
  EXPECT_EQ(SendText(receiver, "back"), 4) << "and sends to it";
  EXPECT_EQ(ReceiveText(friendly), "back");
}

TYPED_TEST(SocketTest, HearsItsGroupsUntilItLeavesThem) {
  const SOCKET member = Udp();
  ASSERT_EQ(Bind(member, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(member).port;
  const SOCKET sender = Udp();
  ASSERT_EQ(Group(member, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  SendTo(sender, {kOtherGroup, port}, "not joined");
  SendTo(sender, {kGroup, port}, "joined");
  sim::Endpoint from;

  ASSERT_EQ(Select(member, For::kRead, -1), 1);
  EXPECT_EQ(Pending(member), 6U);
  EXPECT_EQ(ReceiveFrom(member, from), "joined");
  EXPECT_EQ(from.address, kDevice) << "a group's datagram comes from the device's own address";
  EXPECT_EQ(Group(member, CE_IP_DROP_MEMBERSHIP, kGroup), 0);
  SendTo(sender, {kGroup, port}, "left");
  SendTo(sender, {kDevice, port}, "direct");
  EXPECT_EQ(ReceiveText(member), "direct");
  EXPECT_EQ(Select(member, For::kRead, 0), 0);
}

TYPED_TEST(SocketTest, LetsTwoSocketsOfOnePortHearTheSameGroup) {
  const SOCKET first = Udp();
  const SOCKET second = Udp();
  ASSERT_EQ(SetNumber(first, CE_SOL_SOCKET, CE_SO_REUSEADDR, 1), 0);
  ASSERT_EQ(SetNumber(second, CE_SOL_SOCKET, CE_SO_REUSEADDR, 1), 0);
  ASSERT_EQ(Bind(first, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(first).port;
  ASSERT_EQ(Bind(second, sim::kAnyAddress, port), 0);
  ASSERT_EQ(Group(first, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  ASSERT_EQ(Group(second, CE_IP_ADD_MEMBERSHIP, kGroup), 0);

  SendTo(Udp(), {kGroup, port}, "all");

  EXPECT_EQ(ReceiveText(first), "all");
  EXPECT_EQ(ReceiveText(second), "all");
}

TYPED_TEST(SocketTest, RefusesAPortThatIsTaken) {
  const SOCKET first = Udp();
  ASSERT_EQ(Bind(first, sim::kAnyAddress), 0);
  const SOCKET listener = Listener();

  EXPECT_EQ(Bind(Udp(), sim::kAnyAddress, LocalName(first).port), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRINUSE);
  const SOCKET second = Tcp();
  const bool refused =
      Bind(second, sim::kAnyAddress, LocalName(listener).port) != 0 || ce_listen(second, 1) != 0;
  EXPECT_TRUE(refused);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRINUSE);
}

TYPED_TEST(SocketTest, BelongsToTheDevicesOwnAddressOnly) {
  EXPECT_EQ(Bind(Tcp(), kServer), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
  EXPECT_EQ(Bind(Udp(), kServer), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
}

// ---- two devices on one host ----

TYPED_TEST(SocketTest, DoesNotTakeWhatIsMeantForAnotherDeviceOnTheSamePort) {
  sim::Profile profile;
  profile.address = "127.0.0.3";
  sim::Device other(this->world(), profile, this->folder() / "other");
  const SOCKET here = Udp();
  ASSERT_EQ(Bind(here, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(here).port;
  ASSERT_EQ(Group(here, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  const SOCKET listener = Listener();
  const std::uint16_t tcp_port = LocalName(listener).port;

  RunProgram(other, [port, tcp_port] {
    StartWinsock();
    const SOCKET there = Udp();
    EXPECT_EQ(Bind(there, sim::kAnyAddress, port), 0);
    EXPECT_EQ(Group(there, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
    SendTo(there, {kOther, port}, "to itself");
    SendTo(there, {kGroup, port}, "to the group");
    sim::Endpoint from;
    EXPECT_EQ(ReceiveFrom(there, from), "to itself");
    EXPECT_EQ(from, (sim::Endpoint{kOther, port}));
    EXPECT_EQ(ReceiveFrom(there, from), "to the group");
    EXPECT_EQ(Connect(Tcp(), kOther, tcp_port), CE_SOCKET_ERROR);
    EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED) << "the other device's listener is not ours";
    EXPECT_EQ(Connect(Tcp(), kDevice, tcp_port), 0);
    return 0U;
  });

  sim::Endpoint from;
  EXPECT_EQ(ReceiveFrom(here, from), "to the group");
  EXPECT_EQ(from, (sim::Endpoint{kOther, port}));
  EXPECT_EQ(Select(here, For::kRead, 0), 0);
  EXPECT_EQ(Select(listener, For::kRead, -1), 1);
}

// ---- termination, faults, leftovers ----

TYPED_TEST(SocketTest, LetsAThreadBeTerminatedWhileItWaitsForBytes) {
  const auto [client, server] = ConnectedPair();
  const SOCKET waiting = client;
  sim::SimThread* thread = nullptr;
  auto lock = this->world().Acquire();
  thread = &this->world().Spawn(
      this->device(), "waits for ever",
      [waiting] {
        ReceiveText(waiting);
        return 1U;
      },
      /*suspended=*/false);
  this->world().Terminate(*thread, 77);
  this->world().WaitUntil(lock, {&thread->finished}, std::nullopt,
                          [&] { return thread->state == sim::SimThread::State::kFinished; });
  lock.unlock();

  EXPECT_EQ(thread->exit_code, 77U);
  EXPECT_EQ(SendText(server, "unheard"), 7);
  EXPECT_EQ(ReceiveText(client), "unheard") << "the socket itself is still good";
}

TYPED_TEST(SocketTest, FindsTheSendBufferFullAsOftenAsATestSays) {
  const auto [client, server] = ConnectedPair();
  this->device().network().FillSendBuffer(2);

  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(SendText(client, "x"), CE_SOCKET_ERROR);
    EXPECT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
  }
  EXPECT_EQ(SendText(client, "x"), 1);
}

TYPED_TEST(SocketTest, FailsWithTheUsualErrorOfAFault) {
  this->device().faults().Add({"socket", 1, 1, 0});
  EXPECT_EQ(Tcp(), CE_INVALID_SOCKET);
  EXPECT_EQ(ce_WSAGetLastError(), WSAENETDOWN);

  this->device().faults().Add({"gethostbyname", 1, 1, 0});
  EXPECT_EQ(ce_gethostbyname("localhost"), nullptr);
  EXPECT_EQ(ce_WSAGetLastError(), WSAHOST_NOT_FOUND);

  this->device().faults().Add({"WSAStartup", 1, 1, 0});
  ce_WSADATA data;
  EXPECT_EQ(ce_WSAStartup(MAKEWORD(1, 1), &data), WSASYSNOTREADY);

  this->device().faults().Add({"inet_ntoa", 1, 1, 0});
  EXPECT_EQ(ce_inet_ntoa(ce_in_addr{}), nullptr);
}

/// A conversation that gives up at the first call that fails.
bool Converse(SOCKET listener) {
  const SOCKET client = Tcp();
  SOCKET server = CE_INVALID_SOCKET;
  ce_sockaddr_in name{};
  int size = sizeof name;
  char bytes[4] = {};
  std::uint32_t pending = 0;
  const bool whole = ce_getsockname(listener, reinterpret_cast<ce_sockaddr*>(&name), &size) == 0 &&
                     SetNumber(client, CE_IPPROTO_TCP, CE_TCP_NODELAY, 1) == 0 &&
                     Connect(client, kDevice, sim::ToEndpoint(name).port) == 0 &&
                     (server = ce_accept(listener, nullptr, nullptr)) != CE_INVALID_SOCKET &&
                     SendText(client, "ping") == 4 && Select(server, For::kRead, 1000) == 1 &&
                     ce_ioctlsocket(server, CE_FIONREAD, &pending) == 0 &&
                     ce_recv(server, bytes, 4, 0) == 4 && ce_shutdown(server, CE_SD_SEND) == 0 &&
                     ce_recv(client, bytes, 4, 0) == 0;
  const bool closed = ce_closesocket(server) == 0;
  return ce_closesocket(client) == 0 && closed && whole;
}

TYPED_TEST(SocketTest, SurvivesTheFailureOfEachCallInTurn) {
  std::uint64_t nth = 1;
  for (;; ++nth) {
    ASSERT_LT(nth, 100U);
    const SOCKET listener = Listener();
    const std::uint64_t fired = this->device().faults().fired();
    this->device().faults().Add({"*", nth, 1, 0});
    const bool whole = Converse(listener);
    const bool failed = this->device().faults().fired() > fired;
    this->device().faults().Clear();
    ce_closesocket(listener);
    EXPECT_EQ(whole, !failed) << "call " << nth << ", " << this->device().faults().last_fired();
    if (!failed) break;
  }

  EXPECT_EQ(nth, 14U) << "thirteen calls that can fail";
  ce_WSACleanup();
  EXPECT_EQ(this->device().network().open_sockets(), 0U);
}

TYPED_TEST(SocketTest, ClosesWhatIsLeftWhenWinsockIsCleanedUpForTheLastTime) {
  ce_WSADATA data;
  ASSERT_EQ(ce_WSAStartup(MAKEWORD(2, 2), &data), 0);
  const SOCKET socket = Udp();

  EXPECT_EQ(ce_WSACleanup(), 0);
  EXPECT_EQ(Bind(socket, sim::kAnyAddress), 0) << "one start-up is left";
  EXPECT_EQ(ce_WSACleanup(), 0);
  EXPECT_EQ(Bind(socket, sim::kAnyAddress), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSANOTINITIALISED);
  EXPECT_EQ(ce_WSACleanup(), CE_SOCKET_ERROR);
  StartWinsock();
  EXPECT_EQ(Bind(socket, sim::kAnyAddress), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAENOTSOCK);
}

TYPED_TEST(SocketTest, NeverUsesASocketNumberTwice) {
  const SOCKET first = Udp();
  ce_closesocket(first);

  EXPECT_NE(Udp(), first);
  EXPECT_EQ(ce_closesocket(first), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAENOTSOCK);
}

}  // namespace
