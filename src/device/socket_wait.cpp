#include "device/socket_wait.h"

namespace device {

SocketWait WaitForSocket(SOCKET socket, SocketUse use, std::uint32_t timeout_ms) noexcept {
  fd_set sockets;
  FD_ZERO(&sockets);
  FD_SET(socket, &sockets);
  timeval limit = {};
  limit.tv_sec = static_cast<LONG>(timeout_ms / 1000);
  limit.tv_usec = static_cast<LONG>(timeout_ms % 1000 * 1000);
  const bool reading = use == SocketUse::kRead;
  const int ready = select(0, reading ? &sockets : nullptr, reading ? nullptr : &sockets, nullptr,
                           timeout_ms == 0 ? nullptr : &limit);
  if (ready == SOCKET_ERROR) return SocketWait::kError;
  if (ready == 0) return SocketWait::kTimeout;
  return FD_ISSET(socket, &sockets) ? SocketWait::kReady : SocketWait::kNotSet;
}

}  // namespace device
