#include "net/posix/datagram.h"

#include <netinet/in.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "ce/winsock.h"
#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {
namespace {

// Older header sets lack the name: a socket hears the groups it joined, not the whole host's.
constexpr int kMulticastAll = 49;

/// Devices of one host share its processors: what comes from a group to one of them while others
/// run waits here. A host that allows less gives what it allows, but for its administrators.
constexpr int kGroupBuffer = 1 << 20;

int SetGroupBuffer(SocketFile& file, int wanted) {
  if (wanted > 0) return file.Set(SOL_SOCKET, SO_RCVBUF, wanted);
  if (file.Set(SOL_SOCKET, SO_RCVBUFFORCE, kGroupBuffer) == 0) return 0;
  return file.Set(SOL_SOCKET, SO_RCVBUF, kGroupBuffer);
}

}  // namespace

PosixDatagram::PosixDatagram(SocketFile file, DeviceSockets& device)
    : own_box_(std::move(file)), device_(device) {}

PosixDatagram::~PosixDatagram() {
  const auto port = device_.datagram_ports.find(port_);
  if (bound_ && port != device_.datagram_ports.end()) device_.datagram_ports.erase(port);
}

int PosixDatagram::Bind(const Endpoint& local) {
  SocketFile& file = own_box_.file();
  const in_addr out{SwapOrder(device_.own)};
  // Without it what goes to a group leaves by the interface of the address that it is bound to.
  int error = file.SetIfKnown(IPPROTO_IP, IP_MULTICAST_IF, &out, sizeof out);
  if (error == 0) error = file.SetIfKnown(SOL_SOCKET, SO_TIMESTAMPNS, 1);
  if (error == 0) error = file.Bind({device_.own, local.port});
  if (error != 0) return error;
  bound_ = true;
  port_ = file.Local().port;
  device_.datagram_ports.insert(port_);
  for (auto& [group, inbox] : groups_) {
    error = OpenGroup(group, inbox);
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
  const bool stays = to.address == kLocalHost && device_.datagram_ports.count(to.port) != 0;
  const HostAddress address({stays ? device_.own : to.address, to.port});
  const ssize_t sent =
      sendto(own_box_.file().get(), bytes, size, MSG_NOSIGNAL, address.get(), address.size());
  if (sent >= 0) return 0;
  // The host's words for a target that cannot be reached from the device's address.
  return errno == EINVAL ? WSAENETUNREACH : ToWinsockError(errno);
}

// ---- receiving ----

/// Each datagram is judged once, when it comes to the front of its line.
void PosixDatagram::DropUnheard(Inbox& inbox) {
  for (; !inbox.empty(); inbox.Pop()) {
    Letter& letter = inbox.front();
    if (peer_.port != 0 && letter.from != peer_) continue;
    letter.heard = letter.heard || letter.from.address == device_.own || !device_.loss.any() ||
                   !device_.loss.Next();
    if (letter.heard) return;
  }
}

void PosixDatagram::ListOpenInboxes() {
  inboxes_.clear();
  if (own_box_.file().open()) inboxes_.push_back(&own_box_);
  for (auto& [group, inbox] : groups_) {
    if (inbox.file().open()) inboxes_.push_back(&inbox);
  }
}

/// To the device it is one socket: of several lines the one whose first datagram came first.
Inbox* PosixDatagram::FirstInLine() {
  Inbox* first = nullptr;
  for (Inbox* inbox : inboxes_) {
    DropUnheard(*inbox);
    if (inbox->empty()) continue;
    if (first == nullptr || inbox->front().when < first->front().when) first = inbox;
  }
  return first;
}

/// Whether the host may have something that is older than what waits here: not as long as every
/// line stems from the latest look at the host's files, and is not used up though there was more.
bool PosixDatagram::MustFill() const {
  return std::any_of(inboxes_.begin(), inboxes_.end(), [this](const Inbox* inbox) {
    return inbox->empty() && (inbox->was_full() || inbox->round() != round_);
  });
}

/// @return whether there was anything
bool PosixDatagram::FillEmptyInboxes() {
  ++round_;
  polled_.clear();
  for (const Inbox* inbox : inboxes_) {
    polled_.push_back({inbox->empty() ? inbox->file().get() : -1, POLLIN, 0});
  }
  if (poll(polled_.data(), polled_.size(), 0) < 0) return false;
  bool filled = false;
  for (std::size_t i = 0; i < inboxes_.size(); ++i) {
    if (!inboxes_[i]->empty()) continue;
    inboxes_[i]->Clear(round_);
    const int error = polled_[i].revents != 0 ? inboxes_[i]->Fill() : WSAEWOULDBLOCK;
    if (error != WSAEWOULDBLOCK) error_ = error;
    filled = filled || error == 0;
  }
  return filled;
}

Inbox* PosixDatagram::FirstReadable() {
  ListOpenInboxes();
  Inbox* first = FirstInLine();
  while ((first == nullptr || MustFill()) && FillEmptyInboxes()) first = FirstInLine();
  return first;
}

int PosixDatagram::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  Inbox* const inbox = FirstReadable();
  if (inbox == nullptr) return error_ != 0 ? std::exchange(error_, 0) : WSAEWOULDBLOCK;
  const Letter& letter = inbox->front();
  const std::size_t taken = std::min(size, letter.size);
  if (taken > 0) std::memcpy(bytes, letter.bytes, taken);
  result = {taken, letter.size > size, letter.from, inbox->group()};
  if (!peek) inbox->Pop();
  return 0;
}

