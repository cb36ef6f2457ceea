#include "net/posix/datagram.h"

#include <netinet/in.h>

#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

#include "ce/winsock.h"
#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {
namespace {

// Older header sets lack the name: a socket hears the groups it joined, not the whole host's.
constexpr int kMulticastAll = 49;

/// Devices of one host share its processors: what comes from a group to one of them while others
/// run waits here. A host that allows less gives what it allows.
constexpr int kGroupBuffer = 1 << 20;

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

void DropFirst(const SocketFile& file) {
  char byte = 0;
  static_cast<void>(recv(file.get(), &byte, 1, 0));
}

/// When the first datagram in line came, by the host's clock.
std::pair<std::time_t, long> FirstArrival(const SocketFile& file) {
  char byte = 0;
  alignas(cmsghdr) char room[CMSG_SPACE(sizeof(timespec))] = {};
  iovec bytes{&byte, 1};
  msghdr message{};
  message.msg_iov = &bytes;
  message.msg_iovlen = 1;
  message.msg_control = room;
  message.msg_controllen = sizeof room;
  if (recvmsg(file.get(), &message, MSG_PEEK) < 0) return {};
  const cmsghdr* const head = CMSG_FIRSTHDR(&message);
  timespec when{};
  if (head != nullptr && head->cmsg_type == SO_TIMESTAMPNS) {
    std::memcpy(&when, CMSG_DATA(head), sizeof when);
  }
  return {when.tv_sec, when.tv_nsec};
}

}  // namespace

PosixDatagram::PosixDatagram(SocketFile file, DeviceSockets& device) : device_(device) {
  own_box_.file = std::move(file);
}

PosixDatagram::~PosixDatagram() {
  const auto port = device_.datagram_ports.find(port_);
  if (bound_ && port != device_.datagram_ports.end()) device_.datagram_ports.erase(port);
}

int PosixDatagram::Bind(const Endpoint& local) {
  const in_addr out{SwapOrder(device_.own)};
  int error = own_box_.file.Set(IPPROTO_IP, IP_MULTICAST_IF, &out, sizeof out);
  if (error == 0) error = own_box_.file.Set(SOL_SOCKET, SO_TIMESTAMPNS, 1);
  if (error == 0) error = own_box_.file.Bind({device_.own, local.port});
  if (error != 0) return error;
  bound_ = true;
  port_ = own_box_.file.Local().port;
  device_.datagram_ports.insert(port_);
  for (auto& [group, inbox] : groups_) {
    error = OpenGroup(group, inbox.file);
    if (error != 0) return error;
  }
  return 0;
}

int PosixDatagram::Connect(const Endpoint& peer) {
  peer_ = peer;
  first_ = nullptr;
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
  const bool stays = to.address == kLocalHost && device_.datagram_ports.count(to.port) != 0;
  const HostAddress address({stays ? device_.own : to.address, to.port});
  const ssize_t sent =
      sendto(own_box_.file.get(), bytes, size, MSG_NOSIGNAL, address.get(), address.size());
  if (sent >= 0) return 0;
  // The host's words for a target that cannot be reached from the device's address.
  return errno == EINVAL ? WSAENETUNREACH : ToWinsockError(errno);
}

// ---- receiving ----

void PosixDatagram::DropStrangers(Inbox& inbox) {
  if (peer_.port == 0) return;
  Received first;
  while (PeekFirst(inbox.file, first) && first.from != peer_) DropFirst(inbox.file);
}

/// Each datagram is judged once, when it comes to the front of its line.
void PosixDatagram::DropLost(Inbox& inbox) {
  if (!device_.loss.any()) return;
  Received first;
  while (!inbox.heard && PeekFirst(inbox.file, first)) {
    inbox.heard = first.from.address == device_.own || !device_.loss.Next();
    if (!inbox.heard) DropFirst(inbox.file);
  }
}

/// A program looks, asks for the size and takes: that is one look at the files, not three.
PosixDatagram::Inbox* PosixDatagram::FirstReadable() {
  if (first_ == nullptr) first_ = FindFirstReadable();
  return first_;
}

/// To the device it is one socket: of several files with something to read the one whose first
/// datagram came first.
PosixDatagram::Inbox* PosixDatagram::FindFirstReadable() {
  polled_.clear();
  inboxes_.clear();
  const auto add = [&](Inbox& inbox) {
    if (!inbox.file.open()) return;
    DropStrangers(inbox);
    DropLost(inbox);
    polled_.push_back({inbox.file.get(), POLLIN, 0});
    inboxes_.push_back(&inbox);
  };
  add(own_box_);
  for (auto& [group, inbox] : groups_) add(inbox);
  const int readable = poll(polled_.data(), polled_.size(), 0);
  Inbox* first = nullptr;
  for (std::size_t i = 0; readable > 0 && i < polled_.size(); ++i) {
    if ((polled_[i].revents & POLLIN) == 0) continue;
    const bool earlier =
        first == nullptr || FirstArrival(inboxes_[i]->file) < FirstArrival(first->file);
    if (earlier) first = inboxes_[i];
  }
  return first;
}

