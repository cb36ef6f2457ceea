#include "net/posix/datagram.h"

#include <netinet/in.h>

#include <cerrno>

#include "ce/winsock.h"
#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {
namespace {

// Older header sets lack the name: a socket hears the groups it joined, not the whole host's.
constexpr int kMulticastAll = 49;

/// The sender and size of the first datagram in line. @return false when there is none.
bool PeekFirst(const SocketFile& file, Received& first) {
  char byte = 0;
  HostAddress from;
  const ssize_t size =
      recvfrom(file.get(), &byte, 1, MSG_PEEK | MSG_TRUNC, from.get(), from.room());
  if (size < 0) return false;
  first = {static_cast<std::size_t>(size), false, from.endpoint()};
  return true;
}

}  // namespace

PosixDatagram::PosixDatagram(SocketFile file, Address own) : file_(std::move(file)), own_(own) {}

int PosixDatagram::Bind(const Endpoint& local) {
  const in_addr out{SwapOrder(own_)};
  int error = file_.Set(IPPROTO_IP, IP_MULTICAST_IF, &out, sizeof out);
  if (error == 0) error = file_.Bind({own_, local.port});
  if (error != 0) return error;
  bound_ = true;
  for (auto& [group, file] : groups_) {
    error = OpenGroup(group, file);
    if (error != 0) return error;
  }
  return 0;
}

int PosixDatagram::Connect(const Endpoint& peer) {
  peer_ = peer;
  return 0;
}

int PosixDatagram::Listen(int /*backlog*/) {
  return WSAEOPNOTSUPP;
}
int PosixDatagram::Accept(std::unique_ptr<Transport>& /*accepted*/) {
  return WSAEOPNOTSUPP;
}

int PosixDatagram::Send(const char* bytes, std::size_t size, std::size_t& sent) {
  const int error = SendTo(peer_, bytes, size);
  if (error == 0) sent = size;
  return error;
}

int PosixDatagram::SendTo(const Endpoint& to, const char* bytes, std::size_t size) {
  const HostAddress address(to);
  const ssize_t sent =
      sendto(file_.get(), bytes, size, MSG_NOSIGNAL, address.get(), address.size());
  if (sent >= 0) return 0;
  // The host's words for a target that cannot be reached from the device's address.
  return errno == EINVAL ? WSAENETUNREACH : ToWinsockError(errno);
}

// ---- receiving ----

void PosixDatagram::DropStrangers() {
  if (peer_.port == 0) return;
  const auto drop = [&](const SocketFile& file) {
    Received first;
    while (PeekFirst(file, first) && first.from != peer_) {
      char byte = 0;
      static_cast<void>(recv(file.get(), &byte, 1, 0));
    }
  };
  drop(file_);
  for (const auto& [group, file] : groups_) {
    if (file.open()) drop(file);
  }
}

SocketFile* PosixDatagram::FirstReadable() {
  DropStrangers();
  if ((file_.Poll(POLLIN) & POLLIN) != 0) return &file_;
  for (auto& [group, file] : groups_) {
    if (file.open() && (file.Poll(POLLIN) & POLLIN) != 0) return &file;
  }
  return nullptr;
}

int PosixDatagram::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  const SocketFile* file = FirstReadable();
  if (file == nullptr) return WSAEWOULDBLOCK;
  HostAddress from;
  const int flags = MSG_TRUNC | (peek ? MSG_PEEK : 0);
  const ssize_t length = recvfrom(file->get(), bytes, size, flags, from.get(), from.room());
  if (length < 0) return ToWinsockError(errno);
  const auto whole = static_cast<std::size_t>(length);
  result = {whole < size ? whole : size, whole > size, from.endpoint()};
  return 0;
}

int PosixDatagram::Pending(std::uint32_t& bytes) {
  SocketFile* file = FirstReadable();
  return file != nullptr ? file->Pending(bytes) : 0;
}

unsigned PosixDatagram::Ready(unsigned interest) {
  unsigned ready = 0;
  if ((interest & kReadable) != 0 && FirstReadable() != nullptr) ready |= kReadable;
  if ((interest & kWritable) != 0 && (file_.Poll(POLLOUT) & POLLOUT) != 0) ready |= kWritable;
  return ready;
}

void PosixDatagram::Watch(unsigned interest, std::vector<pollfd>& files) const {
  short events = 0;
  if ((interest & kReadable) != 0) events |= POLLIN;
  if ((interest & kWritable) != 0) events |= POLLOUT;
  files.push_back({file_.get(), events, 0});
  for (const auto& [group, file] : groups_) {
    if (file.open() && (interest & kReadable) != 0) files.push_back({file.get(), POLLIN, 0});
  }
}

// ---- groups and options ----

int PosixDatagram::OpenGroup(Address group, SocketFile& file) {
  SocketFile opened;
  int error = SocketFile::Make(SOCK_DGRAM, opened);
  if (error == 0) error = opened.Set(SOL_SOCKET, SO_REUSEADDR, 1);
  if (error == 0) error = opened.Set(IPPROTO_IP, kMulticastAll, 0);
  if (error == 0 && receive_buffer_ > 0) {
    error = opened.Set(SOL_SOCKET, SO_RCVBUF, receive_buffer_);
  }
  if (error == 0) error = opened.Bind({group, file_.Local().port});
  const ip_mreq request{{SwapOrder(group)}, {SwapOrder(own_)}};
  if (error == 0) error = opened.Set(IPPROTO_IP, IP_ADD_MEMBERSHIP, &request, sizeof request);
  if (error == 0) file = std::move(opened);
  return error;
}

int PosixDatagram::Join(Address group) {
  SocketFile file;
  const int error = bound_ ? OpenGroup(group, file) : 0;
  if (error == 0) groups_[group] = std::move(file);
  return error;
}

int PosixDatagram::Leave(Address group) {
  groups_.erase(group);
  return 0;
}

int PosixDatagram::Tune(Tuning what, int value) {
  switch (what) {
    case Tuning::kBroadcast: return file_.Set(SOL_SOCKET, SO_BROADCAST, value);
    case Tuning::kReuseAddress: return file_.Set(SOL_SOCKET, SO_REUSEADDR, value);
    case Tuning::kSendBuffer: return file_.Set(SOL_SOCKET, SO_SNDBUF, value);
    case Tuning::kReceiveBuffer:
      receive_buffer_ = value;
      return file_.Set(SOL_SOCKET, SO_RCVBUF, value);
    case Tuning::kMulticastTtl: return file_.Set(IPPROTO_IP, IP_MULTICAST_TTL, value);
    case Tuning::kMulticastLoop: return file_.Set(IPPROTO_IP, IP_MULTICAST_LOOP, value);
    case Tuning::kNoDelay:
    case Tuning::kKeepAlive: break;
  }
  return WSAENOPROTOOPT;
}

}  // namespace sim
