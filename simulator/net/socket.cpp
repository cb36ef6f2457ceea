#include "net/socket.h"

#include <algorithm>
#include <cstring>
#include <optional>
#include <utility>

namespace sim {
namespace {

constexpr std::size_t kLargestDatagram = 65507;

template <typename T>
int CopyOut(const T& from, char* value, int* size) {
  if (*size < static_cast<int>(sizeof from)) return WSAEFAULT;
  std::memcpy(value, &from, sizeof from);
  *size = static_cast<int>(sizeof from);
  return 0;
}

}  // namespace

/// An option that is one number.
struct Socket::NumberOption {
  int level;
  int option;
  int Socket::*value;
  Tuning tuning;
  std::optional<SocketKind> only;
};

Socket::Socket(SocketKind kind, std::unique_ptr<Transport> transport, Address own,
               const DatagramListener& listener)
    : kind_(kind), own_(own), transport_(std::move(transport)), listener_(listener) {}

bool Socket::IsOwn(Address address) const {
  return address == kAnyAddress || address == own_ || address == kLocalHost;
}

// ---- setting up ----

int Socket::Bind(const Endpoint& local) {
  if (bound_) return WSAEINVAL;
  if (!IsOwn(local.address)) return WSAEADDRNOTAVAIL;
  const bool any = local.address == kAnyAddress;
  const int error = transport_->Bind({any ? kAnyAddress : own_, local.port});
  if (error != 0) return error;
  bound_ = true;
  bound_to_any_ = any;
  return 0;
}

int Socket::BindAny() {
  return bound_ ? 0 : Bind({});
}

int Socket::Connect(const Endpoint& peer) {
  if (listening_) return WSAEINVAL;
  FollowConnect();
  if (connecting_) return WSAEALREADY;
  if (kind_ == SocketKind::kStream && connected_) return WSAEISCONN;
  // The device's stack knows no peer of address 0; the host's would connect to itself.
  if (peer.address == kAnyAddress || peer.port == 0) return WSAEADDRNOTAVAIL;
  int error = 0;
  if (kind_ == SocketKind::kDatagram) {
    error = CheckDatagramTarget(peer);
    if (error == 0) error = BindAny();
  } else if (IsMulticast(peer.address) || peer.address == kBroadcastAddress) {
    error = WSAEADDRNOTAVAIL;
  }
  if (error != 0) return error;
  connect_error_ = 0;
  error = transport_->Connect(peer);
  connected_ = error == 0;
  connecting_ = error == WSAEWOULDBLOCK;
  if (connected_ || connecting_) {
    peer_ = peer;
    bound_ = true;
  }
  return error;
}

void Socket::FollowConnect() {
  if (!connecting_) return;
  const int result = transport_->ConnectResult();
  if (result == WSAEWOULDBLOCK) return;
  connecting_ = false;
  connected_ = result == 0;
  connect_error_ = result;
}

int Socket::FinishConnect() {
  FollowConnect();
  if (connecting_) return WSAEWOULDBLOCK;
  return connected_ ? 0 : std::exchange(connect_error_, 0);
}

int Socket::Listen(int backlog) {
  if (kind_ != SocketKind::kStream) return WSAEOPNOTSUPP;
  if (!bound_) return WSAEINVAL;
  if (connected_ || connecting_) return WSAEISCONN;
  const int error = transport_->Listen(std::max(backlog, 1));
  if (error == 0) listening_ = true;
  return error;
}

int Socket::Accept(std::unique_ptr<Socket>& accepted, Endpoint& peer) {
  if (kind_ != SocketKind::kStream) return WSAEOPNOTSUPP;
  if (!listening_) return WSAEINVAL;
  std::unique_ptr<Transport> transport;
  const int error = transport_->Accept(transport);
  if (error != 0) return error;
  accepted = std::make_unique<Socket>(kind_, std::move(transport), own_, listener_);
  accepted->bound_ = true;
  accepted->connected_ = true;
  accepted->nonblocking_ = nonblocking_;
  accepted->peer_ = peer = accepted->transport_->peer();
  return 0;
}

// ---- bytes ----

/// Notes an error that a connection does not survive.
int Socket::Broken(int error) {
  if (error == WSAECONNRESET || error == WSAECONNABORTED || error == WSAETIMEDOUT) broken_ = error;
  return error;
}

int Socket::Send(const char* bytes, std::size_t size, std::size_t& sent) {
  FollowConnect();
  if (!connected_) return WSAENOTCONN;
  if (send_shut_) return WSAESHUTDOWN;
  if (kind_ == SocketKind::kDatagram) return SendTo(peer_, bytes, size, sent);
  if (broken_ != 0) return broken_;
  return Broken(transport_->Send(bytes, size, sent));
}

int Socket::CheckDatagramTarget(const Endpoint& to) const {
  if (to.address == kAnyAddress || to.port == 0) return WSAEADDRNOTAVAIL;
  return to.address == kBroadcastAddress && broadcast_ == 0 ? WSAEACCES : 0;
}

int Socket::SendTo(const Endpoint& to, const char* bytes, std::size_t size, std::size_t& sent) {
  if (kind_ == SocketKind::kStream) return Send(bytes, size, sent);
  if (send_shut_) return WSAESHUTDOWN;
  int error = CheckDatagramTarget(to);
  if (error == 0 && size > kLargestDatagram) error = WSAEMSGSIZE;
  if (error == 0) error = BindAny();
  if (error == 0) error = transport_->SendTo(to, bytes, size);
  if (error != 0) return error;
  sent = size;
  if (listener_) listener_({true, transport_->local(), to, {bytes, size}});
  return 0;
}

int Socket::ReceiveDatagram(char* bytes, std::size_t size, bool peek, Received& result) {
  if (!bound_) return WSAEINVAL;
  if (receive_shut_) return WSAESHUTDOWN;
  const int error = transport_->Receive(bytes, size, peek, result);
  if (error == 0 && !peek && listener_) {
    Endpoint to = transport_->local();
    if (result.group != kAnyAddress) to.address = result.group;
    listener_({false, result.from, to, {bytes, result.size}});
  }
  return error;
}

int Socket::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  FollowConnect();
  if (kind_ == SocketKind::kDatagram) return ReceiveDatagram(bytes, size, peek, result);
  if (!connected_) return WSAENOTCONN;
  if (receive_shut_) return WSAESHUTDOWN;
  if (broken_ != 0) return broken_;
  return Broken(transport_->Receive(bytes, size, peek, result));
}

