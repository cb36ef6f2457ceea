// UDP sockets with multicast membership, as the multicast client and the syslog line use them.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

#include "base/text.h"
#include "device/deadline.h"
#include "device/local_memory.h"

namespace mcftp {

/// Dotted IPv4 text: "255.255.255.255" and the zero.
using AddressText = base::FixedText<16>;

/// The address in network order, or INADDR_NONE when `text` is null, empty, a blank or no IPv4
/// address. "255.255.255.255" is not accepted either, because its number is INADDR_NONE.
[[nodiscard]] std::uint32_t ParseAddress(const char* text) noexcept;

/// Dotted text of an address in network order.
[[nodiscard]] AddressText ToText(std::uint32_t address) noexcept;

/// A reference to Windows Sockets 1.1: started for as long as somebody holds one.
class SocketLibrary {
 public:
  SocketLibrary() noexcept = default;
  ~SocketLibrary() { Stop(); }
  SocketLibrary(const SocketLibrary&) = delete;
  SocketLibrary& operator=(const SocketLibrary&) = delete;

  /// Does nothing when this object holds a reference already.
  [[nodiscard]] bool Start() noexcept;
  void Stop() noexcept;
  [[nodiscard]] bool is_started() const noexcept { return started_; }

 private:
  bool started_ = false;
};

/// One UDP socket with an IPv4 address and port: where it is bound to, or whom it sends to.
///
/// Nothing here logs: a failure is a false result, and GetLastError names it. One thread uses an
/// object. Windows Sockets must have been started.
class UdpEndpoint {
 public:
  UdpEndpoint() noexcept;
  /// Closes the socket.
  ~UdpEndpoint() { Close(); }
  UdpEndpoint(const UdpEndpoint&) = delete;
  UdpEndpoint& operator=(const UdpEndpoint&) = delete;

  /// Makes the socket; an earlier one is closed.
  [[nodiscard]] bool Create() noexcept;
  /// @return false when there was no socket or closing failed; there is none afterwards.
  bool Close() noexcept;
  [[nodiscard]] bool is_open() const noexcept { return socket_ != INVALID_SOCKET; }
  [[nodiscard]] SOCKET handle() const noexcept { return socket_; }

  /// Lets several sockets of the machine bind the same port.
  [[nodiscard]] bool AllowAddressReuse() noexcept;
  /// Binds to `port` on every interface and remembers that as the endpoint's address.
  [[nodiscard]] bool Bind(std::uint16_t port) noexcept;

  /// Joins a multicast group on the default interface and remembers it.
  /// @param group  dotted text
  [[nodiscard]] bool JoinGroup(const char* group) noexcept;
  /// Leaves the group joined last.
  bool LeaveGroup() noexcept;
  /// Groups joined and not left.
  [[nodiscard]] int joined_groups() const noexcept { return joined_groups_; }

  /// @param address  network order
  void SetAddress(std::uint32_t address) noexcept { address_.sin_addr.s_addr = address; }
  /// @param port  host order
  void SetPort(std::uint16_t port) noexcept;
  void SetAddress(const sockaddr_in& address) noexcept { address_ = address; }
  [[nodiscard]] const sockaddr_in& address() const noexcept { return address_; }
  /// Host order.
  [[nodiscard]] std::uint16_t port() const noexcept;
  [[nodiscard]] AddressText address_text() const noexcept;

  /// Sends one datagram from this endpoint's socket to `target`'s address.
  /// @return false when the call failed.
  bool SendTo(const UdpEndpoint& target, const void* bytes, std::uint16_t length) noexcept;

 private:
  bool ChangeMembership(int option, std::uint32_t group) noexcept;

  SOCKET socket_ = INVALID_SOCKET;
  sockaddr_in address_;
  std::uint32_t group_ = 0;  ///< network order; the group joined last
  int joined_groups_ = 0;
};

/// A received datagram: bytes in the network object's own buffer, valid until its next Receive.
struct Datagram {
  std::uint8_t* bytes = nullptr;  ///< null: nothing was received; a cipher may work in place
  std::uint32_t length = 0;
  sockaddr_in sender = {};

  [[nodiscard]] explicit operator bool() const noexcept { return bytes != nullptr; }
};

/// The host's own name and address, and receiving, which needs to know them.
class UdpNetwork {
 public:
  UdpNetwork() noexcept = default;

  /// Starts Windows Sockets for as long as this object lives or until Stop, and learns the host's
  /// names and address. A host that does not know its own address starts all the same.
  [[nodiscard]] bool Start() noexcept;
  void Stop() noexcept { library_.Stop(); }

  /// The host's name, empty when unknown.
  [[nodiscard]] const char* host_name() const noexcept { return host_name_.c_str(); }
  /// The name that the name service gives for it.
  [[nodiscard]] const char* full_name() const noexcept { return full_name_.c_str(); }
  /// Network order; 0 when unknown.
  [[nodiscard]] std::uint32_t own_address() const noexcept { return own_address_; }
  [[nodiscard]] AddressText own_address_text() const noexcept;

  /// Bytes behind the longest datagram that belong to the buffer, too: ciphers work in blocks.
  static constexpr std::uint32_t kSpareBytes = 8;

  /// Waits for a datagram on `endpoint`'s socket. Empty datagrams are dropped and use up the wait.
  /// So is the report that an earlier datagram found no receiver. Datagrams from the host's own
  /// address are dropped, and the wait begins anew: so a client never hears its own multicast
  /// frames.
  ///
  /// @param timeout_ms  0 waits without limit
  /// @return nothing after the time-out and on any failure. The datagram is followed by kSpareBytes
  ///   zeros in memory.
  [[nodiscard]] Datagram Receive(const UdpEndpoint& endpoint, std::uint32_t timeout_ms) noexcept {
    device::Deadline deadline(timeout_ms);
    return Receive(endpoint, nullptr, deadline);
  }

  /// The same on two sockets at once: when both have something to give, they take turns.
  /// @param other     may be null or closed
  /// @param deadline  of a wait that may have begun before this call
  [[nodiscard]] Datagram Receive(const UdpEndpoint& endpoint, const UdpEndpoint* other,
                                 device::Deadline& deadline) noexcept;

 private:
  void LearnOwnIdentity() noexcept;
  /// @return the endpoint that can be read, null for neither.
  const UdpEndpoint* AwaitReadable(const UdpEndpoint& endpoint, const UdpEndpoint* other,
                                   std::uint32_t timeout_ms) noexcept;
  /// Takes what made the socket readable. @return its length, 0 when there was nothing to it, -1
  ///   for a failure.
  int TakeDatagram(const UdpEndpoint& endpoint, sockaddr_in& sender) noexcept;
  [[nodiscard]] bool IsOwn(const sockaddr_in& sender) const noexcept;

  SocketLibrary library_;
  std::uint32_t own_address_ = 0;  ///< network order; 0 filters nothing
  base::FixedText<128> host_name_;
  base::FixedText<256> full_name_;
  device::LocalBlock<std::uint8_t> buffer_;  ///< made by the first Receive
  bool other_is_next_ = false;               ///< of two sockets
};

}  // namespace mcftp
