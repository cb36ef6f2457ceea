#include <gmock/gmock.h>

#include <chrono>
#include <string>
#include <vector>

#include "faults/faults.h"
#include "net/network.h"
#include "net/virtual/virtual_server.h"
#include "support/device_test.h"
// The platform's own names come last.
#include "mcftp/udp_socket/udp_socket.h"

namespace {

using mcftp::Datagram;
using mcftp::UdpEndpoint;
using mcftp::UdpNetwork;
using std::chrono::hours;
using std::chrono::milliseconds;
using ::testing::ElementsAre;

constexpr sim::Address kDevice = 0x0A000001;  // 10.0.0.1
constexpr sim::Address kServer = 0x0A000002;
constexpr sim::Address kGroup = 0xEF010203;  // 239.1.2.3
constexpr std::uint16_t kPort = 5000;

sim::Profile DeviceProfile() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  profile.host_name = "mr7";
  return profile;
}

class UdpSocketTest : public DeviceTest {
 protected:
  UdpSocketTest()
      : DeviceTest(DeviceProfile()),
        server_(world(), {kServer, 6000},
                [this](sim::VirtualPort&, const sim::Endpoint& from, std::string_view bytes) {
                  received_.emplace_back(sim::ToText(from) + " " + std::string(bytes));
                }) {
    EXPECT_TRUE(network_.Start());
  }

  void OpenOnPort() {
    ASSERT_TRUE(endpoint_.Create());
    ASSERT_TRUE(endpoint_.Bind(kPort));
  }
  void SendAfter(milliseconds delay, const std::string& bytes, sim::Address to = kDevice) {
    network().At(world().now() + delay, [=] { server_.Send({to, kPort}, bytes); });
  }
  std::string Receive(std::uint32_t timeout_ms) {
    const Datagram datagram = network_.Receive(endpoint_, timeout_ms);
    if (!datagram) return "<nothing>";
    EXPECT_EQ(datagram.bytes[datagram.length], 0);
    return {reinterpret_cast<const char*>(datagram.bytes), datagram.length};
  }
  sim::VirtualNetwork network() { return sim::VirtualNetwork(world()); }
  milliseconds Now() { return std::chrono::duration_cast<milliseconds>(world().now()); }

  UdpNetwork network_;
  UdpEndpoint endpoint_;
  std::vector<std::string> received_;
  sim::VirtualPort server_;
};

TEST(ParseAddressTest, TakesDottedAddressesOnly) {
  EXPECT_EQ(mcftp::ParseAddress(nullptr), INADDR_NONE);
  EXPECT_EQ(mcftp::ParseAddress(""), INADDR_NONE);
}

TEST_F(UdpSocketTest, ReadsAnAddressInNetworkOrder) {
  EXPECT_EQ(mcftp::ParseAddress("10.0.0.2"), 0x0200000AU);
  EXPECT_EQ(mcftp::ParseAddress("syslog"), INADDR_NONE);
  EXPECT_EQ(mcftp::ParseAddress(" "), INADDR_NONE) << "the platform itself reads 0.0.0.0";
  EXPECT_EQ(mcftp::ParseAddress("255.255.255.255"), INADDR_NONE);
}

TEST_F(UdpSocketTest, KnowsTheHostsNamesAndAddress) {
  EXPECT_STREQ(network_.host_name(), "mr7");
  EXPECT_STREQ(network_.full_name(), "mr7");
  EXPECT_EQ(network_.own_address(), 0x0100000AU);
  EXPECT_EQ(network_.own_address_text().view(), "10.0.0.1");
}

TEST_F(UdpSocketTest, StartsForAHostThatDoesNotKnowItself) {
  device().faults().Add({"gethostbyname"});
  UdpNetwork network;

  EXPECT_TRUE(network.Start());

  EXPECT_STREQ(network.host_name(), "mr7");
  EXPECT_EQ(network.own_address(), 0U);
}

TEST_F(UdpSocketTest, HoldsOneReferenceToWindowsSockets) {
  {
    UdpNetwork network;
    EXPECT_TRUE(network.Start());
    EXPECT_TRUE(network.Start());
    EXPECT_EQ(device().network().started(), 2U);
  }
  EXPECT_EQ(device().network().started(), 1U);
}

TEST_F(UdpSocketTest, SaysWhenWindowsSocketsDoesNotStart) {
  device().faults().Add({"WSAStartup"});
  UdpNetwork network;

  EXPECT_FALSE(network.Start());
}

TEST_F(UdpSocketTest, ShowsAndTakesAddressAndPort) {
  endpoint_.SetAddress(mcftp::ParseAddress("10.0.0.2"));
  endpoint_.SetPort(514);

  EXPECT_EQ(endpoint_.port(), 514);
  EXPECT_EQ(endpoint_.address_text().view(), "10.0.0.2");
  EXPECT_EQ(endpoint_.address().sin_port, 0x0202) << "network order";
}