int Socket::Shutdown(int how) {
  if (how < CE_SD_RECEIVE || how > CE_SD_BOTH) return WSAEINVAL;
  FollowConnect();
  if (kind_ == SocketKind::kStream && !connected_) return WSAENOTCONN;
  if (how != CE_SD_SEND) receive_shut_ = true;
  if (how == CE_SD_RECEIVE || std::exchange(send_shut_, true)) return 0;
  return kind_ == SocketKind::kStream && broken_ == 0 ? transport_->ShutdownSend() : 0;
}

int Socket::Pending(std::uint32_t& bytes) {
  bytes = 0;
  if (listening_) return WSAEINVAL;
  const bool can_receive = kind_ == SocketKind::kStream ? connected_ && broken_ == 0 : bound_;
  return can_receive && !receive_shut_ ? transport_->Pending(bytes) : 0;
}

// ---- readiness ----

unsigned Socket::Ready(unsigned interest) {
  FollowConnect();
  if (kind_ == SocketKind::kDatagram) {
    if (!bound_) return interest & kWritable;
    return transport_->Ready(interest & (kReadable | kWritable));
  }
  if (listening_) return transport_->Ready(interest & kReadable);
  if (connect_error_ != 0) return interest & kExceptional;
  if (!connected_) return 0;
  if (broken_ != 0) return interest & (kReadable | kWritable);
  const unsigned free = receive_shut_ ? interest & kReadable : 0U;
  return free | transport_->Ready(interest & (kReadable | kWritable));
}

void Socket::Watch(unsigned interest, std::vector<pollfd>& files) const {
  if (connecting_) {
    transport_->Watch(kWritable, files);
  } else if (listening_ || connected_ || kind_ == SocketKind::kDatagram) {
    transport_->Watch(interest, files);
  }
}

void Socket::PrepareClose() {
  if (linger_.l_onoff != 0 && linger_.l_linger == 0) transport_->Abort();
}

// ---- names ----

int Socket::LocalName(Endpoint& local) const {
  if (!bound_) return WSAEINVAL;
  local = transport_->local();
  if (bound_to_any_ && !connected_) local.address = kAnyAddress;
  return 0;
}

int Socket::PeerName(Endpoint& peer) {
  FollowConnect();
  if (!connected_) return WSAENOTCONN;
  peer = peer_;
  return 0;
}

// ---- options ----

