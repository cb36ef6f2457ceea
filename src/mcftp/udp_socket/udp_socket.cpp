#include "mcftp/udp_socket/udp_socket.h"

#include <cstring>
#include <string_view>

#include "device/socket_wait.h"

namespace mcftp {
namespace {

/// More than the largest UDP payload.
constexpr std::uint32_t kMaxDatagram = 65535;

}  // namespace

std::uint32_t ParseAddress(const char* text) noexcept {
  // The device reads an empty text, and one blank, as 0.0.0.0.
  const std::string_view dots = base::View(text);
  return dots.empty() || dots == " " ? INADDR_NONE : inet_addr(text);
}

AddressText ToText(std::uint32_t address) noexcept {
  in_addr wrapped = {};
  wrapped.s_addr = address;
  AddressText text;
  if (const char* dotted = inet_ntoa(wrapped)) text.Assign(dotted);
  return text;
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
  return ToText(address_.sin_addr.s_addr);
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
  return ToText(own_address_);
}

Datagram UdpNetwork::Receive(const UdpEndpoint& endpoint, const UdpEndpoint* other,
                             device::Deadline& deadline) noexcept {
  if (!buffer_) {
    buffer_ = device::LocalBlock<std::uint8_t>::Allocate(kMaxDatagram + kSpareBytes);
  }
  if (!buffer_ || !endpoint.is_open()) return {};
  std::uint32_t left_ms = 0;
  while (deadline.HasLeft(left_ms)) {
    const UdpEndpoint* const readable = AwaitReadable(endpoint, other, left_ms);
    if (readable == nullptr) return {};
    Datagram datagram;
    const int length = TakeDatagram(*readable, datagram.sender);
    if (length < 0) return {};
    if (length == 0) continue;
    if (IsOwn(datagram.sender)) {
      deadline.Restart();
      continue;
    }
    std::memset(&buffer_[static_cast<std::size_t>(length)], 0, kSpareBytes);
    datagram.bytes = buffer_.get();
    datagram.length = static_cast<std::uint32_t>(length);
    return datagram;
  }
  return {};
}

bool UdpNetwork::IsOwn(const sockaddr_in& sender) const noexcept {
  return own_address_ != 0 && sender.sin_addr.s_addr == own_address_;
}

const UdpEndpoint* UdpNetwork::AwaitReadable(const UdpEndpoint& endpoint, const UdpEndpoint* other,
                                             std::uint32_t timeout_ms) noexcept {
  if (other == nullptr || !other->is_open()) {
    const auto outcome =
        device::WaitForSocket(endpoint.handle(), device::SocketUse::kRead, timeout_ms);
    return outcome == device::SocketWait::kReady ? &endpoint : nullptr;
  }
  const device::ReadySockets ready =
      device::WaitForEither(endpoint.handle(), other->handle(), timeout_ms);
  const bool take_other = ready.second && (other_is_next_ || !ready.first);
  if (!ready.first && !ready.second) return nullptr;
  other_is_next_ = !take_other;
  return take_other ? other : &endpoint;
}

int UdpNetwork::TakeDatagram(const UdpEndpoint& endpoint, sockaddr_in& sender) noexcept {
  ULONG pending = 0;
  if (ioctlsocket(endpoint.handle(), FIONREAD, &pending) != 0) return -1;
  // Readable with nothing pending is an empty datagram, the answer that an earlier one found no
  // receiver, or nothing after all. Either of the first two has to be taken or the socket would
  // stay readable for ever; the third must not block.
  ULONG no_waiting = pending == 0 ? 1 : 0;
  if (no_waiting != 0) ioctlsocket(endpoint.handle(), static_cast<LONG>(FIONBIO), &no_waiting);
  int sender_size = sizeof sender;
  // The number pending may be that of several datagrams, but one call takes one.
  const int length = recvfrom(endpoint.handle(), reinterpret_cast<char*>(buffer_.get()),
                              static_cast<int>(kMaxDatagram), 0,
                              reinterpret_cast<sockaddr*>(&sender), &sender_size);
  const auto error = length < 0 ? static_cast<int>(GetLastError()) : 0;
  if (no_waiting != 0) {
    ULONG waiting = 0;
    ioctlsocket(endpoint.handle(), static_cast<LONG>(FIONBIO), &waiting);
  }
  return error == WSAECONNRESET || error == WSAEWOULDBLOCK ? 0 : length;
}

}  // namespace mcftp
