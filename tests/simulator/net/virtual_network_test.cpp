// Devices and servers on the network of a virtual world, and a test's hand on it.
#include "net/virtual/virtual_network.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "net/virtual/virtual_server.h"
#include "simulator/net/sockets.h"
#include "trace/trace.h"

namespace {

using namespace std::chrono_literals;  // NOLINT(google-build-using-namespace)
using namespace test;                  // NOLINT(google-build-using-namespace)
using sim::Endpoint;
using sim::LinkProfile;
using sim::Micros;
using sim::StreamEnd;
using sim::StreamFaultKind;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

constexpr Endpoint kPort80{kServer, 80};

/// A program made of functions; what has none does nothing.
struct Script {
  std::function<void(StreamEnd&)> open;
  std::function<void(StreamEnd&, std::string_view)> bytes;
  std::function<void(StreamEnd&)> room;
  std::function<void(StreamEnd&)> end;
  std::function<void(int)> broken;
  std::function<void(StreamEnd&)> time;
};

class Scripted final : public sim::StreamProgram {
 public:
  explicit Scripted(const Script& script) : script_(script) {}

 private:
  void OnOpen(StreamEnd& end) override {
    if (script_.open) script_.open(end);
  }
  void OnBytes(StreamEnd& end, std::string_view bytes) override {
    if (script_.bytes) script_.bytes(end, bytes);
  }
  void OnRoom(StreamEnd& end) override {
    if (script_.room) script_.room(end);
  }
  void OnEnd(StreamEnd& end) override {
    if (script_.end) script_.end(end);
  }
  void OnBroken(StreamEnd& /*end*/, int error) override {
    if (script_.broken) script_.broken(error);
  }
  void OnTime(StreamEnd& end) override {
    if (script_.time) script_.time(end);
  }

  const Script& script_;
};

class VirtualNetworkTest : public DeviceTest {
 protected:
  VirtualNetworkTest() : network_(world()) { StartWinsock(); }

  /// A server at kPort80 that does what `script_` says when it happens.
  sim::VirtualServer& Serve() {
    server_ = std::make_unique<sim::VirtualServer>(
        world(), kPort80, [this](const Endpoint&) { return std::make_unique<Scripted>(script_); });
    return *server_;
  }
  /// A server that sends `bytes` to whoever connects, and closes.
  void ServeBytes(const std::string& bytes) {
    content_ = bytes;
    const auto pour = [this](StreamEnd& end) {
      poured_ += end.Send(std::string_view(content_).substr(poured_));
      if (poured_ == content_.size()) end.Close();
    };
    script_.open = pour;
    script_.room = pour;
    Serve();
  }
  SOCKET ConnectedSocket() {
    const SOCKET socket = Tcp();
    EXPECT_EQ(Connect(socket, kServer, 80), 0) << ce_WSAGetLastError();
    return socket;
  }
  [[nodiscard]] Micros now() { return world().now(); }

  sim::VirtualNetwork network_;
  Script script_;
  std::string content_;
  std::size_t poured_ = 0;
  std::unique_ptr<sim::VirtualServer> server_;
};

// ---- connecting ----

TEST_F(VirtualNetworkTest, RefusesAConnectionWhereNobodyListensAfterOneRoundTrip) {
  LinkProfile link;
  link.delay = 20ms;
  network_.SetDefaultLink(link);
  network_.SetHost(kServer, sim::HostState::kUp);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
  EXPECT_EQ(now(), 40ms);
}

TEST_F(VirtualNetworkTest, GivesUpConnectingToAnAddressWithoutAHost) {
  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAETIMEDOUT);
  EXPECT_EQ(now(), 21s);
}

TEST_F(VirtualNetworkTest, TellsOfAHostThatCannotBeReached) {
  network_.SetHost(kServer, sim::HostState::kUnreachable);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);

  EXPECT_EQ(ce_WSAGetLastError(), WSAEHOSTUNREACH);
}

