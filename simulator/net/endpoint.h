// IPv4 addresses and ports as the simulator keeps them: in host order.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>

#include "ce/winsock.h"

namespace sim {

/// IPv4, host order: 127.0.0.1 is 0x7F000001.
using Address = std::uint32_t;

inline constexpr Address kAnyAddress = 0;
inline constexpr Address kLocalHost = 0x7F000001;
inline constexpr Address kBroadcastAddress = 0xFFFFFFFF;

[[nodiscard]] constexpr bool IsMulticast(Address address) {
  return address >> 28U == 0xE;
}

/// The address of dotted decimal text of four parts, nothing for any other text.
[[nodiscard]] std::optional<Address> ParseAddress(std::string_view text);
/// "10.0.0.2"
[[nodiscard]] std::string ToText(Address address);

struct Endpoint {
  Address address = kAnyAddress;
  std::uint16_t port = 0;  ///< host order

  friend bool operator==(const Endpoint& a, const Endpoint& b) {
    return a.address == b.address && a.port == b.port;
  }
  friend bool operator!=(const Endpoint& a, const Endpoint& b) { return !(a == b); }
  friend bool operator<(const Endpoint& a, const Endpoint& b) {
    return std::tie(a.address, a.port) < std::tie(b.address, b.port);
  }
};

/// "10.0.0.2:80"
[[nodiscard]] std::string ToText(const Endpoint& endpoint);

/// Either direction of the byte order conversion.
[[nodiscard]] constexpr std::uint16_t SwapOrder(std::uint16_t value) {
  return static_cast<std::uint16_t>((value << 8U) | (value >> 8U));
}
[[nodiscard]] constexpr std::uint32_t SwapOrder(std::uint32_t value) {
  return (value << 24U) | ((value & 0xFF00U) << 8U) | ((value >> 8U) & 0xFF00U) | (value >> 24U);
}

/// The API's structure for `endpoint`.
[[nodiscard]] ce_sockaddr_in ToSockaddr(const Endpoint& endpoint);
[[nodiscard]] Endpoint ToEndpoint(const ce_sockaddr_in& address);

}  // namespace sim
