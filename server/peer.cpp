#include "server/peer.h"

#include <charconv>
#include <system_error>

namespace server {
namespace {

/// Takes a decimal number of at most `limit` off the front of `text`.
std::optional<std::uint32_t> TakeNumber(std::string_view& text, std::uint32_t limit) {
  std::uint32_t value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc{} || value > limit) return std::nullopt;
  text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  return value;
}

bool TakeCharacter(std::string_view& text, char wanted) {
  if (text.empty() || text.front() != wanted) return false;
  text.remove_prefix(1);
  return true;
}

std::optional<std::uint32_t> TakeAddress(std::string_view& text) {
  std::uint32_t address = 0;
  for (int part = 0; part < 4; ++part) {
    if (part > 0 && !TakeCharacter(text, '.')) return std::nullopt;
    const auto byte = TakeNumber(text, 255);
    if (!byte) return std::nullopt;
    address = address << 8U | *byte;
  }
  return address;
}

}  // namespace

std::string AddressText(std::uint32_t address) {
  std::string text;
  for (unsigned shift = 32; shift > 0; shift -= 8) {
    text += std::to_string(address >> (shift - 8) & 0xFFU);
    if (shift > 8) text += '.';
  }
  return text;
}

std::string ToText(const Peer& peer) {
  return AddressText(peer.address) + ":" + std::to_string(peer.port);
}

std::optional<std::uint32_t> ParseAddress(std::string_view text) {
  const auto address = TakeAddress(text);
  if (!text.empty()) return std::nullopt;
  return address;
}

std::optional<Peer> ParsePeer(std::string_view text) {
  const auto address = TakeAddress(text);
  if (!address || !TakeCharacter(text, ':')) return std::nullopt;
  const auto port = TakeNumber(text, 65535);
  if (!port || !text.empty()) return std::nullopt;
  return Peer{*address, static_cast<std::uint16_t>(*port)};
}

}  // namespace server
