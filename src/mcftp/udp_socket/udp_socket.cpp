#include "mcftp/udp_socket/udp_socket.h"

#include <cstring>
#include <string_view>

#include "device/socket_wait.h"

namespace mcftp {
namespace {

/// The largest UDP payload, with room for the zero behind it.
constexpr std::uint32_t kBufferSize = 65536;
constexpr int kMaxDropped = 1024;

AddressText Dotted(std::uint32_t address) noexcept {
  in_addr wrapped = {};
  wrapped.s_addr = address;
  AddressText text;
  if (const char* dotted = inet_ntoa(wrapped)) text.Assign(dotted);
  return text;
}

bool WaitUntilReadable(SOCKET socket, std::uint32_t timeout_ms) noexcept {
  return device::WaitForSocket(socket, device::SocketUse::kRead, timeout_ms) ==
         device::SocketWait::kReady;
}

}  // namespace

std::uint32_t ParseAddress(const char* text) noexcept {
  // The device reads an empty text, and one blank, as 0.0.0.0.
  const std::string_view dots = base::View(text);
  return dots.empty() || dots == " " ? INADDR_NONE : inet_addr(text);
}

bool SocketLibrary::Start() noexcept {
  if (started_) return true;
  WSADATA data = {};
  started_ = WSAStartup(MAKEWORD(1, 1), &data) == 0;
  return started_;
}

void SocketLibrary::Stop() noexcept {
  if (started_) WSACleanup();
  started_ = false;
}

UdpEndpoint::UdpEndpoint() noexcept : address_() {
  address_.sin_family = AF_INET;
}

bool UdpEndpoint::Create() noexcept {
  Close();
  socket_ = socket(AF_INET, SOCK_DGRAM, IPPROTO_UDP);
  return is_open();
}

bool UdpEndpoint::Close() noexcept {
  if (!is_open()) return false;
  const bool closed = closesocket(socket_) == 0;
  socket_ = INVALID_SOCKET;
  joined_groups_ = 0;
  return closed;
}

bool UdpEndpoint::AllowAddressReuse() noexcept {
  const std::int32_t on = 1;
  return setsockopt(socket_, SOL_SOCKET, SO_REUSEADDR, reinterpret_cast<const char*>(&on),
                    sizeof on) == 0;
}

bool UdpEndpoint::Bind(std::uint16_t port) noexcept {
  address_.sin_addr.s_addr = INADDR_ANY;
  SetPort(port);
  return bind(socket_, reinterpret_cast<const sockaddr*>(&address_), sizeof address_) == 0;
}

bool UdpEndpoint::ChangeMembership(int option, std::uint32_t group) noexcept {
  ip_mreq membership = {};
  membership.imr_multiaddr.s_addr = group;
  membership.imr_interface.s_addr = INADDR_ANY;
  return setsockopt(socket_, IPPROTO_IP, option, reinterpret_cast<const char*>(&membership),
                    sizeof membership) == 0;
}

bool UdpEndpoint::JoinGroup(const char* group) noexcept {
  const std::uint32_t address = ParseAddress(group);
  if (!ChangeMembership(IP_ADD_MEMBERSHIP, address)) return false;
  group_ = address;
  ++joined_groups_;
  return true;
}

bool UdpEndpoint::LeaveGroup() noexcept {
  if (!ChangeMembership(IP_DROP_MEMBERSHIP, group_)) return false;
  --joined_groups_;
  return true;
}

void UdpEndpoint::SetPort(std::uint16_t port) noexcept {
  address_.sin_port = htons(port);
}
std::uint16_t UdpEndpoint::port() const noexcept {
  return ntohs(address_.sin_port);
}
AddressText UdpEndpoint::address_text() const noexcept {
  return Dotted(address_.sin_addr.s_addr);
}

bool UdpEndpoint::SendTo(const UdpEndpoint& target, const void* bytes,
                         std::uint16_t length) noexcept {
  return sendto(socket_, static_cast<const char*>(bytes), length, 0,
                reinterpret_cast<const sockaddr*>(&target.address_),
                sizeof target.address_) != SOCKET_ERROR;
}

bool UdpNetwork::Start() noexcept {
  if (!library_.Start()) return false;
  LearnOwnIdentity();
  return true;
}

void UdpNetwork::LearnOwnIdentity() noexcept {
  char name[decltype(host_name_)::capacity()] = {};
  if (gethostname(name, sizeof name) != 0) return;
  host_name_.Assign(base::FieldView(name));
  const hostent* host = gethostbyname(host_name_.c_str());
  if (host == nullptr) return;
  full_name_.Assign(base::View(host->h_name));
  if (host->h_length == static_cast<int>(sizeof own_address_) && host->h_addr_list[0] != nullptr) {
    std::memcpy(&own_address_, host->h_addr_list[0], sizeof own_address_);
  }
}

AddressText UdpNetwork::own_address_text() const noexcept {
  return Dotted(own_address_);
}

Datagram UdpNetwork::Receive(const UdpEndpoint& endpoint, std::uint32_t timeout_ms) noexcept {
  if (!buffer_) buffer_ = device::LocalBlock<std::uint8_t>::Allocate(kBufferSize);
  if (!buffer_ || !endpoint.is_open()) return {};
  for (int dropped = 0; dropped < kMaxDropped; ++dropped) {
    if (!WaitUntilReadable(endpoint.handle(), timeout_ms)) return {};
    Datagram datagram;
    const int length = TakeDatagram(endpoint, datagram.sender);
    if (length < 0) return {};
    const bool own = own_address_ != 0 && datagram.sender.sin_addr.s_addr == own_address_;
    if (length == 0 || own) continue;
    buffer_[static_cast<std::size_t>(length)] = 0;
    datagram.bytes = buffer_.get();
    datagram.length = static_cast<std::uint32_t>(length);
    return datagram;
  }
  return {};
}

int UdpNetwork::TakeDatagram(const UdpEndpoint& endpoint, sockaddr_in& sender) noexcept {
  ULONG pending = 0;
  if (ioctlsocket(endpoint.handle(), FIONREAD, &pending) != 0) return -1;
  // Readable with nothing pending is an empty datagram, an error left behind by an earlier send, or
  // nothing after all. Either of the first two has to be taken or the socket would stay readable
  // for ever; the third must not block.
  ULONG no_waiting = pending == 0 ? 1 : 0;
  if (no_waiting != 0) ioctlsocket(endpoint.handle(), static_cast<LONG>(FIONBIO), &no_waiting);
  int sender_size = sizeof sender;
  // The number pending may be that of several datagrams, but one call takes one.
  const int length = recvfrom(endpoint.handle(), reinterpret_cast<char*>(buffer_.get()),
                              static_cast<int>(kBufferSize - 1), 0,
                              reinterpret_cast<sockaddr*>(&sender), &sender_size);
  if (no_waiting != 0) {
    ULONG waiting = 0;
    ioctlsocket(endpoint.handle(), static_cast<LONG>(FIONBIO), &waiting);
  }
  return length;
}

}  // namespace mcftp