TEST_F(UdpSocketTest, SendsOneDatagramToAnEndpoint) {
  OpenOnPort();
  UdpEndpoint target;
  target.SetAddress(mcftp::ParseAddress("10.0.0.2"));
  target.SetPort(6000);

  EXPECT_TRUE(endpoint_.SendTo(target, "hello", 5));

  Sleep(10);
  EXPECT_THAT(received_, ElementsAre("10.0.0.1:5000 hello"));
}

TEST_F(UdpSocketTest, SaysWhenSendingFails) {
  UdpEndpoint target;
  EXPECT_FALSE(endpoint_.SendTo(target, "x", 1)) << "no socket";
  OpenOnPort();
  device().faults().Add({"sendto", 1, 1, WSAENETDOWN});

  EXPECT_FALSE(endpoint_.SendTo(target, "x", 1));
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(WSAENETDOWN));
}

TEST_F(UdpSocketTest, ReceivesADatagramAndItsSender) {
  OpenOnPort();
  SendAfter(milliseconds(300), "hello");

  const Datagram datagram = network_.Receive(endpoint_, 1000);

  ASSERT_TRUE(datagram);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(datagram.bytes), datagram.length), "hello");
  EXPECT_EQ(datagram.sender.sin_addr.s_addr, 0x0200000AU);
  EXPECT_EQ(ntohs(datagram.sender.sin_port), 6000);
  EXPECT_EQ(Now(), milliseconds(300));
}

TEST_F(UdpSocketTest, ReturnsNothingAfterTheTimeout) {
  OpenOnPort();

  EXPECT_EQ(Receive(1500), "<nothing>");

  EXPECT_EQ(Now(), milliseconds(1500));
}

TEST_F(UdpSocketTest, ATimeoutOfZeroWaitsWithoutLimit) {
  OpenOnPort();
  SendAfter(hours(24), "late");

  EXPECT_EQ(Receive(0), "late");
}

TEST_F(UdpSocketTest, TakesSeveralWaitingDatagramsOneByOne) {
  OpenOnPort();
  SendAfter(milliseconds(1), "one");
  SendAfter(milliseconds(2), "");
  SendAfter(milliseconds(3), "three");
  Sleep(10);

  EXPECT_EQ(Receive(100), "one");
  EXPECT_EQ(Receive(100), "three") << "an empty datagram is skipped";
  EXPECT_EQ(Receive(100), "<nothing>");
}

TEST_F(UdpSocketTest, AnEmptyDatagramDoesNotEndTheWait) {
  OpenOnPort();
  SendAfter(milliseconds(10), "");
  SendAfter(milliseconds(500), "hello");

  EXPECT_EQ(Receive(1000), "hello");
}

TEST_F(UdpSocketTest, TakesALargeDatagramWhole) {
  OpenOnPort();
  const std::string large(30000, 'x');
  SendAfter(milliseconds(1), large);

  EXPECT_EQ(Receive(1000), large);
}

TEST_F(UdpSocketTest, NeverDeliversWhatTheHostSentToAGroupThatItHasJoined) {
  OpenOnPort();
  ASSERT_TRUE(endpoint_.JoinGroup("239.1.2.3"));
  UdpEndpoint group;
  group.SetAddress(mcftp::ParseAddress("239.1.2.3"));
  group.SetPort(kPort);
  EXPECT_TRUE(endpoint_.SendTo(group, "own", 3));
  SendAfter(milliseconds(500), "other", kGroup);

  EXPECT_EQ(Receive(1000), "other");
  EXPECT_EQ(Receive(1000), "<nothing>");
}

TEST_F(UdpSocketTest, FiltersNothingWhileTheOwnAddressIsUnknown) {
  device().faults().Add({"gethostbyname"});
  UdpNetwork unknowing;
  ASSERT_TRUE(unknowing.Start());
  OpenOnPort();
  UdpEndpoint self;
  self.SetAddress(mcftp::ParseAddress("10.0.0.1"));
  self.SetPort(kPort);
  EXPECT_TRUE(endpoint_.SendTo(self, "own", 3));

  EXPECT_TRUE(unknowing.Receive(endpoint_, 1000));
}

TEST_F(UdpSocketTest, AFloodOfEmptyDatagramsUsesUpTheWaitAndNoMore) {
  OpenOnPort();
  for (int i = 0; i < 3000; ++i) SendAfter(milliseconds(i), "");

  EXPECT_EQ(Receive(2000), "<nothing>") << "a flood does not hold the caller";
  EXPECT_NEAR(static_cast<double>(Now().count()), 2000, 2);
  EXPECT_EQ(Receive(2000), "<nothing>");
  EXPECT_NEAR(static_cast<double>(Now().count()), 4000, 4);
}

TEST_F(UdpSocketTest, TheHostsOwnDatagramsRenewTheWait) {
  OpenOnPort();
  ASSERT_TRUE(endpoint_.JoinGroup("239.1.2.3"));
  UdpEndpoint group;
  group.SetAddress(mcftp::ParseAddress("239.1.2.3"));
  group.SetPort(kPort);
  sim::VirtualPort self(world(), {kDevice, 0}, nullptr);
  network().At(milliseconds(900), [&] { self.Send({kGroup, kPort}, "own"); });
  SendAfter(milliseconds(1800), "hello");

  EXPECT_EQ(Receive(1000), "hello");
}

