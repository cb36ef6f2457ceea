// Datagrams on the network of a virtual world, to one host, to groups and to all.
#include <vector>

#include "simulator/net/virtual_network_fixture.h"

namespace test {
namespace {

using sim::Endpoint;
using sim::LinkProfile;
using ::testing::ElementsAre;

using VirtualDatagramTest = VirtualNetworkTest;

TEST_F(VirtualDatagramTest, CarriesDatagramsBetweenADeviceAndAServer) {
  std::vector<std::string> heard;
  sim::VirtualPort port(world(), {kServer, 514},
                        [&](sim::VirtualPort& at, const Endpoint& from, std::string_view bytes) {
                          heard.emplace_back(bytes);
                          at.Send(from, "answer");
                        });
  const SOCKET socket = Udp();
  SendTo(socket, {kServer, 514}, "question");
  Endpoint from;

  EXPECT_EQ(ReceiveFrom(socket, from), "answer");
  EXPECT_EQ(from, (Endpoint{kServer, 514}));
  EXPECT_THAT(heard, ElementsAre("question"));
}

TEST_F(VirtualDatagramTest, SendsToAGroupOncePerMemberHost) {
  std::vector<std::string> heard;
  const auto hear = [&](sim::VirtualPort& at, const Endpoint& from, std::string_view bytes) {
    heard.push_back(sim::ToText(at.local().address) + " hears " + std::string(bytes) + " from " +
                    sim::ToText(from.address));
  };
  sim::VirtualPort member(world(), {kServer, 4000}, hear);
  sim::VirtualPort stranger(world(), {kOther, 4000}, hear);
  member.Join(kGroup);
  const SOCKET socket = Udp();
  ASSERT_EQ(Bind(socket, sim::kAnyAddress, 4000), 0);
  ASSERT_EQ(Group(socket, CE_IP_ADD_MEMBERSHIP, kGroup), 0);

  SendTo(socket, {kGroup, 4000}, "all");
  EXPECT_EQ(ReceiveText(socket), "all") << "a member hears itself";
  ASSERT_EQ(SetNumber(socket, CE_IPPROTO_IP, CE_IP_MULTICAST_LOOP, 0), 0);
  SendTo(socket, {kGroup, 4000}, "others");
  EXPECT_EQ(Select(socket, For::kRead, 10), 0);
  ASSERT_EQ(SetNumber(socket, CE_IPPROTO_IP, CE_IP_MULTICAST_TTL, 0), 0);
  SendTo(socket, {kGroup, 4000}, "nobody");
  member.Leave(kGroup);
  Sleep(1);

  EXPECT_THAT(heard, ElementsAre("127.0.0.2 hears all from 127.0.0.1",
                                 "127.0.0.2 hears others from 127.0.0.1"));
}

TEST_F(VirtualDatagramTest, NeedsLeaveToSendToEveryone) {
  int heard = 0;
  sim::VirtualPort port(world(), {kServer, 9},
                        [&](sim::VirtualPort&, const Endpoint&, std::string_view) { ++heard; });
  const SOCKET socket = Udp();

  EXPECT_EQ(SendTo(socket, {sim::kBroadcastAddress, 9}, "x"), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAEACCES);
  ASSERT_EQ(SetNumber(socket, CE_SOL_SOCKET, CE_SO_BROADCAST, 1), 0);
  EXPECT_EQ(SendTo(socket, {sim::kBroadcastAddress, 9}, "x"), 1);
  Sleep(1);
  EXPECT_EQ(heard, 1);
}

TEST_F(VirtualDatagramTest, LosesDatagramsOnEachLinkForItself) {
  constexpr int kSent = 2000;
  int at_server = 0;
  int at_other = 0;
  sim::VirtualPort server(
      world(), {kServer, 4000},
      [&](sim::VirtualPort&, const Endpoint&, std::string_view) { ++at_server; });
  sim::VirtualPort other(world(), {kOther, 4000},
                         [&](sim::VirtualPort&, const Endpoint&, std::string_view) { ++at_other; });
  server.Join(kGroup);
  other.Join(kGroup);
  LinkProfile lossy;
  lossy.loss = 0.25;
  network_.SetLink(kDevice, kServer, lossy);
  const SOCKET socket = Udp();
  for (int i = 0; i < kSent; ++i) SendTo(socket, {kGroup, 4000}, "x");
  Sleep(1);

  EXPECT_NEAR(at_server, kSent * 3 / 4, 97);  // five standard deviations
  EXPECT_EQ(at_other, kSent);
}

TEST_F(VirtualDatagramTest, DropsWhatATestsFilterRefuses) {
  const SOCKET receiver = Udp();
  ASSERT_EQ(Bind(receiver, sim::kAnyAddress, 4000), 0);
  network_.SetDatagramFilter([](const sim::Frame& frame, sim::Address receiver_address) {
    return receiver_address != kDevice || frame.bytes != "bad";
  });
  SendTo(receiver, {kDevice, 4000}, "bad");
  SendTo(receiver, {kDevice, 4000}, "good");

  EXPECT_EQ(ReceiveText(receiver), "good");
  network_.SetDatagramFilter({});
  SendTo(receiver, {kDevice, 4000}, "bad");
  EXPECT_EQ(ReceiveText(receiver), "bad");
}

TEST_F(VirtualDatagramTest, DropsDatagramsThatTheReceiveBufferHasNoRoomFor) {
  const SOCKET receiver = Udp();
  ASSERT_EQ(Bind(receiver, sim::kAnyAddress, 4000), 0);
  ASSERT_EQ(SetNumber(receiver, CE_SOL_SOCKET, CE_SO_RCVBUF, 2100), 0);
  const SOCKET sender = Udp();
  for (int i = 0; i < 3; ++i) SendTo(sender, {kDevice, 4000}, std::string(1000, 'd'));
  Sleep(1);

  EXPECT_EQ(ReceiveText(receiver).size(), 1000U);
  EXPECT_EQ(ReceiveText(receiver).size(), 1000U);
  EXPECT_EQ(Select(receiver, For::kRead, 100), 0);
}

TEST_F(VirtualDatagramTest, LosesDatagramsToAHostThatIsSilent) {
  int heard = 0;
  sim::VirtualPort port(world(), {kServer, 9},
                        [&](sim::VirtualPort&, const Endpoint&, std::string_view) { ++heard; });
  network_.SetHost(kServer, sim::HostState::kSilent);
  SendTo(Udp(), {kServer, 9}, "x");
  Sleep(1);
  EXPECT_EQ(heard, 0);

  network_.SetHost(kServer, sim::HostState::kUp);
  SendTo(Udp(), {kServer, 9}, "x");
  Sleep(1);
  EXPECT_EQ(heard, 1);
}

TEST_F(VirtualDatagramTest, LeadsLocalHostToTheDeviceItself) {
  sim::Profile profile;
  profile.address = "10.0.0.7";
  Restart(profile);
  StartWinsock();
  // The network of this world knows 127.0.0.1 from the device that was.
  sim::Profile other_profile;
  other_profile.address = "10.0.0.8";
  const auto fresh = sim::World::MakeVirtual();
  sim::Device other(*fresh, other_profile, folder() / "other");
  RunProgram(other, [] {
    StartWinsock();
    const SOCKET socket = Udp();
    EXPECT_EQ(Bind(socket, sim::kLocalHost), 0);
    EXPECT_EQ(LocalName(socket).address, 0x0A000008U);
    SendTo(socket, {sim::kLocalHost, LocalName(socket).port}, "home");
    Endpoint from;
    EXPECT_EQ(ReceiveFrom(socket, from), "home");
    EXPECT_EQ(from.address, 0x0A000008U);
    return 0U;
  });
}

}  // namespace
}  // namespace test
