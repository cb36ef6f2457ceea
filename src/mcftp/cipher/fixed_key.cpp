#include "mcftp/cipher/fixed_key.h"

namespace mcftp {

FixedKey::FixedKey() noexcept {
  constexpr unsigned kMask = 0x5A;
  constexpr unsigned kStep = 37;
  constexpr unsigned kStart = 11;
  for (unsigned i = 0; i < kLength; ++i) {
    bytes[i] = static_cast<std::uint8_t>(kMask ^ (i * kStep + kStart));
  }
}

}  // namespace mcftp
