// Windows Sockets, seen through the platform alone. Every test talks to its own host only.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <utility>

#include "conformance/differences.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;

constexpr DWORD kPoison = 0xDEADBEEF;

class WinsockTest : public ::testing::Test {
 protected:
  WinsockTest() {
    WSADATA data;
    EXPECT_EQ(WSAStartup(MAKEWORD(1, 1), &data), 0);
    SetLastError(kPoison);
  }
  ~WinsockTest() override { WSACleanup(); }

  static sockaddr_in Address(const char* text, int port) {
    sockaddr_in address;
    std::memset(&address, 0, sizeof address);
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<WORD>(port));
    address.sin_addr.s_addr = inet_addr(text);
    return address;
  }
  static sockaddr* Plain(sockaddr_in& address) { return reinterpret_cast<sockaddr*>(&address); }

  static SOCKET Bound(int type) {
    const SOCKET bound = socket(AF_INET, type, 0);
    sockaddr_in address = Address("127.0.0.1", 0);
    EXPECT_EQ(bind(bound, Plain(address), sizeof address), 0);
    return bound;
  }
  static sockaddr_in NameOf(SOCKET bound) {
    sockaddr_in name;
    int size = sizeof name;
    EXPECT_EQ(getsockname(bound, Plain(name), &size), 0);
    return name;
  }
  static std::pair<SOCKET, SOCKET> ConnectedPair() {
    const SOCKET listener = Bound(SOCK_STREAM);
    EXPECT_EQ(listen(listener, 1), 0);
    sockaddr_in target = NameOf(listener);
    const SOCKET client = socket(AF_INET, SOCK_STREAM, IPPROTO_TCP);
    EXPECT_EQ(connect(client, Plain(target), sizeof target), 0);
    const SOCKET server = accept(listener, nullptr, nullptr);
    EXPECT_NE(server, INVALID_SOCKET);
    closesocket(listener);
    return {client, server};
  }
  static bool BecomesReadable(SOCKET waiting) {
    fd_set set;
    FD_ZERO(&set);
    FD_SET(waiting, &set);
    timeval limit = {10, 0};
    return select(0, &set, nullptr, nullptr, &limit) == 1;
  }
};

// ---- start-up ----

TEST(WinsockStartTest, RefusesEveryCallBeforeStartUp) {
  SetLastError(kPoison);
  EXPECT_EQ(socket(AF_INET, SOCK_STREAM, 0), INVALID_SOCKET);
  EXPECT_EQ(WSAGetLastError(), WSANOTINITIALISED);
  if (!Differs(Difference::kHostName)) {
    char name[16];
    EXPECT_EQ(gethostname(name, sizeof name), SOCKET_ERROR);
    EXPECT_EQ(WSAGetLastError(), WSANOTINITIALISED);
  }
  EXPECT_EQ(gethostbyname("localhost"), nullptr);
  EXPECT_EQ(WSAGetLastError(), WSANOTINITIALISED);
  EXPECT_EQ(WSACleanup(), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSANOTINITIALISED);
}

TEST(WinsockStartTest, GrantsTheVersionThatBothKnow) {
  const struct {
    WORD wanted;
    WORD granted;
  } kCases[] = {{MAKEWORD(1, 0), MAKEWORD(1, 0)},
                {MAKEWORD(1, 1), MAKEWORD(1, 1)},
                {MAKEWORD(2, 0), MAKEWORD(2, 0)},
                {MAKEWORD(2, 2), MAKEWORD(2, 2)},
                {MAKEWORD(3, 7), MAKEWORD(2, 2)}};
  for (const auto& c : kCases) {
    WSADATA data;
    std::memset(&data, 0xBD, sizeof data);
    ASSERT_EQ(WSAStartup(c.wanted, &data), 0);
    EXPECT_EQ(data.wVersion, c.granted) << std::hex << c.wanted;
    EXPECT_EQ(data.wHighVersion, MAKEWORD(2, 2));
    EXPECT_EQ(WSACleanup(), 0);
  }
}

