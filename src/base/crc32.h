// CRC-32 of IEEE 802.3: what the upgrade server announces for a file and what `zlib` calls crc32.
#pragma once

#include <cstddef>
#include <cstdint>

namespace base {

/// The checksum of a run of bytes that may arrive in pieces of any size and alignment.
class Crc32 {
 public:
  /// Adds `size` bytes at the end. A size of 0 changes nothing, whatever `bytes` is.
  void Update(const void* bytes, std::size_t size) noexcept;

  /// The checksum of all bytes added so far; 0 of none. Adding may go on afterwards.
  [[nodiscard]] std::uint32_t value() const noexcept { return ~remainder_; }

 private:
  std::uint32_t remainder_ = 0xFFFFFFFFU;
};

}  // namespace base
