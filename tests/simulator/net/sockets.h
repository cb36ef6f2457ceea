// Short hands of the socket tests for the API they test.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include "ce/kernel.h"
#include "ce/winsock.h"
#include "net/endpoint.h"
#include "net/network.h"
#include "support/device_test.h"

namespace test {

inline constexpr sim::Address kDevice = 0x7F000001;
inline constexpr sim::Address kServer = 0x7F000002;
inline constexpr sim::Address kOther = 0x7F000003;
inline constexpr sim::Address kGroup = 0xEFFF0101;  // 239.255.1.1
inline constexpr sim::Address kOtherGroup = 0xEFFF0102;

inline void StartWinsock() {
  ce_WSADATA data;
  ASSERT_EQ(ce_WSAStartup(MAKEWORD(1, 1), &data), 0);
}

inline SOCKET Tcp() {
  return ce_socket(CE_AF_INET, CE_SOCK_STREAM, CE_IPPROTO_TCP);
}
inline SOCKET Udp() {
  return ce_socket(CE_AF_INET, CE_SOCK_DGRAM, CE_IPPROTO_UDP);
}

/// The call's own result, with the address in the form it wants.
template <typename Call>
int At(Call call, SOCKET socket, const sim::Endpoint& endpoint) {
  const ce_sockaddr_in address = sim::ToSockaddr(endpoint);
  return call(socket, reinterpret_cast<const ce_sockaddr*>(&address), sizeof address);
}
inline int Bind(SOCKET socket, sim::Address address, std::uint16_t port = 0) {
  return At(ce_bind, socket, {address, port});
}
inline int Connect(SOCKET socket, sim::Address address, std::uint16_t port) {
  return At(ce_connect, socket, {address, port});
}

inline sim::Endpoint LocalName(SOCKET socket) {
  ce_sockaddr_in address{};
  int size = sizeof address;
  EXPECT_EQ(ce_getsockname(socket, reinterpret_cast<ce_sockaddr*>(&address), &size), 0);
  return sim::ToEndpoint(address);
}
inline sim::Endpoint PeerName(SOCKET socket) {
  ce_sockaddr_in address{};
  int size = sizeof address;
  EXPECT_EQ(ce_getpeername(socket, reinterpret_cast<ce_sockaddr*>(&address), &size), 0);
  return sim::ToEndpoint(address);
}

/// A socket that listens on a free port.
inline SOCKET Listener(sim::Address address = sim::kAnyAddress) {
  const SOCKET socket = Tcp();
  EXPECT_EQ(Bind(socket, address), 0);
  EXPECT_EQ(ce_listen(socket, 5), 0);
  return socket;
}

inline int SendText(SOCKET socket, std::string_view text) {
  return ce_send(socket, text.data(), static_cast<int>(text.size()), 0);
}
inline int SendTo(SOCKET socket, const sim::Endpoint& to, std::string_view text) {
  const ce_sockaddr_in address = sim::ToSockaddr(to);
  return ce_sendto(socket, text.data(), static_cast<int>(text.size()), 0,
                   reinterpret_cast<const ce_sockaddr*>(&address), sizeof address);
}

/// What one recv of up to `size` bytes gives; "error <number>" when it fails.
inline std::string ReceiveText(SOCKET socket, int size = 4096, int flags = 0) {
  std::string text(static_cast<std::size_t>(size), '\0');
  const int count = ce_recv(socket, text.data(), size, flags);
  if (count < 0) return "error " + std::to_string(ce_WSAGetLastError());
  text.resize(static_cast<std::size_t>(count));
  return text;
}
inline std::string ReceiveFrom(SOCKET socket, sim::Endpoint& from, int size = 4096) {
  std::string text(static_cast<std::size_t>(size), '\0');
  ce_sockaddr_in address{};
  int address_size = sizeof address;
  const int count = ce_recvfrom(socket, text.data(), size, 0,
                                reinterpret_cast<ce_sockaddr*>(&address), &address_size);
  if (count < 0) return "error " + std::to_string(ce_WSAGetLastError());
  from = sim::ToEndpoint(address);
  text.resize(static_cast<std::size_t>(count));
  return text;
}
/// Everything up to the end of the stream.
inline std::string ReceiveAll(SOCKET socket) {
  std::string all;
  for (;;) {
    const std::string part = ReceiveText(socket);
    if (part.empty() || part.rfind("error ", 0) == 0) return all + part;
    all += part;
  }
}

inline ce_timeval Milliseconds(int ms) {
  return {ms / 1000, ms % 1000 * 1000};
}

enum class For { kRead, kWrite, kExcept };
/// select on one socket; time -1: without limit.
inline int Select(SOCKET socket, For what, int ms) {
  ce_fd_set set{1, {socket}};
  const ce_timeval time = Milliseconds(ms);
  const int count =
      ce_select(0, what == For::kRead ? &set : nullptr, what == For::kWrite ? &set : nullptr,
                what == For::kExcept ? &set : nullptr, ms < 0 ? nullptr : &time);
  if (count < 0) return count;
  EXPECT_EQ(set.fd_count, static_cast<std::uint32_t>(count));
  return count;
}

inline std::uint32_t Pending(SOCKET socket) {
  std::uint32_t bytes = 0xDEADBEEF;
  EXPECT_EQ(ce_ioctlsocket(socket, CE_FIONREAD, &bytes), 0);
  return bytes;
}
inline void SetNonBlocking(SOCKET socket) {
  std::uint32_t on = 1;
  EXPECT_EQ(ce_ioctlsocket(socket, CE_FIONBIO, &on), 0);
}
inline int SetNumber(SOCKET socket, int level, int option, std::int32_t value) {
  return ce_setsockopt(socket, level, option, reinterpret_cast<const char*>(&value), sizeof value);
}
inline int GetNumber(SOCKET socket, int level, int option) {
  std::int32_t value = -1;
  int size = sizeof value;
  EXPECT_EQ(ce_getsockopt(socket, level, option, reinterpret_cast<char*>(&value), &size), 0);
  return value;
}
inline int Group(SOCKET socket, int option, sim::Address group) {
  ce_ip_mreq request{};
  request.imr_multiaddr.s_addr = sim::SwapOrder(group);
  return ce_setsockopt(socket, CE_IPPROTO_IP, option, reinterpret_cast<const char*>(&request),
                       sizeof request);
}

/// Both ends of a connection of the device with itself: the one that asked, the one that granted.
inline std::pair<SOCKET, SOCKET> ConnectedPair() {
  const SOCKET listener = Listener();
  const SOCKET client = Tcp();
  EXPECT_EQ(Connect(client, kDevice, LocalName(listener).port), 0);
  const SOCKET server = ce_accept(listener, nullptr, nullptr);
  EXPECT_NE(server, CE_INVALID_SOCKET);
  EXPECT_EQ(ce_closesocket(listener), 0);
  return {client, server};
}

}  // namespace test
