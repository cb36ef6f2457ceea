#include "net/posix/file.h"

#include <netinet/in.h>
#include <sys/ioctl.h>

#include <cerrno>

#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {

int SocketFile::Make(int type, SocketFile& file) {
  file = SocketFile(socket(AF_INET, type | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
  return file.open() ? 0 : ToWinsockError(errno);
}

int SocketFile::Bind(const Endpoint& local) {
  const HostAddress address(local);
  return bind(file_, address.get(), address.size()) == 0 ? 0 : ToWinsockError(errno);
}

int SocketFile::Set(int level, int option, const void* value, socklen_t size) {
  return setsockopt(file_, level, option, value, size) == 0 ? 0 : ToWinsockError(errno);
}

int SocketFile::SetIfKnown(int level, int option, const void* value, socklen_t size) {
  const bool set = setsockopt(file_, level, option, value, size) == 0 || errno == ENOPROTOOPT;
  return set ? 0 : ToWinsockError(errno);
}

int SocketFile::Pending(std::uint32_t& bytes) {
  int count = 0;
  if (ioctl(file_, FIONREAD, &count) != 0) return ToWinsockError(errno);
  bytes = static_cast<std::uint32_t>(count);
  return 0;
}

Endpoint SocketFile::Local() const {
  HostAddress address;
  return getsockname(file_, address.get(), address.room()) == 0 ? address.endpoint() : Endpoint{};
}

Endpoint SocketFile::Peer() const {
  HostAddress address;
  return getpeername(file_, address.get(), address.room()) == 0 ? address.endpoint() : Endpoint{};
}

short SocketFile::Poll(short events) const {
  pollfd file{file_, events, 0};
  return poll(&file, 1, 0) > 0 ? file.revents : short{0};
}

}  // namespace sim