const Socket::NumberOption* Socket::FindNumber(int level, int option) const {
  constexpr auto kStream = SocketKind::kStream;
  constexpr auto kDatagram = SocketKind::kDatagram;
  static constexpr NumberOption kOptions[] = {
      {CE_SOL_SOCKET, CE_SO_REUSEADDR, &Socket::reuse_address_, Tuning::kReuseAddress, {}},
      {CE_SOL_SOCKET, CE_SO_KEEPALIVE, &Socket::keep_alive_, Tuning::kKeepAlive, kStream},
      {CE_SOL_SOCKET, CE_SO_BROADCAST, &Socket::broadcast_, Tuning::kBroadcast, kDatagram},
      {CE_SOL_SOCKET, CE_SO_SNDBUF, &Socket::send_buffer_, Tuning::kSendBuffer, {}},
      {CE_SOL_SOCKET, CE_SO_RCVBUF, &Socket::receive_buffer_, Tuning::kReceiveBuffer, {}},
      {CE_IPPROTO_TCP, CE_TCP_NODELAY, &Socket::no_delay_, Tuning::kNoDelay, kStream},
      {CE_IPPROTO_IP, CE_IP_MULTICAST_TTL, &Socket::multicast_ttl_, Tuning::kMulticastTtl,
       kDatagram},
      {CE_IPPROTO_IP, CE_IP_MULTICAST_LOOP, &Socket::multicast_loop_, Tuning::kMulticastLoop,
       kDatagram},
  };
  for (const NumberOption& row : kOptions) {
    const bool fits = !row.only || *row.only == kind_;
    if (row.level == level && row.option == option && fits) return &row;
  }
  return nullptr;
}

int Socket::SetNumber(const NumberOption& row, const char* value, int size) {
  std::int32_t number = 0;
  if (size < static_cast<int>(sizeof number)) return WSAEFAULT;
  std::memcpy(&number, value, sizeof number);
  const bool is_size = row.tuning == Tuning::kSendBuffer || row.tuning == Tuning::kReceiveBuffer;
  if (is_size && number < 0) return WSAEINVAL;
  if (row.tuning == Tuning::kMulticastTtl && (number < 0 || number > 255)) return WSAEINVAL;
  const int error = transport_->Tune(row.tuning, number);
  if (error == 0) this->*row.value = number;
  return error;
}

int Socket::Group(int option, const char* value, int size) {
  ce_ip_mreq request{};
  if (size < static_cast<int>(sizeof request)) return WSAEFAULT;
  std::memcpy(&request, value, sizeof request);
  const Address group = SwapOrder(request.imr_multiaddr.s_addr);
  if (!IsMulticast(group) || !IsOwn(SwapOrder(request.imr_interface.s_addr))) {
    return WSAEADDRNOTAVAIL;
  }
  const bool joined = groups_.count(group) != 0;
  if (option == CE_IP_ADD_MEMBERSHIP) {
    if (joined) return WSAEADDRINUSE;
    const int error = transport_->Join(group);
    if (error == 0) groups_.insert(group);
    return error;
  }
  if (!joined) return WSAEADDRNOTAVAIL;
  groups_.erase(group);
  return transport_->Leave(group);
}

int Socket::SetOption(int level, int option, const char* value, int size) {
  if (value == nullptr) return WSAEFAULT;
  if (const NumberOption* row = FindNumber(level, option)) return SetNumber(*row, value, size);
  if (level == CE_SOL_SOCKET && option == CE_SO_LINGER && kind_ == SocketKind::kStream) {
    if (size < static_cast<int>(sizeof linger_)) return WSAEFAULT;
    std::memcpy(&linger_, value, sizeof linger_);
    return 0;
  }
  if (level != CE_IPPROTO_IP || kind_ != SocketKind::kDatagram) return WSAENOPROTOOPT;
  if (option == CE_IP_ADD_MEMBERSHIP || option == CE_IP_DROP_MEMBERSHIP) {
    return Group(option, value, size);
  }
  if (option != CE_IP_MULTICAST_IF) return WSAENOPROTOOPT;
  // A device has one interface, so there is nothing to choose.
  std::uint32_t address = 0;
  if (size < static_cast<int>(sizeof address)) return WSAEFAULT;
  std::memcpy(&address, value, sizeof address);
  return IsOwn(SwapOrder(address)) ? 0 : WSAEADDRNOTAVAIL;
}

int Socket::GetOption(int level, int option, char* value, int* size) {
  if (value == nullptr || size == nullptr) return WSAEFAULT;
  if (const NumberOption* row = FindNumber(level, option)) {
    return CopyOut(static_cast<std::int32_t>(this->*row->value), value, size);
  }
  if (level == CE_IPPROTO_IP && option == CE_IP_MULTICAST_IF && kind_ == SocketKind::kDatagram) {
    return CopyOut(SwapOrder(own_), value, size);
  }
  if (level != CE_SOL_SOCKET) return WSAENOPROTOOPT;
  switch (option) {
    case CE_SO_LINGER:
      return kind_ == SocketKind::kStream ? CopyOut(linger_, value, size) : WSAENOPROTOOPT;
    case CE_SO_TYPE:
      return CopyOut<std::int32_t>(kind_ == SocketKind::kStream ? CE_SOCK_STREAM : CE_SOCK_DGRAM,
                                   value, size);
    case CE_SO_ERROR: {
      FollowConnect();
      const int error = CopyOut<std::int32_t>(connect_error_, value, size);
      if (error == 0) connect_error_ = 0;
      return error;
    }
    default: return WSAENOPROTOOPT;
  }
}

}  // namespace sim
