// The TCP connection under the HTTP client.
#pragma once

#include <coredll.h>

#include <cstdint>

#include "base/text.h"

namespace http {

/// Default bound, in milliseconds, of the wait for a connection and of every wait for data.
inline constexpr std::uint32_t kDefaultTimeoutMs = 10000;

/// One stream socket and the server it is connected to. Every step that fails is written to the
/// transfer log.
///
/// Addresses are 32-bit IPv4 in network order, as the socket calls take them; ports are in host
/// order. Windows Sockets must have been started. One thread uses an object; nothing here locks.
class CSocketIO {
 public:
  CSocketIO() noexcept = default;
  /// Closes at once, without a log line.
  ~CSocketIO() { CloseAtOnce(); }
  CSocketIO(const CSocketIO&) = delete;
  CSocketIO& operator=(const CSocketIO&) = delete;

  /// The address of a host given as dotted decimal, which asks no name service, or by name.
  /// @return 0 for a null or empty host, one longer than 127 characters, and a name that does not
  ///   resolve.
  [[nodiscard]] static std::uint32_t GetHostIp(const WCHAR* host) noexcept;

  /// The address as dotted text; empty, with a log line, when the system refuses it.
  [[nodiscard]] static base::FixedText<16> IPToString(std::uint32_t address) noexcept;

  /// Makes the socket, in blocking mode. An earlier one must have been closed.
  [[nodiscard]] bool CreateTcpSocket() noexcept;

  /// Connects and waits until the socket can be written. The connecting itself takes as long as
  /// the system lets it; `timeout_ms` bounds the wait behind it.
  /// @return false without a socket; with the socket closed when the connection was refused; and
  ///   with the socket still open, for the caller to close, when it did not become writable.
  [[nodiscard]] bool Connect(std::uint32_t address, std::uint16_t port,
                             std::uint32_t timeout_ms) noexcept;

  /// Waits until the socket takes data. Each way to fail writes its log line.
  /// @param timeout_ms  0 waits without limit
  [[nodiscard]] bool SocketWriteable(std::uint32_t timeout_ms) const noexcept;

  /// Waits until there is data, the peer has closed or the connection broke. Fails silently.
  /// @param timeout_ms  0 waits without limit
  [[nodiscard]] bool SocketReadable(std::uint32_t timeout_ms) const noexcept;

  /// Sends in pieces of at most one Ethernet segment, and waits longer and longer, up to 10,240 ms
  /// a time and without an end, while the send buffer is full.
  /// @return bytes sent; fewer than `length` when the connection failed.
  [[nodiscard]] std::uint32_t SendData(const char* bytes, std::uint32_t length) noexcept;

  /// Receives once. @return bytes received, 0 when the peer has closed, -1 on an error.
  [[nodiscard]] int ReadData(char* buffer, std::uint32_t size) noexcept;

  /// Says goodbye, takes in what the peer still sends, logs and closes. The taking in ends when
  /// the peer closes, is silent for the time-out, or has gone on for 60 s.
  /// @return false, and nothing else happens, without a socket.
  bool Close() noexcept;

  /// Closes without goodbye and without a log line.
  void CloseAtOnce() noexcept;

  [[nodiscard]] bool is_open() const noexcept { return socket_ != INVALID_SOCKET; }
  [[nodiscard]] std::uint32_t timeout_ms() const noexcept { return timeout_ms_; }
  /// For the wait for a connection and for every wait for data; 0 waits without limit.
  void set_timeout_ms(std::uint32_t timeout_ms) noexcept { timeout_ms_ = timeout_ms; }

 protected:
  [[nodiscard]] SOCKET socket_handle() const noexcept { return socket_; }

 private:
  void Drain() noexcept;

  SOCKET socket_ = INVALID_SOCKET;
  std::uint32_t timeout_ms_ = kDefaultTimeoutMs;
};

}  // namespace http