TEST_F(VirtualNetworkTest, ShowsAFailedNonBlockingConnectInTheThirdSet) {
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

TEST_F(VirtualNetworkTest, ConnectsInOneRoundTripAndBringsBytesAfterTheDelay) {
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

TEST_F(VirtualNetworkTest, RefusesNewConnectionsOfAServerThatStoppedAccepting) {
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

TEST_F(VirtualNetworkTest, LetsAServerConnectToTheDevice) {
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

TEST_F(VirtualNetworkTest, RefusesWhomTheBacklogHasNoRoomFor) {
  const SOCKET listener = Tcp();
  ASSERT_EQ(Bind(listener, sim::kAnyAddress), 0);
  ASSERT_EQ(ce_listen(listener, 1), 0);
  const std::uint16_t port = LocalName(listener).port;
  ASSERT_EQ(Connect(Tcp(), kDevice, port), 0);

  EXPECT_EQ(Connect(Tcp(), kDevice, port), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAECONNREFUSED);
}

TEST_F(VirtualNetworkTest, AnswersTheNamesItWasGiven) {
  network_.AddName("Upgrade-Server", kServer);

  const ce_hostent* host = ce_gethostbyname("upgrade-server");

  ASSERT_NE(host, nullptr);
  EXPECT_EQ(std::string_view(host->h_addr_list[0], 4), std::string_view("\x7F\0\0\x02", 4));
  EXPECT_EQ(ce_gethostbyname("unknown"), nullptr);
}

// ---- the shape of a stream ----

TEST_F(VirtualNetworkTest, CutsAStreamIntoSegmentsThatComeOneByOne) {
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

TEST_F(VirtualNetworkTest, LetsAServerSayThingsLater) {
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

TEST_F(VirtualNetworkTest, BringsALongStreamWholeAndInOrder) {
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

TEST_F(VirtualNetworkTest, IsLimitedByTheBandwidthOfTheLink) {
  LinkProfile link;
  link.bytes_per_second = 1514 * 100;  // a hundred full segments a second
  network_.SetLink(kServer, kDevice, link);
  ServeBytes(std::string(1460 * 300, 'w'));
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveAll(socket).size(), 1460U * 300);

  EXPECT_GE(now(), 3s);
  EXPECT_LE(now(), 3s + 30ms);
}

TEST_F(VirtualNetworkTest, IsLimitedByTheReceiveBufferOverALongWay) {
  LinkProfile link;
  link.delay = 50ms;
  network_.SetDefaultLink(link);
  ServeBytes(std::string(32768 * 10, 'w'));
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(ReceiveAll(socket).size(), 32768U * 10);

  EXPECT_GE(now(), 950ms) << "32,768 bytes a round trip of 100 ms";
  EXPECT_LE(now(), 1500ms);
}

TEST_F(VirtualNetworkTest, HoldsBackASenderWhoseReceiverTakesNothing) {
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

TEST_F(VirtualNetworkTest, MovesSixteenMebibytesInFewSteps) {
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

TEST_F(VirtualNetworkTest, ResetsAConnectionAtTheByteATestNames) {
  network_.AddFault({kServer, kDevice, 2000, StreamFaultKind::kReset, 0ms, 2});
  ServeBytes(std::string(5000, 'r'));
  EXPECT_EQ(ReceiveAll(ConnectedSocket()).size(), 5000U) << "the second connection it is";
  poured_ = 0;

  EXPECT_THAT(ReceiveAll(ConnectedSocket()), HasSubstr("error 10054"));
  poured_ = 0;
  EXPECT_EQ(ReceiveAll(ConnectedSocket()).size(), 5000U) << "the third is whole again";
}

TEST_F(VirtualNetworkTest, EndsAStreamAtTheByteATestNames) {
  network_.AddFault({kServer, kDevice, 2000, StreamFaultKind::kEnd});
  ServeBytes(std::string(5000, 'e'));

  EXPECT_EQ(ReceiveAll(ConnectedSocket()), std::string(2000, 'e'));
}

TEST_F(VirtualNetworkTest, EndsAStreamBeforeItsFirstByte) {
  network_.AddFault({kServer, kDevice, 0, StreamFaultKind::kEnd});
  ServeBytes("never");

  EXPECT_EQ(ReceiveAll(ConnectedSocket()), "");
}

TEST_F(VirtualNetworkTest, StallsAStreamForAsLongAsATestSays) {
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

TEST_F(VirtualNetworkTest, StallsForEverWithoutATime) {
  network_.AddFault({kServer, kDevice, 0, StreamFaultKind::kStall});
  ServeBytes("never");
  const SOCKET socket = ConnectedSocket();

  EXPECT_EQ(Select(socket, For::kRead, 3600000), 0);
}

TEST_F(VirtualNetworkTest, HoldsALinkUntilItIsReleased) {
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

TEST_F(VirtualNetworkTest, TimesOutConnectingOverALinkThatHoldsEverything) {
  Serve();
  network_.Stall(kDevice, kServer);

  EXPECT_EQ(Connect(Tcp(), kServer, 80), CE_SOCKET_ERROR);
  EXPECT_EQ(ce_WSAGetLastError(), WSAETIMEDOUT);
}

TEST_F(VirtualNetworkTest, ResetsTheOpenConnectionsOfTwoHosts) {
  int broken = 0;
  script_.broken = [&](int error) { broken = error; };
  sim::VirtualServer& server = Serve();
  const SOCKET socket = ConnectedSocket();

  network_.ResetConnections(kDevice, kServer);

  EXPECT_EQ(ReceiveText(socket), "error 10054");
  EXPECT_EQ(broken, WSAECONNRESET);
  EXPECT_EQ(server.open_connections(), 0U);
}

TEST_F(VirtualNetworkTest, TellsAServerThatTheDeviceHasEndedItsStream) {
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

TEST_F(VirtualNetworkTest, BreaksTheServersEndWhenTheDeviceClosesOnUnreadBytes) {
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

TEST_F(VirtualNetworkTest, ClosesTheDevicesSocketsWhenItLosesItsPower) {
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

TEST_F(VirtualNetworkTest, LetsTimePassForAProgramThatAsksAgainAndAgain) {
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
}

// ---- datagrams ----

TEST_F(VirtualNetworkTest, CarriesDatagramsBetweenADeviceAndAServer) {
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

TEST_F(VirtualNetworkTest, SendsToAGroupOncePerMemberHost) {
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

TEST_F(VirtualNetworkTest, NeedsLeaveToSendToEveryone) {
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

TEST_F(VirtualNetworkTest, LosesDatagramsOnEachLinkForItself) {
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

TEST_F(VirtualNetworkTest, DropsWhatATestsFilterRefuses) {
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

TEST_F(VirtualNetworkTest, DropsDatagramsThatTheReceiveBufferHasNoRoomFor) {
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

TEST_F(VirtualNetworkTest, LosesDatagramsToAHostThatIsSilent) {
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

TEST_F(VirtualNetworkTest, LeadsLocalHostToTheDeviceItself) {
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

// ---- record and repetition ----

TEST_F(VirtualNetworkTest, RecordsWhatWasSentByWhomAndWhen) {
  LinkProfile link;
  link.delay = 5ms;
  network_.SetDefaultLink(link);
  script_.bytes = [](StreamEnd& end, std::string_view /*bytes*/) {
    end.Send("response");
    end.Close();
  };
  Serve();
  network_.StartCapture();
  const SOCKET socket = ConnectedSocket();
  const Endpoint local = LocalName(socket);
  SendText(socket, "request");
  ReceiveAll(socket);
  SendTo(Udp(), {kOther, 9}, "lost");
  network_.StopCapture();
  SendTo(Udp(), {kOther, 9}, "not recorded");

  EXPECT_EQ(network_.StreamBytes(local, kPort80), "request");
  EXPECT_EQ(network_.StreamBytes({kServer, 0}, {kDevice, 0}), "response");
  EXPECT_EQ(network_.FramesText(),
            "0.000000 connect 127.0.0.1:1025 > 127.0.0.2:80 at 127.0.0.2 0.005000\n"
            "0.005000 accept 127.0.0.2:80 > 127.0.0.1:1025 at 127.0.0.1 0.010000\n"
            "0.010000 tcp 127.0.0.1:1025 > 127.0.0.2:80 7 bytes at 127.0.0.2 0.015000\n"
            "0.015000 tcp 127.0.0.2:80 > 127.0.0.1:1025 8 bytes at 127.0.0.1 0.020000\n"
            "0.015000 end 127.0.0.2:80 > 127.0.0.1:1025 at 127.0.0.1 0.020000\n"
            "0.020000 udp 127.0.0.1:1026 > 127.0.0.3:9 4 bytes lost\n");
}

/// One busy quarter of a minute on a bad network, as everything that was sent and called.
std::string BusyRun(std::uint64_t seed) {
  const TemporaryFolder folder;
  const auto world = sim::World::MakeVirtual(seed);
  sim::Device device(*world, sim::Profile{}, folder.path() / "device");
  std::string record;
  device.trace().SetSink([&](std::string_view line) { record.append(line).append("\n"); });
  sim::VirtualNetwork network(*world);
  LinkProfile bad;
  bad.delay = 2ms;
  bad.jitter = 7ms;
  bad.loss = 0.1;
  bad.burst_begin = 0.02;
  bad.burst_end = 0.3;
  bad.duplicate = 0.05;
  bad.reorder = 0.05;
  bad.bytes_per_second = 500000;
  network.SetDefaultLink(bad);
  network.StartCapture();
  Script script;
  script.bytes = [](StreamEnd& end, std::string_view bytes) { end.Send(bytes); };
  sim::VirtualServer server(*world, kPort80,
                            [&](const Endpoint&) { return std::make_unique<Scripted>(script); });
  sim::VirtualPort port(*world, {kServer, 9},
                        [](sim::VirtualPort& at, const Endpoint& from, std::string_view bytes) {
                          at.Send(from, bytes);
                        });
  const auto stream = [] {
    const SOCKET socket = Tcp();
    Connect(socket, kServer, 80);
    for (int i = 0; i < 20; ++i) {
      SendText(socket, std::string(3000, 'a'));
      ReceiveText(socket);
    }
    return 0U;
  };
  const auto datagrams = [] {
    const SOCKET socket = Udp();
    for (int i = 0; i < 100; ++i) {
      SendTo(socket, {kServer, 9}, std::to_string(i));
      if (Select(socket, For::kRead, 5) == 1) ReceiveText(socket);
    }
    return 0U;
  };
  {
    const sim::AttachedThread host(device);
    StartWinsock();
    auto lock = world->Acquire();
    sim::SimThread& first = world->Spawn(device, "stream", stream, /*suspended=*/false);
    sim::SimThread& second = world->Spawn(device, "datagrams", datagrams, /*suspended=*/false);
    const auto finished = sim::SimThread::State::kFinished;
    world->WaitUntil(lock, {&first.finished, &second.finished}, std::nullopt,
                     [&] { return first.state == finished && second.state == finished; });
  }
  device.trace().SetSink({});
  return record + network.FramesText();
}

TEST(VirtualNetworkSeedTest, RepeatsARunByteForByteWithTheSameSeed) {
  const std::string record = BusyRun(11);

  EXPECT_GT(record.size(), 10000U);
  EXPECT_TRUE(BusyRun(11) == record);
  EXPECT_FALSE(BusyRun(12) == record);
}

}  // namespace
