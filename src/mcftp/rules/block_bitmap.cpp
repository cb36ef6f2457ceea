#include "mcftp/rules/block_bitmap.h"

#include <cstring>

namespace mcftp {
namespace {

constexpr std::uint8_t kFull = 0xFF;

constexpr std::uint32_t ByteOf(std::uint16_t block) noexcept {
  return (block - 1U) / 8;
}
constexpr std::uint8_t BitOf(std::uint16_t block) noexcept {
  return static_cast<std::uint8_t>(1U << (block - 1U) % 8);
}

}  // namespace

void BlockBitmap::Clear() noexcept {
  std::memset(bytes_, 0, sizeof bytes_);
  first_not_full_ = 0;
}

bool BlockBitmap::Has(std::uint16_t block) const noexcept {
  return block != 0 && (bytes_[ByteOf(block)] & BitOf(block)) != 0;
}

bool BlockBitmap::Mark(std::uint16_t block) noexcept {
  if (block == 0 || Has(block)) return false;
  bytes_[ByteOf(block)] = static_cast<std::uint8_t>(bytes_[ByteOf(block)] | BitOf(block));
  return true;
}

std::uint32_t BlockBitmap::FirstMissing() noexcept {
  while (bytes_[first_not_full_] == kFull) ++first_not_full_;
  std::uint32_t block = first_not_full_ * 8 + 1;
  for (unsigned bits = bytes_[first_not_full_]; (bits & 1U) != 0; bits >>= 1) ++block;
  return block;
}

}  // namespace mcftp