int PosixDatagram::Pending(std::uint32_t& bytes) {
  Inbox* const inbox = FirstReadable();
  bytes = inbox != nullptr ? static_cast<std::uint32_t>(inbox->front().size) : 0;
  return 0;
}

unsigned PosixDatagram::Ready(unsigned interest) {
  unsigned ready = 0;
  const bool readable = FirstReadable() != nullptr || error_ != 0;
  if ((interest & kReadable) != 0 && readable) ready |= kReadable;
  if ((interest & kWritable) != 0 && (own_box_.file().Poll(POLLOUT) & POLLOUT) != 0) {
    ready |= kWritable;
  }
  return ready;
}

void PosixDatagram::Watch(unsigned interest, std::vector<pollfd>& files) const {
  short events = 0;
  if ((interest & kReadable) != 0) events |= POLLIN;
  if ((interest & kWritable) != 0) events |= POLLOUT;
  files.push_back({own_box_.file().get(), events, 0});
  for (const auto& [group, inbox] : groups_) {
    if (inbox.file().open() && (interest & kReadable) != 0) {
      files.push_back({inbox.file().get(), POLLIN, 0});
    }
  }
}

// ---- groups and options ----

int PosixDatagram::OpenGroup(Address group, Inbox& inbox) {
  SocketFile opened;
  int error = SocketFile::Make(SOCK_DGRAM, opened);
  if (error == 0) error = opened.Set(SOL_SOCKET, SO_REUSEADDR, 1);
  if (error == 0) error = opened.SetIfKnown(IPPROTO_IP, kMulticastAll, 0);
  if (error == 0) error = opened.SetIfKnown(SOL_SOCKET, SO_TIMESTAMPNS, 1);
  if (error == 0) error = SetGroupBuffer(opened, receive_buffer_);
  if (error == 0) error = opened.Bind({group, port_});
  const ip_mreq request{{SwapOrder(group)}, {SwapOrder(device_.own)}};
  if (error == 0) error = opened.Set(IPPROTO_IP, IP_ADD_MEMBERSHIP, &request, sizeof request);
  if (error == 0) inbox = Inbox(std::move(opened), group);
  return error;
}

int PosixDatagram::Join(Address group) {
  Inbox inbox(SocketFile(), group);
  const int error = bound_ ? OpenGroup(group, inbox) : 0;
  if (error == 0) groups_[group] = std::move(inbox);
  return error;
}

int PosixDatagram::Leave(Address group) {
  groups_.erase(group);
  return 0;
}

int PosixDatagram::Tune(Tuning what, int value) {
  SocketFile& file = own_box_.file();
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
