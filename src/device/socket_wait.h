// Waiting until a socket can be read or written.
#pragma once

#include <coredll.h>

#include <cstdint>

namespace device {

enum class SocketUse : std::uint8_t { kRead, kWrite };

enum class SocketWait : std::uint8_t {
  kReady,
  kTimeout,
  kNotSet,  ///< the wait ended, but not for this socket
  kError,   ///< WSAGetLastError says which
};

/// Waits until `socket` is ready for `use`: for reading also at the stream's end.
/// @param timeout_ms  0: without limit
SocketWait WaitForSocket(SOCKET socket, SocketUse use, std::uint32_t timeout_ms) noexcept;

/// Which of two sockets can be read.
struct ReadySockets {
  bool first = false;
  bool second = false;
};

/// Waits until one of two sockets can be read. Neither after the time-out and on a failure.
/// @param timeout_ms  0: without limit
ReadySockets WaitForEither(SOCKET first, SOCKET second, std::uint32_t timeout_ms) noexcept;

}  // namespace device
