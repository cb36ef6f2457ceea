#include "device/socket_wait.h"

namespace device {
namespace {

timeval ToInterval(std::uint32_t wait_ms) noexcept {
  timeval interval = {};
  interval.tv_sec = static_cast<LONG>(wait_ms / 1000);
  interval.tv_usec = static_cast<LONG>(wait_ms % 1000 * 1000);
  return interval;
}

}  // namespace

SocketWait WaitForSocket(SOCKET socket, SocketUse use, std::uint32_t timeout_ms) noexcept {
  fd_set sockets;
  FD_ZERO(&sockets);
  FD_SET(socket, &sockets);
  timeval limit = ToInterval(timeout_ms);
  const bool reading = use == SocketUse::kRead;
  const int ready = select(0, reading ? &sockets : nullptr, reading ? nullptr : &sockets, nullptr,
                           timeout_ms == 0 ? nullptr : &limit);
  if (ready == SOCKET_ERROR) return SocketWait::kError;
  if (ready == 0) return SocketWait::kTimeout;
  return FD_ISSET(socket, &sockets) ? SocketWait::kReady : SocketWait::kNotSet;
}

ReadySockets WaitForEither(SOCKET first, SOCKET second, std::uint32_t timeout_ms) noexcept {
  fd_set sockets;
  FD_ZERO(&sockets);
  FD_SET(first, &sockets);
  FD_SET(second, &sockets);
  timeval limit = ToInterval(timeout_ms);
  const int ready = select(0, &sockets, nullptr, nullptr, timeout_ms == 0 ? nullptr : &limit);
  if (ready <= 0) return {};
  return {FD_ISSET(first, &sockets) != 0, FD_ISSET(second, &sockets) != 0};
}

}  // namespace device
