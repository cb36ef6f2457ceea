#include "net/posix/stream.h"

#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/uio.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "ce/winsock.h"
#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {
namespace {

// Lets the host choose the port when the connection is made, not before.
constexpr int kBindAddressNoPort = 24;

constexpr std::size_t kAhead = 64 * 1024;

}  // namespace

PosixStream::~PosixStream() {
  // The host does so itself with the unread bytes that it knows of.
  if (ahead_begin_ != ahead_end_) PosixStream::Abort();
}

int PosixStream::Bind(const Endpoint& local) {
  // A port whose last connections only wait for stragglers is free on the device.
  int error = file_.Set(SOL_SOCKET, SO_REUSEADDR, 1);
  if (error == 0) error = file_.Bind({own_, local.port});
  bound_ = error == 0;
  return error;
}

int PosixStream::Connect(const Endpoint& peer) {
  if (!bound_) {
    int error = file_.SetIfKnown(IPPROTO_IP, kBindAddressNoPort, 1);
    if (error == 0) error = file_.Bind({own_, 0});
    if (error != 0) return error;
    bound_ = true;
  }
  const HostAddress address(peer);
  if (connect(file_.get(), address.get(), address.size()) == 0) return 0;
  // The host's word for a target that cannot be reached from the device's address.
  return errno == EINVAL ? WSAENETUNREACH : ToWinsockError(errno);
}

int PosixStream::ConnectResult() {
  if ((file_.Poll(POLLOUT) & (POLLOUT | POLLERR | POLLHUP)) == 0) return WSAEWOULDBLOCK;
  int error = 0;
  socklen_t size = sizeof error;
  if (getsockopt(file_.get(), SOL_SOCKET, SO_ERROR, &error, &size) != 0) error = errno;
  if (error == 0) return 0;
  // The host wants to be told before the socket may try again.
  const sockaddr nowhere{};
  static_cast<void>(connect(file_.get(), &nowhere, sizeof nowhere));
  return ToWinsockError(error);
}

int PosixStream::Listen(int backlog) {
  return listen(file_.get(), backlog) == 0 ? 0 : ToWinsockError(errno);
}

int PosixStream::Accept(std::unique_ptr<Transport>& accepted) {
  SocketFile file(accept4(file_.get(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
  if (!file.open()) return ToWinsockError(errno);
  accepted = std::make_unique<PosixStream>(std::move(file), own_);
  return 0;
}

int PosixStream::Send(const char* bytes, std::size_t size, std::size_t& sent) {
  const ssize_t count = send(file_.get(), bytes, size, MSG_NOSIGNAL);
  if (count < 0) return ToWinsockError(errno);
  sent = static_cast<std::size_t>(count);
  return 0;
}

int PosixStream::SendTo(const Endpoint& /*to*/, const char* /*bytes*/, std::size_t /*size*/) {
  return WSAEOPNOTSUPP;
}

std::size_t PosixStream::TakeAhead(char* bytes, std::size_t size, bool peek) {
  const std::size_t taken = std::min(size, ahead_end_ - ahead_begin_);
  std::memcpy(bytes, ahead_.get() + ahead_begin_, taken);
  if (!peek) ahead_begin_ += taken;
  return taken;
}

int PosixStream::ReceiveFromHost(char* bytes, std::size_t size, Received& result) {
  if (!ahead_) ahead_ = std::make_unique<char[]>(kAhead);
  iovec parts[] = {{bytes, size}, {ahead_.get(), kAhead}};
  const ssize_t got = readv(file_.get(), parts, 2);
  if (got < 0) return ToWinsockError(errno);
  const auto count = static_cast<std::size_t>(got);
  result.size = std::min(count, size);
  ahead_begin_ = 0;
  ahead_end_ = count - result.size;
  return 0;
}

int PosixStream::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  if (size == 0) return 0;
  if (ahead_begin_ != ahead_end_) {
    result.size = TakeAhead(bytes, size, peek);
    return 0;
  }
  if (!peek) return ReceiveFromHost(bytes, size, result);
  const ssize_t count = recv(file_.get(), bytes, size, MSG_PEEK);
  if (count < 0) return ToWinsockError(errno);
  result.size = static_cast<std::size_t>(count);
  return 0;
}

int PosixStream::Pending(std::uint32_t& bytes) {
  bytes = static_cast<std::uint32_t>(ahead_end_ - ahead_begin_);
  return bytes != 0 ? 0 : file_.Pending(bytes);
}

int PosixStream::ShutdownSend() {
  if (shutdown(file_.get(), SHUT_WR) == 0) return 0;
  // The peer's reset came first; the next receive tells.
  return errno == ENOTCONN ? 0 : ToWinsockError(errno);
}

int PosixStream::Join(Address /*group*/) {
  return WSAENOPROTOOPT;
}
int PosixStream::Leave(Address /*group*/) {
  return WSAENOPROTOOPT;
}

int PosixStream::Tune(Tuning what, int value) {
  switch (what) {
    case Tuning::kNoDelay: return file_.Set(IPPROTO_TCP, TCP_NODELAY, value);
    case Tuning::kKeepAlive: return file_.Set(SOL_SOCKET, SO_KEEPALIVE, value);
    case Tuning::kSendBuffer: return file_.Set(SOL_SOCKET, SO_SNDBUF, value);
    case Tuning::kReceiveBuffer: return file_.Set(SOL_SOCKET, SO_RCVBUF, value);
    case Tuning::kReuseAddress: return 0;  // always on, see Bind
    case Tuning::kBroadcast:
    case Tuning::kMulticastTtl:
    case Tuning::kMulticastLoop: break;
  }
  return WSAENOPROTOOPT;
}

unsigned PosixStream::Ready(unsigned interest) {
  if (interest == kReadable && ahead_begin_ != ahead_end_) return kReadable;
  short events = 0;
  if ((interest & kReadable) != 0) events |= POLLIN;
  if ((interest & kWritable) != 0) events |= POLLOUT;
  const short found = file_.Poll(events);
  unsigned ready = 0;
  const bool has_bytes = ahead_begin_ != ahead_end_;
  if (has_bytes || (found & (POLLIN | POLLHUP | POLLERR)) != 0) ready |= kReadable;
  if ((found & (POLLOUT | POLLERR)) != 0) ready |= kWritable;
  return ready & interest;
}

void PosixStream::Watch(unsigned interest, std::vector<pollfd>& files) const {
  short events = 0;
  if ((interest & kReadable) != 0) events |= POLLIN;
  if ((interest & kWritable) != 0) events |= POLLOUT;
  files.push_back({file_.get(), events, 0});
}

void PosixStream::Abort() {
  const linger at_once{1, 0};
  static_cast<void>(file_.Set(SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once));
}

}  // namespace sim