TEST(WinsockStartTest, RefusesAVersionBeforeTheFirst) {
  WSADATA data;
  EXPECT_EQ(WSAStartup(MAKEWORD(0, 9), &data), WSAVERNOTSUPPORTED);
  EXPECT_EQ(WSAStartup(MAKEWORD(1, 1), nullptr), WSAEFAULT);
}

// ---- errors ----

TEST_F(WinsockTest, SharesTheLastErrorOfTheThread) {
  EXPECT_EQ(closesocket(INVALID_SOCKET), SOCKET_ERROR);

  EXPECT_EQ(WSAGetLastError(), WSAENOTSOCK);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(WSAENOTSOCK));
  SetLastError(4711);
  EXPECT_EQ(WSAGetLastError(), 4711);
  WSASetLastError(WSAEINTR);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(WSAEINTR));
}

TEST_F(WinsockTest, LeavesTheLastErrorAloneWhenAllIsWell) {
  const SOCKET bound = Bound(SOCK_DGRAM);
  SetLastError(kPoison);
  EXPECT_EQ(closesocket(bound), 0);
  EXPECT_EQ(GetLastError(), kPoison);
}

TEST_F(WinsockTest, RefusesSocketsOfKindsItDoesNotHave) {
  EXPECT_EQ(socket(AF_INET + 1, SOCK_STREAM, 0), INVALID_SOCKET);
  EXPECT_EQ(WSAGetLastError(), WSAEAFNOSUPPORT);
  EXPECT_EQ(socket(AF_INET, 77, 0), INVALID_SOCKET);
  EXPECT_EQ(WSAGetLastError(), WSAESOCKTNOSUPPORT);
  EXPECT_EQ(socket(AF_INET, SOCK_STREAM, 77), INVALID_SOCKET);
  EXPECT_EQ(WSAGetLastError(), WSAEPROTONOSUPPORT);
}

