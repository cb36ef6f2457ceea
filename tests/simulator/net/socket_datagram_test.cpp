// What a device's program sees of its datagrams, the same in both worlds.
#include <algorithm>
#include <string>
#include <vector>

#include "simulator/net/socket_fixture.h"

namespace test {
namespace {

template <typename World>
using SocketDatagramTest = SocketTest<World>;
TYPED_TEST_SUITE(SocketDatagramTest, Worlds, WorldNames);

TYPED_TEST(SocketDatagramTest, KeepsDatagramsApart) {
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

TYPED_TEST(SocketDatagramTest, CutsADatagramThatIsLongerThanTheBuffer) {
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

TYPED_TEST(SocketDatagramTest, HearsOnlyItsPeerOnceItIsConnected) {
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

TYPED_TEST(SocketDatagramTest, HearsItsGroupsUntilItLeavesThem) {
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

TYPED_TEST(SocketDatagramTest, HearsItsGroupsAndItselfInTheOrderOfSending) {
  const SOCKET member = Udp();
  ASSERT_EQ(Bind(member, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(member).port;
  ASSERT_EQ(Group(member, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  ASSERT_EQ(Group(member, CE_IP_ADD_MEMBERSHIP, kOtherGroup), 0);
  const SOCKET sender = Udp();
  // A host begins to note arrivals a moment after it was asked to.
  for (int in_order = 0, i = 0; in_order < 3 && i < 10'000; ++i) {
    SendTo(sender, {kOtherGroup, port}, "first");
    SendTo(sender, {kDevice, port}, "second");
    in_order = ReceiveText(member) == "first" ? in_order + 1 : 0;
    ReceiveText(member);
  }
  const sim::Address kTargets[] = {kOtherGroup, kDevice, kGroup, kDevice, kOtherGroup, kGroup};
  for (int i = 0; i < 6; ++i) SendTo(sender, {kTargets[i], port}, std::to_string(i));

  for (int i = 0; i < 6; ++i) EXPECT_EQ(ReceiveText(member), std::to_string(i));
}

/// A device that gets its turn late finds more than it takes from the host at one time. A busy host
/// may be late with some of what it carries to itself: only what goes one way keeps its order.
TYPED_TEST(SocketDatagramTest, KeepsTheOrderOfALongBacklogAndWhatComesMeanwhile) {
  const SOCKET member = Udp();
  ASSERT_EQ(Bind(member, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(member).port;
  ASSERT_EQ(Group(member, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  const SOCKET sender = Udp();
  const auto is_direct = [](int i) { return i % 23 == 0; };
  const auto send = [&](int i) {
    SendTo(sender, {is_direct(i) ? kDevice : kGroup, port}, std::to_string(i));
  };
  for (int i = 0; i < 100; ++i) send(i);

  std::vector<int> came[2];
  for (int i = 0; i < 200; ++i) {
    ASSERT_EQ(Select(member, For::kRead, -1), 1);
    const int number = std::stoi(ReceiveText(member));
    came[is_direct(number) ? 1 : 0].push_back(number);
    if (i < 100) send(100 + i);
  }
  for (const auto& numbers : came) {
    EXPECT_TRUE(std::is_sorted(numbers.begin(), numbers.end()));
  }
  EXPECT_EQ(came[1].size(), 9U) << "0, 23, ... 184";
  EXPECT_EQ(Select(member, For::kRead, 0), 0);
}

TYPED_TEST(SocketDatagramTest, ShowsAListenerWhatIsSentAndReceived) {
  const SOCKET member = Udp();
  ASSERT_EQ(Bind(member, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(member).port;
  ASSERT_EQ(Group(member, CE_IP_ADD_MEMBERSHIP, kGroup), 0);
  std::vector<std::string> seen;
  this->device().network().ListenToDatagrams([&seen](const sim::SeenDatagram& datagram) {
    seen.push_back((datagram.sent ? "out " : "in ") + std::string(datagram.bytes) + " " +
                   sim::ToText(datagram.from.address));
  });

  SendTo(member, {kGroup, port}, "all");
  EXPECT_EQ(ReceiveText(member, 4096, CE_MSG_PEEK), "all") << "looking is not receiving";
  EXPECT_EQ(ReceiveText(member), "all");
  this->device().network().ListenToDatagrams({});
  SendTo(member, {kGroup, port}, "unseen");

  EXPECT_EQ(seen, (std::vector<std::string>{"out all 127.0.0.1", "in all 127.0.0.1"}));
}

TYPED_TEST(SocketDatagramTest, LetsTwoSocketsOfOnePortHearTheSameGroup) {
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

TYPED_TEST(SocketDatagramTest, RefusesAPortThatIsTaken) {
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

TYPED_TEST(SocketDatagramTest, BelongsToTheDevicesOwnAddressOnly) {
  EXPECT_EQ(Bind(Tcp(), kServer), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
  EXPECT_EQ(Bind(Udp(), kServer), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEADDRNOTAVAIL);
}

// ---- two devices on one host ----

TYPED_TEST(SocketDatagramTest, DoesNotTakeWhatIsMeantForAnotherDeviceOnTheSamePort) {
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

}  // namespace
}  // namespace test
