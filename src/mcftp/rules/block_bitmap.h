// Which blocks of a file have come.
#pragma once

#include <cstddef>
#include <cstdint>

namespace mcftp {

/// One bit per block, blocks numbered from 1 as on the wire. Fixed storage of 8,193 bytes, no
/// allocation, no lock.
class BlockBitmap {
 public:
  /// The largest number that the 16-bit block field of a frame can hold.
  static constexpr std::uint32_t kMaxBlocks = 65535;

  /// Forgets all blocks.
  void Clear() noexcept;

  /// Marks `block` as received.
  /// @return true when it was new; false for a duplicate and for 0, which is no block.
  bool Mark(std::uint16_t block) noexcept;
  [[nodiscard]] bool Has(std::uint16_t block) const noexcept;

  /// The first block that is missing, from 1; kMaxBlocks + 1 when none of all that can be numbered
  /// is. Constant cost per received block: full bytes are never looked at again.
  [[nodiscard]] std::uint32_t FirstMissing() noexcept;

 private:
  /// The byte behind the last one that has blocks is never full, so every search ends.
  static constexpr std::size_t kBytes = (kMaxBlocks + 1) / 8 + 1;

  std::uint8_t bytes_[kBytes] = {};
  std::uint32_t first_not_full_ = 0;  ///< index into bytes_
};

}  // namespace mcftp
