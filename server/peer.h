// IPv4 endpoints as the engines of the server know them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>

namespace server {

/// In host order: 10.0.0.2 is 0x0A000002.
struct Peer {
  std::uint32_t address = 0;
  std::uint16_t port = 0;

  friend bool operator==(const Peer& a, const Peer& b) {
    return a.address == b.address && a.port == b.port;
  }
  friend bool operator!=(const Peer& a, const Peer& b) { return !(a == b); }
  friend bool operator<(const Peer& a, const Peer& b) {
    return std::tie(a.address, a.port) < std::tie(b.address, b.port);
  }
};

/// "10.0.0.2"
[[nodiscard]] std::string AddressText(std::uint32_t address);
/// "10.0.0.2:7000"
[[nodiscard]] std::string ToText(const Peer& peer);
/// Reads what AddressText writes: four decimal parts, and nothing else.
[[nodiscard]] std::optional<std::uint32_t> ParseAddress(std::string_view text);
/// Reads what ToText writes.
[[nodiscard]] std::optional<Peer> ParsePeer(std::string_view text);

[[nodiscard]] constexpr bool IsGroup(std::uint32_t address) {
  return address >> 28U == 0xE;
}

}  // namespace server
