#include "net/endpoint.h"

#include <charconv>

namespace sim {

std::optional<Address> ParseAddress(std::string_view text) {
  Address address = 0;
  for (int part = 0; part < 4; ++part) {
    unsigned value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc{} || value > 255) return std::nullopt;
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    address = (address << 8U) | value;
    if (part == 3) break;
    if (text.empty() || text.front() != '.') return std::nullopt;
    text.remove_prefix(1);
  }
  if (!text.empty()) return std::nullopt;
  return address;
}

std::string ToText(Address address) {
  std::string text;
  for (unsigned shift = 32; shift > 0; shift -= 8) {
    if (!text.empty()) text += '.';
    text += std::to_string((address >> (shift - 8)) & 0xFFU);
  }
  return text;
}

std::string ToText(const Endpoint& endpoint) {
  return ToText(endpoint.address) + ':' + std::to_string(endpoint.port);
}

ce_sockaddr_in ToSockaddr(const Endpoint& endpoint) {
  ce_sockaddr_in address{};
  address.sin_family = CE_AF_INET;
  address.sin_port = SwapOrder(endpoint.port);
  address.sin_addr.s_addr = SwapOrder(endpoint.address);
  return address;
}

Endpoint ToEndpoint(const ce_sockaddr_in& address) {
  return {SwapOrder(address.sin_addr.s_addr), SwapOrder(address.sin_port)};
}

}  // namespace sim