TEST_F(WinsockTest, RefusesWhatIsNoAddress) {
  const SOCKET unbound = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address = Address("127.0.0.1", 0);

  EXPECT_EQ(bind(unbound, Plain(address), 15), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(bind(unbound, nullptr, 16), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  address.sin_family = 77;
  EXPECT_EQ(bind(unbound, Plain(address), sizeof address), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEAFNOSUPPORT);
}

TEST_F(WinsockTest, BindsASocketOnce) {
  const SOCKET bound = Bound(SOCK_DGRAM);
  sockaddr_in address = Address("127.0.0.1", 0);

  EXPECT_EQ(bind(bound, Plain(address), sizeof address), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
}

TEST_F(WinsockTest, NeedsAConnectionForBytes) {
  const SOCKET lonely = Bound(SOCK_STREAM);
  char byte = 'x';

  EXPECT_EQ(send(lonely, &byte, 1, 0), SOCKET_ERROR);
  if (!Differs(Difference::kUnconnected)) {
    EXPECT_EQ(WSAGetLastError(), WSAENOTCONN);
  }
  EXPECT_EQ(recv(lonely, &byte, 1, 0), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAENOTCONN);
  EXPECT_EQ(shutdown(lonely, SD_SEND), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAENOTCONN);
  sockaddr_in name;
  int size = sizeof name;
  EXPECT_EQ(getpeername(lonely, Plain(name), &size), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAENOTCONN);
  EXPECT_EQ(byte, 'x');
}

TEST_F(WinsockTest, NeedsABindBeforeItListensOrReceivesDatagrams) {
  EXPECT_EQ(listen(socket(AF_INET, SOCK_STREAM, 0), 1), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
  EXPECT_EQ(listen(Bound(SOCK_DGRAM), 1), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEOPNOTSUPP);
  if (!Differs(Difference::kAccept)) {
    EXPECT_EQ(accept(Bound(SOCK_STREAM), nullptr, nullptr), INVALID_SOCKET);
    EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
  }
  if (!Differs(Difference::kAccept)) {
    char byte;
    EXPECT_EQ(recvfrom(socket(AF_INET, SOCK_DGRAM, 0), &byte, 1, 0, nullptr, nullptr),
              SOCKET_ERROR);
    EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
  }
  sockaddr_in name;
  int size = sizeof name;
  EXPECT_EQ(getsockname(socket(AF_INET, SOCK_DGRAM, 0), Plain(name), &size), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
}

TEST_F(WinsockTest, RefusesADatagramThatIsTooLong) {
  const SOCKET sender = socket(AF_INET, SOCK_DGRAM, 0);
  sockaddr_in target = Address("127.0.0.1", 9);
  const std::string bytes(65508, 'x');

  EXPECT_EQ(sendto(sender, bytes.data(), 65508, 0, Plain(target), sizeof target), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEMSGSIZE);
}

TEST_F(WinsockTest, RefusesBuffersThatCannotBe) {
  const auto [client, server] = ConnectedPair();

  EXPECT_EQ(recv(client, nullptr, 1, 0), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(send(client, nullptr, 1, 0), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(ioctlsocket(server, FIONREAD, nullptr), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
}

// ---- bytes ----

TEST_F(WinsockTest, ReceivesNoMoreThanThereIsRoomFor) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(send(server, "abcdef", 6, 0), 6);
  ASSERT_TRUE(BecomesReadable(client));
  std::array<char, 8> buffer;
  buffer.fill('#');

  EXPECT_EQ(recv(client, buffer.data(), 4, 0), 4);

  EXPECT_EQ(std::string(buffer.data(), 8), "abcd####");
  EXPECT_EQ(recv(client, buffer.data(), 8, 0), 2);
  EXPECT_EQ(std::string(buffer.data(), 8), "efcd####") << "what was not received stays as it was";
}

TEST_F(WinsockTest, WritesOnlyTheAddressItSaysItWrites) {
  const SOCKET receiver = Bound(SOCK_DGRAM);
  sockaddr_in target = NameOf(receiver);
  const SOCKET sender = Bound(SOCK_DGRAM);
  ASSERT_EQ(sendto(sender, "hi", 2, 0, Plain(target), sizeof target), 2);
  struct {
    sockaddr_in address;
    BYTE behind[16];
  } from;
  std::memset(&from, 0xBD, sizeof from);
  int size = sizeof from;
  char bytes[4] = {'#', '#', '#', '#'};

  EXPECT_EQ(recvfrom(receiver, bytes, 4, 0, Plain(from.address), &size), 2);

  EXPECT_EQ(std::string(bytes, 4), "hi##");
  EXPECT_EQ(size, 16);
  EXPECT_EQ(from.address.sin_family, AF_INET);
  EXPECT_EQ(from.address.sin_port, NameOf(sender).sin_port);
  EXPECT_EQ(from.address.sin_addr.s_addr, inet_addr("127.0.0.1"));
  const BYTE behind = Differs(Difference::kAddressRoom) ? 0 : 0xBD;
  for (const BYTE byte : from.behind) EXPECT_EQ(byte, behind);
}

TEST_F(WinsockTest, NeedsRoomForAnAddressItIsAskedFor) {
  if (Differs(Difference::kShortRoom)) GTEST_SKIP() << "addresses are cut here";
  const SOCKET receiver = Bound(SOCK_DGRAM);
  sockaddr_in target = NameOf(receiver);
  ASSERT_EQ(sendto(Bound(SOCK_DGRAM), "x", 1, 0, Plain(target), sizeof target), 1);
  sockaddr_in from;
  std::memset(&from, 0xBD, sizeof from);
  int size = 15;
  char byte;

  EXPECT_EQ(recvfrom(receiver, &byte, 1, 0, Plain(from), &size), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(getsockname(receiver, Plain(from), &size), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(from.sin_port, 0xBDBD);
}

TEST_F(WinsockTest, LeavesTheSendersAddressAloneOnAStream) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(send(server, "x", 1, 0), 1);
  sockaddr_in from;
  std::memset(&from, 0xBD, sizeof from);
  int size = sizeof from;
  char byte;

  EXPECT_EQ(recvfrom(client, &byte, 1, 0, Plain(from), &size), 1);

  EXPECT_EQ(from.sin_port, 0xBDBD);
}

TEST_F(WinsockTest, ShowsTheEndOfTheStreamAsNoBytes) {
  const auto [client, server] = ConnectedPair();
  ASSERT_EQ(shutdown(server, SD_SEND), 0);
  ASSERT_TRUE(BecomesReadable(client));
  char byte = '#';
  DWORD pending = kPoison;

  EXPECT_EQ(ioctlsocket(client, FIONREAD, &pending), 0);
  EXPECT_EQ(pending, 0U);
  EXPECT_EQ(recv(client, &byte, 1, MSG_PEEK), 0);
  EXPECT_EQ(recv(client, &byte, 1, 0), 0);
  EXPECT_EQ(byte, '#');
}

TEST_F(WinsockTest, WouldBlockOnlyWhenTold) {
  const auto [client, server] = ConnectedPair();
  DWORD on = 1;
  ASSERT_EQ(ioctlsocket(client, FIONBIO, &on), 0);
  char byte = '#';

  EXPECT_EQ(recv(client, &byte, 1, 0), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEWOULDBLOCK);
  DWORD off = 0;
  ASSERT_EQ(ioctlsocket(client, FIONBIO, &off), 0);
  ASSERT_EQ(send(server, "x", 1, 0), 1);
  EXPECT_EQ(recv(client, &byte, 1, 0), 1);
  EXPECT_EQ(byte, 'x');
}

// ---- select ----

TEST_F(WinsockTest, SelectsNothingFromNothing) {
  timeval limit = {0, 0};
  EXPECT_EQ(select(0, nullptr, nullptr, nullptr, &limit), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
  fd_set empty;
  FD_ZERO(&empty);
  EXPECT_EQ(select(0, &empty, nullptr, nullptr, &limit), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEINVAL);
}

TEST_F(WinsockTest, RefusesASelectOnWhatIsNoSocket) {
  const SOCKET closed = Bound(SOCK_DGRAM);
  closesocket(closed);
  fd_set set;
  FD_ZERO(&set);
  FD_SET(closed, &set);
  timeval limit = {0, 0};

  EXPECT_EQ(select(0, &set, nullptr, nullptr, &limit), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAENOTSOCK);
  EXPECT_EQ(set.fd_count, 1U) << "a failed call leaves the sets alone";
}

TEST_F(WinsockTest, EmptiesTheSetsWhenTheTimeIsOver) {
  const SOCKET quiet = Bound(SOCK_DGRAM);
  fd_set set;
  FD_ZERO(&set);
  FD_SET(quiet, &set);
  timeval limit = {0, 1000};

  EXPECT_EQ(select(0, &set, nullptr, nullptr, &limit), 0);
  EXPECT_EQ(set.fd_count, 0U);
  EXPECT_FALSE(FD_ISSET(quiet, &set));
}

TEST_F(WinsockTest, FindsADatagramSocketWritable) {
  const SOCKET writer = Bound(SOCK_DGRAM);
  fd_set set;
  FD_ZERO(&set);
  FD_SET(writer, &set);

  EXPECT_EQ(select(0, nullptr, &set, nullptr, nullptr), 1);
  EXPECT_TRUE(FD_ISSET(writer, &set));
}

// ---- options ----

TEST_F(WinsockTest, KeepsItsOptions) {
  const SOCKET stream = socket(AF_INET, SOCK_STREAM, 0);
  const struct {
    int level;
    int option;
    int value;
  } kCases[] = {{SOL_SOCKET, SO_REUSEADDR, 1},
                {SOL_SOCKET, SO_KEEPALIVE, 1},
                {SOL_SOCKET, SO_SNDBUF, 20000},
                {SOL_SOCKET, SO_RCVBUF, 30000},
                {IPPROTO_TCP, TCP_NODELAY, 1}};
  for (const auto& c : kCases) {
    const int set = c.value;
    EXPECT_EQ(setsockopt(stream, c.level, c.option, reinterpret_cast<const char*>(&set), 4), 0);
    int value[2] = {-1, -1};
    int size = sizeof value;
    EXPECT_EQ(getsockopt(stream, c.level, c.option, reinterpret_cast<char*>(value), &size), 0);
    const bool is_switch = c.value == 1 && size == 1 && Differs(Difference::kSwitchSize);
    EXPECT_EQ(is_switch ? value[0] & 0xFF : value[0], c.value) << c.option;
    EXPECT_EQ(value[1], -1) << c.option;
    EXPECT_EQ(size, is_switch ? 1 : 4);
  }
}

TEST_F(WinsockTest, TellsTheTypeAndThePendingError) {
  const SOCKET datagram = Bound(SOCK_DGRAM);
  int value = -1;
  int size = sizeof value;
  EXPECT_EQ(getsockopt(datagram, SOL_SOCKET, SO_TYPE, reinterpret_cast<char*>(&value), &size), 0);
  EXPECT_EQ(value, SOCK_DGRAM);
  EXPECT_EQ(getsockopt(datagram, SOL_SOCKET, SO_ERROR, reinterpret_cast<char*>(&value), &size), 0);
  EXPECT_EQ(value, 0);
}

TEST_F(WinsockTest, RefusesOptionsItDoesNotHave) {
  const SOCKET datagram = Bound(SOCK_DGRAM);
  int value = 1;
  const char* in = reinterpret_cast<const char*>(&value);
  EXPECT_EQ(setsockopt(datagram, SOL_SOCKET, 0x7777, in, 4), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAENOPROTOOPT);
  EXPECT_EQ(setsockopt(datagram, SOL_SOCKET, SO_REUSEADDR, nullptr, 4), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  if (Differs(Difference::kShortRoom)) return;
  EXPECT_EQ(setsockopt(datagram, SOL_SOCKET, SO_BROADCAST, in, 3), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
}

TEST_F(WinsockTest, JoinsOnlyGroupsAndLeavesOnlyThoseItIsIn) {
  const SOCKET datagram = socket(AF_INET, SOCK_DGRAM, 0);
  ip_mreq request;
  std::memset(&request, 0, sizeof request);
  const char* in = reinterpret_cast<const char*>(&request);
  const int refusal = Differs(Difference::kMemberships) ? WSAEINVAL : WSAEADDRNOTAVAIL;
  request.imr_multiaddr.s_addr = inet_addr("10.0.0.1");
  EXPECT_EQ(setsockopt(datagram, IPPROTO_IP, IP_ADD_MEMBERSHIP, in, sizeof request), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), refusal);
  request.imr_multiaddr.s_addr = inet_addr("239.1.2.3");
  EXPECT_EQ(setsockopt(datagram, IPPROTO_IP, IP_DROP_MEMBERSHIP, in, sizeof request), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), refusal);
  EXPECT_EQ(setsockopt(datagram, IPPROTO_IP, IP_ADD_MEMBERSHIP, in, sizeof request), 0);
  EXPECT_EQ(setsockopt(datagram, IPPROTO_IP, IP_DROP_MEMBERSHIP, in, sizeof request), 0);
}

TEST_F(WinsockTest, RefusesCommandsItDoesNotHave) {
  DWORD value = 1;
  EXPECT_EQ(ioctlsocket(Bound(SOCK_DGRAM), 0x1234, &value), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), Differs(Difference::kCommands) ? WSAEOPNOTSUPP : WSAEINVAL);
}

// ---- names and texts ----

TEST_F(WinsockTest, TellsItsHostNameWhenItFits) {
  char name[256];
  std::memset(name, '#', sizeof name);
  ASSERT_EQ(gethostname(name, sizeof name), 0);
  const std::size_t length = std::strlen(name);
  ASSERT_GT(length, 0U);
  EXPECT_EQ(name[length + 1], '#');

  std::memset(name, '#', sizeof name);
  EXPECT_EQ(gethostname(name, static_cast<int>(length)), SOCKET_ERROR);
  EXPECT_EQ(WSAGetLastError(), WSAEFAULT);
  EXPECT_EQ(name[length], '#');
}

TEST_F(WinsockTest, FindsItsOwnAddressByItsName) {
  char name[256];
  ASSERT_EQ(gethostname(name, sizeof name), 0);

  const hostent* host = gethostbyname(name);

  ASSERT_NE(host, nullptr);
  EXPECT_EQ(host->h_addrtype, AF_INET);
  EXPECT_EQ(host->h_length, 4);
  ASSERT_NE(host->h_addr_list[0], nullptr);
  ASSERT_NE(host->h_aliases, nullptr);
}

TEST_F(WinsockTest, TakesDotsForAName) {
  const hostent* host = gethostbyname("10.0.0.2");
  ASSERT_NE(host, nullptr);
  EXPECT_EQ(std::string(host->h_addr_list[0], 4), std::string("\x0A\0\0\x02", 4));
  EXPECT_EQ(host->h_addr_list[1], nullptr);
}

TEST_F(WinsockTest, KnowsNoHostOfAnInventedName) {
  EXPECT_EQ(gethostbyname("10.0.0.2:8080"), nullptr);
  EXPECT_EQ(WSAGetLastError(), WSAHOST_NOT_FOUND);
}

TEST(InetAddrTest, ReadsDotsAsTheDeviceDoes) {
  const struct {
    const char* text;
    DWORD address;  // host order
    const char* why;
  } kCases[] = {
      {"10.1.2.3", 0x0A010203, "four bytes"},
      {"10.1", 0x0A000001, "the last part fills what is left"},
      {"10.1.515", 0x0A010203, "of three parts the last is 16 bits wide"},
      {"167838211", 0x0A010203, "one part is the whole address"},
      {"0x0A.0X1.2.3", 0x0A010203, "hexadecimal"},
      {"012.01.02.03", 0x0A010203, "octal"},
      {"10.1.2.3 and more", 0x0A010203, "a blank ends it"},
      {"0.0.0.0", 0, "zero is an address"},
      {"", 0, "the device takes nothing for zero"},
      {" ", 0, "and a blank as well"},
      {"255.255.255.255", 0xFFFFFFFF, "not to be told from a failure"},
      {"256.1.2.3", 0xFFFFFFFF, "a byte"},
      {"10.1.65536", 0xFFFFFFFF, "16 bits"},
      {"4294967296", 0xFFFFFFFF, "32 bits"},
      {"99999999999999999999", 0xFFFFFFFF, "far beyond them"},
      {"1.2.3.4.5", 0xFFFFFFFF, "four parts at most"},
      {"1.2.3.", 0xFFFFFFFF, "an empty part"},
      {".1.2.3", 0xFFFFFFFF, "an empty part"},
      {"1..2.3", 0xFFFFFFFF, "an empty part"},
      {"08.1.2.3", 0xFFFFFFFF, "8 is no octal digit"},
      {"0x.1.2.3", 0xFFFFFFFF, "no digit"},
      {"-1.2.3.4", 0xFFFFFFFF, "no sign"},
      {"10.0.0.2:80", 0xFFFFFFFF, "no port"},
      {"server", 0xFFFFFFFF, "a name"},
      {"  10.1.2.3", 0xFFFFFFFF, "blanks in front"},
  };
  for (const auto& c : kCases) {
    if (*c.text == 0 && Differs(Difference::kEmptyAddress)) continue;
    EXPECT_EQ(inet_addr(c.text), htonl(c.address)) << '"' << c.text << "\": " << c.why;
  }
}

TEST_F(WinsockTest, WritesAnAddressInDots) {
  in_addr address;
  address.s_addr = htonl(0x0A0102FF);
  const char* first = inet_ntoa(address);
  EXPECT_STREQ(first, "10.1.2.255");
  address.s_addr = 0;
  EXPECT_STREQ(inet_ntoa(address), "0.0.0.0");
  EXPECT_STREQ(first, "0.0.0.0") << "each call of a thread uses the same room";
}

TEST(ByteOrderTest, TurnsNumbersRound) {
  EXPECT_EQ(htons(0x1234), 0x3412);
  EXPECT_EQ(ntohs(0x1234), 0x3412);
  EXPECT_EQ(htonl(0x12345678U), 0x78563412U);
  EXPECT_EQ(ntohl(0x12345678U), 0x78563412U);
}

}  // namespace
