// Sockets whose threads are terminated, whose calls fail or whose program forgets them.
#include "faults/faults.h"
#include "simulator/net/socket_fixture.h"

namespace test {
namespace {

template <typename World>
using SocketLifeTest = SocketTest<World>;
TYPED_TEST_SUITE(SocketLifeTest, Worlds, WorldNames);

TYPED_TEST(SocketLifeTest, LetsAThreadBeTerminatedWhileItWaitsForBytes) {
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

TYPED_TEST(SocketLifeTest, FindsTheSendBufferFullAsOftenAsATestSays) {
  const auto [client, server] = ConnectedPair();
  this->device().network().FillSendBuffer(2);

  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(SendText(client, "x"), CE_SOCKET_ERROR);
    EXPECT_EQ(ce_WSAGetLastError(), WSAEWOULDBLOCK);
  }
  EXPECT_EQ(SendText(client, "x"), 1);
}

TYPED_TEST(SocketLifeTest, FailsWithTheUsualErrorOfAFault) {
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

TYPED_TEST(SocketLifeTest, SurvivesTheFailureOfEachCallInTurn) {
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

TYPED_TEST(SocketLifeTest, ClosesWhatIsLeftWhenWinsockIsCleanedUpForTheLastTime) {
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

TYPED_TEST(SocketLifeTest, NeverUsesASocketNumberTwice) {
  const SOCKET first = Udp();
  ce_closesocket(first);

  EXPECT_NE(Udp(), first);
  EXPECT_EQ(ce_closesocket(first), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAENOTSOCK);
}

}  // namespace
}  // namespace test