int PosixDatagram::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  Inbox* inbox = FirstReadable();
  if (inbox == nullptr) return WSAEWOULDBLOCK;
  if (!peek) first_ = nullptr;
  HostAddress from;
  const int flags = MSG_TRUNC | (peek ? MSG_PEEK : 0);
  const ssize_t length = recvfrom(inbox->file.get(), bytes, size, flags, from.get(), from.room());
  if (length < 0) return ToWinsockError(errno);
  if (!peek) inbox->heard = false;
  const auto whole = static_cast<std::size_t>(length);
  result = {whole < size ? whole : size, whole > size, from.endpoint(), inbox->group};
  return 0;
}

int PosixDatagram::Pending(std::uint32_t& bytes) {
  Inbox* inbox = FirstReadable();
  return inbox != nullptr ? inbox->file.Pending(bytes) : 0;
}

unsigned PosixDatagram::Ready(unsigned interest) {
  unsigned ready = 0;
  if ((interest & kReadable) != 0 && FirstReadable() != nullptr) ready |= kReadable;
  if ((interest & kWritable) != 0 && (own_box_.file.Poll(POLLOUT) & POLLOUT) != 0)
    ready |= kWritable;
  return ready;
}

void PosixDatagram::Watch(unsigned interest, std::vector<pollfd>& files) const {
  short events = 0;
  if ((interest & kReadable) != 0) events |= POLLIN;
  if ((interest & kWritable) != 0) events |= POLLOUT;
  files.push_back({own_box_.file.get(), events, 0});
  for (const auto& [group, inbox] : groups_) {
    if (inbox.file.open() && (interest & kReadable) != 0) {
      files.push_back({inbox.file.get(), POLLIN, 0});
    }
  }
}

// ---- groups and options ----

int PosixDatagram::OpenGroup(Address group, SocketFile& file) {
  SocketFile opened;
  int error = SocketFile::Make(SOCK_DGRAM, opened);
  if (error == 0) error = opened.Set(SOL_SOCKET, SO_REUSEADDR, 1);
  if (error == 0) error = opened.Set(IPPROTO_IP, kMulticastAll, 0);
  if (error == 0) error = opened.Set(SOL_SOCKET, SO_TIMESTAMPNS, 1);
  if (error == 0) {
    error = opened.Set(SOL_SOCKET, SO_RCVBUF, receive_buffer_ > 0 ? receive_buffer_ : kGroupBuffer);
  }
  if (error == 0) error = opened.Bind({group, port_});
  const ip_mreq request{{SwapOrder(group)}, {SwapOrder(device_.own)}};
  if (error == 0) error = opened.Set(IPPROTO_IP, IP_ADD_MEMBERSHIP, &request, sizeof request);
  if (error == 0) file = std::move(opened);
  return error;
}

int PosixDatagram::Join(Address group) {
  SocketFile file;
  const int error = bound_ ? OpenGroup(group, file) : 0;
  if (error == 0) groups_[group] = {std::move(file), group};
  return error;
}

int PosixDatagram::Leave(Address group) {
  groups_.erase(group);
  first_ = nullptr;
  return 0;
}

int PosixDatagram::Tune(Tuning what, int value) {
  SocketFile& file = own_box_.file;
  switch (what) {
    case Tuning::kBroadcast: return file.Set(SOL_SOCKET, SO_BROADCAST, value);
    case Tuning::kReuseAddress: return file.Set(SOL_SOCKET, SO_REUSEADDR, value);
    case Tuning::kSendBuffer: return file.Set(SOL_SOCKET, SO_SNDBUF, value);
    case Tuning::kReceiveBuffer:
      receive_buffer_ = value;
      return file.Set(SOL_SOCKET, SO_RCVBUF, value);
    case Tuning::kMulticastTtl: return file.Set(IPPROTO_IP, IP_MULTICAST_TTL, value);
    case Tuning::kMulticastLoop: return file.Set(IPPROTO_IP, IP_MULTICAST_LOOP, value);
    case Tuning::kNoDelay:
    case Tuning::kKeepAlive: break;
  }
  return WSAENOPROTOOPT;
}

}  // namespace sim