TEST_F(UdpSocketTest, GoesOnWaitingWhenAnEarlierDatagramFoundNoReceiver) {
  OpenOnPort();
  SendAfter(milliseconds(10), "one");
  SendAfter(milliseconds(20), "two");
  device().faults().Add({"recvfrom", 1, 1, WSAECONNRESET});

  EXPECT_EQ(Receive(1000), "one");
  EXPECT_EQ(Receive(1000), "two");
}

TEST_F(UdpSocketTest, ListensOnTwoSocketsAtOnce) {
  OpenOnPort();
  UdpEndpoint other;
  ASSERT_TRUE(other.Create());
  ASSERT_TRUE(other.Bind(kPort + 1));
  const auto receive = [&](std::uint32_t timeout_ms) {
    device::Deadline deadline(timeout_ms);
    const Datagram datagram = network_.Receive(endpoint_, &other, deadline);
    if (!datagram) return std::string("<nothing>");
    return std::string(reinterpret_cast<const char*>(datagram.bytes), datagram.length);
  };
  network().At(milliseconds(10), [&] { server_.Send({kDevice, kPort + 1}, "other"); });
  SendAfter(milliseconds(20), "first");
  EXPECT_EQ(receive(1000), "other");
  EXPECT_EQ(receive(1000), "first");
  EXPECT_EQ(receive(1000), "<nothing>");

  for (int i = 0; i < 3; ++i) {
    SendAfter(milliseconds(1), "first");
    network().At(world().now() + milliseconds(1), [&] {
      server_.Send({kDevice, kPort + 1}, "other");
    });
  }
  Sleep(10);
  std::string order;
  for (int i = 0; i < 6; ++i) order += receive(1000)[0];
  EXPECT_EQ(order, "ofofof") << "they take turns";
  other.Close();
  SendAfter(milliseconds(1), "first");
  EXPECT_EQ(receive(1000), "first") << "one alone does as well";
}

TEST_F(UdpSocketTest, ReturnsNothingWhenACallFails) {
  OpenOnPort();
  for (const char* call : {"select", "ioctlsocket", "recvfrom"}) {
    SendAfter(milliseconds(1), "hello");
    device().faults().Add({call});
    EXPECT_EQ(Receive(1000), "<nothing>") << call;
    device().faults().Clear();
    Sleep(10);
    while (Receive(1) != "<nothing>") {
    }
  }
}

TEST_F(UdpSocketTest, ReturnsNothingWithoutMemoryOrWithoutASocket) {
  EXPECT_EQ(Receive(1000), "<nothing>");
  OpenOnPort();
  UdpNetwork network;
  device().faults().Add({"LocalAlloc", 1, 0});

  EXPECT_FALSE(network.Receive(endpoint_, 1000));
}

TEST_F(UdpSocketTest, CountsTheGroupsThatItJoined) {
  OpenOnPort();
  EXPECT_EQ(endpoint_.joined_groups(), 0);

  EXPECT_TRUE(endpoint_.JoinGroup("239.1.2.3"));
  EXPECT_EQ(endpoint_.joined_groups(), 1);
  EXPECT_FALSE(endpoint_.JoinGroup("10.0.0.2"));
  EXPECT_EQ(endpoint_.joined_groups(), 1);

  EXPECT_TRUE(endpoint_.LeaveGroup()) << "the group joined last, not the one refused";
  EXPECT_EQ(endpoint_.joined_groups(), 0);
  SendAfter(milliseconds(1), "to nobody", kGroup);
  EXPECT_EQ(Receive(100), "<nothing>");
}

TEST_F(UdpSocketTest, LetsTwoSocketsShareAPort) {
  OpenOnPort();
  UdpEndpoint second;
  ASSERT_TRUE(second.Create());
  EXPECT_FALSE(second.Bind(kPort));

  UdpEndpoint first;
  UdpEndpoint other;
  ASSERT_TRUE(first.Create() && first.AllowAddressReuse() && first.Bind(kPort + 1));
  EXPECT_TRUE(other.Create() && other.AllowAddressReuse() && other.Bind(kPort + 1));
}

TEST_F(UdpSocketTest, ClosesItsSocketAtTheEndAndWhenMadeAnew) {
  EXPECT_FALSE(endpoint_.Close());
  {
    UdpEndpoint endpoint;
    EXPECT_TRUE(endpoint.Create());
    EXPECT_TRUE(endpoint.Create());
    EXPECT_EQ(device().network().open_sockets(), 1U);
    EXPECT_TRUE(endpoint.Close());
    EXPECT_FALSE(endpoint.is_open());
    EXPECT_TRUE(endpoint.Create());
  }
  EXPECT_EQ(device().network().open_sockets(), 0U);
}

}  // namespace
