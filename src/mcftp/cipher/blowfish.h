// The Blowfish block cipher as MCFTP uses it: every 8-byte block for itself, the halves of a block
// little-endian in memory, the last block filled up with zeros.
#pragma once

#include <cstddef>
#include <cstdint>

namespace mcftp {

/// A keyed cipher of about 4 KiB: too large for a stack frame of the device, so its owner keeps it
/// on the heap. Constant once made; any number of threads may use one.
class Blowfish {
 public:
  static constexpr std::size_t kBlock = 8;  ///< bytes

  /// Runs the key schedule, which costs as much as enciphering 4 KiB.
  /// @param key     the bytes of the key; only the first 72 count
  /// @param length  bytes; an empty key is taken for one zero byte
  Blowfish(const std::uint8_t* key, std::size_t length) noexcept;
  Blowfish(const Blowfish&) = delete;
  Blowfish& operator=(const Blowfish&) = delete;

  /// Bytes that `length` bytes have once enciphered.
  [[nodiscard]] static constexpr std::size_t PaddedLength(std::size_t length) noexcept {
    return length / kBlock * kBlock + (length % kBlock != 0 ? kBlock : 0);
  }

  /// Enciphers `length` bytes, padded with zeros to whole blocks.
  /// @param to  room for PaddedLength(length) bytes; `from` itself or memory that does not touch it
  /// @return bytes written, 0 for length 0
  std::size_t Encipher(const void* from, void* to, std::size_t length) const noexcept;

  /// Deciphers as many whole blocks as hold `length` bytes; nothing for length 0. No padding is
  /// removed: the protocol's own length fields say what counts.
  /// @param from  PaddedLength(length) bytes, also when `length` ends within a block
  /// @param to    room for as many; `from` itself or memory that does not touch it
  void Decipher(const void* from, void* to, std::size_t length) const noexcept;

  void EncipherBlock(std::uint32_t& left, std::uint32_t& right) const noexcept;
  void DecipherBlock(std::uint32_t& left, std::uint32_t& right) const noexcept;

  static constexpr std::size_t kRounds = 16;
  /// What the key schedule makes of the key.
  struct Schedule {
    std::uint32_t subkeys[kRounds + 2];
    std::uint32_t boxes[4][256];
  };

 private:
  Schedule schedule_;
};

}  // namespace mcftp
