// The one key of clients and servers.
#pragma once

#include <cstddef>
#include <cstdint>

namespace mcftp {

/// The bytes of the key that every client and every server of MCFTP has. Whoever has either program
/// has the key: it keeps casual readers out of the frames and protects nothing.
struct FixedKey {
  static constexpr std::size_t kLength = 32;

  FixedKey() noexcept;

  std::uint8_t bytes[kLength];
};

}  // namespace mcftp
