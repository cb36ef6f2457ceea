// CRC-32 for cores without an instruction for it: three ways to take bytes in, from plain to fast.
//
// A message is a polynomial over the bits 0 and 1 and its CRC the remainder of dividing it by the
// generator P. Bits are sent lowest first, so a bit further back in memory is a lower power of x,
// and 32 powers are one word.
//
//  Bytes    The remainder takes in one byte with one look-up.
//  Strands  Words are dealt out to remainders that do not wait for each other; each steps over the
//           others' words with four look-ups. At the end they are taken in one by one.
//  Folding  P divides x^9600 + x^4960 + x^3744 + x^2848 + 1. So a word may be struck out of the
//           message when it is added to the words 145, 183, 211 and 300 further on, which takes no
//           look-up at all. Folding goes on until 300 words are left for the strands.
//
// A large core has six strands and folds. A handheld's has few registers and waits little for a
// look-up: two strands fit, and folding would take it twice as many instructions.
#include "base/crc32.h"

#include <cstring>

namespace base {
namespace {

constexpr std::uint32_t kGenerator = 0xEDB88320U;  // x^32 is understood; the lowest bit is x^31
constexpr std::size_t kWord = 4;
constexpr bool kLargeCore = sizeof(void*) >= 8;
constexpr std::size_t kStrands = kLargeCore ? 6 : 2;
constexpr std::size_t kRow = kStrands * kWord;

constexpr std::uint32_t TimesX(std::uint32_t value) noexcept {
  return (value >> 1) ^ ((value & 1U) != 0 ? kGenerator : 0U);
}

constexpr std::uint32_t PowerOfX(unsigned exponent) noexcept {
  std::uint32_t value = 0x80000000U;  // 1
  for (; exponent > 0; --exponent) value = TimesX(value);
  return value;
}

static_assert((PowerOfX(9600) ^ PowerOfX(4960) ^ PowerOfX(3744) ^ PowerOfX(2848)) == PowerOfX(0),
              "folding changes no remainder");

struct Tables {
  std::uint32_t byte[256] = {};           ///< a byte's remainder when it has been taken in
  std::uint32_t strand[kWord][256] = {};  ///< the same for a word's bytes when its row has been

  constexpr Tables() noexcept {
    for (std::uint32_t i = 0; i < 256; ++i) {
      std::uint32_t value = i;
      for (int bit = 0; bit < 8; ++bit) value = TimesX(value);
      byte[i] = value;
    }
    for (std::uint32_t i = 0; i < 256; ++i) {
      std::uint32_t value = i;
      for (std::size_t at = kRow; at > 0; --at) {
        value = (value >> 8) ^ byte[value & 0xFFU];
        if (at <= kWord) strand[at - 1][i] = value;
      }
    }
  }
};

constexpr Tables kTables;
static_assert(sizeof kTables <= 8192, "small enough to stay in a handheld's cache");

const std::uint8_t* AlignedToWord(const std::uint8_t* bytes) noexcept {
  return static_cast<const std::uint8_t*>(__builtin_assume_aligned(bytes, kWord));
}

/// A word with the byte sent first lowest, whatever the machine's byte order.
std::uint32_t WordAt(const std::uint8_t* aligned) noexcept {
  const std::uint8_t* at = AlignedToWord(aligned);
  return static_cast<std::uint32_t>(at[0]) | static_cast<std::uint32_t>(at[1]) << 8 |
         static_cast<std::uint32_t>(at[2]) << 16 | static_cast<std::uint32_t>(at[3]) << 24;
}

std::uint32_t TakeBytes(std::uint32_t remainder, const std::uint8_t* bytes,
                        std::size_t size) noexcept {
  for (; size > 0; --size) {
    remainder = (remainder >> 8) ^ kTables.byte[(remainder ^ *bytes++) & 0xFFU];
  }
  return remainder;
}

/// The value itself, of which the compiler knows nothing any more: it keeps it in a register. An
/// address in the tables it would compute again for each look-up.
template <typename Value>
[[gnu::always_inline]] inline Value Kept(Value value) noexcept {
  if constexpr (!kLargeCore) asm("" : "+r"(value));
  return value;
}

/// @param bytes  aligned to a word
/// @param rows   at least 1
std::uint32_t TakeRows(std::uint32_t remainder, const std::uint8_t* bytes,
                       std::size_t rows) noexcept {
  std::uint32_t strand[kStrands] = {remainder};
  const std::uint32_t* const first = Kept(kTables.strand[0]);
  const std::uint32_t* const second = Kept(kTables.strand[1]);
  const std::uint32_t* const third = Kept(kTables.strand[2]);
  const std::uint32_t* const fourth = Kept(kTables.strand[3]);
  const std::uint32_t byte = Kept(std::uint32_t{0xFF});
  for (; rows > 1; --rows, bytes += kRow) {
#pragma GCC unroll 8
    for (std::size_t i = 0; i < kStrands; ++i) {
      const std::uint32_t word = strand[i] ^ WordAt(bytes + i * kWord);
      strand[i] = first[word & byte] ^ second[(word >> 8) & byte] ^ third[(word >> 16) & byte] ^
                  fourth[word >> 24];
    }
  }
  remainder = 0;
  for (std::size_t i = 0; i < kStrands; ++i, bytes += kWord) {
    const std::uint32_t word = remainder ^ strand[i] ^ WordAt(bytes);
    constexpr std::uint8_t kNothing[kWord] = {};
    remainder = TakeBytes(word, kNothing, kWord);
  }
  return remainder;
}

/// @param bytes  aligned to a word
std::uint32_t TakeWords(std::uint32_t remainder, const std::uint8_t* bytes,
                        std::size_t size) noexcept {
  const std::size_t rows = size / kRow;
  if (rows > 0) remainder = TakeRows(remainder, bytes, rows);
  return TakeBytes(remainder, bytes + rows * kRow, size - rows * kRow);
}

// Folding works on pairs of words in memory order; adding is the same in every byte order.
constexpr std::size_t kPair = 2 * kWord;
constexpr std::size_t kReach = 300 * kWord;    // how far a struck word is carried
constexpr std::size_t kChunk = 362 * kWord;    // two chunks and the reach are 4096 bytes
constexpr std::size_t kFoldFrom = 2 * kReach;  // below that it does not pay

std::uint64_t PairAt(const std::uint8_t* aligned) noexcept {
  std::uint64_t pair;
  std::memcpy(&pair, AlignedToWord(aligned), kPair);
  return pair;
}

/// Adds what earlier words carry to the pair `reach` behind `window`: those 300, 211, 183 and 145
/// words before it.
void Fold(const std::uint8_t* message, const std::uint8_t* window, std::uint8_t* out) noexcept {
  const std::uint64_t pair = PairAt(message) ^ PairAt(window) ^ PairAt(window + 89 * kWord) ^
                             PairAt(window + 117 * kWord) ^ PairAt(window + 155 * kWord);
  std::memcpy(out, &pair, kPair);
}

/// @param bytes  aligned to a word
/// @param size   at least kFoldFrom
std::uint32_t TakeFolding(std::uint32_t remainder, const std::uint8_t* bytes,
                          std::size_t size) noexcept {
  // The struck words: those of the last `reach`, then those of the chunk under way.
  alignas(kPair) std::uint8_t window[kReach + kChunk];
  std::memset(window, 0, kReach);
  // The remainder is added to the first word, which is 300 behind this place.
  for (std::size_t i = 0; i < kWord; ++i) {
    window[i] = static_cast<std::uint8_t>(remainder >> (8 * i));
  }
  std::size_t striking = (size - kReach) / kPair * kPair;
  const std::size_t behind = size - kReach - striking;
  while (striking > 0) {
    const std::size_t chunk = striking < kChunk ? striking : kChunk;
    for (std::size_t i = 0; i < chunk; i += kPair) {
      Fold(bytes + i, window + i, window + kReach + i);
    }
    std::memmove(window, window + chunk, kReach);
    bytes += chunk;
    striking -= chunk;
  }
  // What the struck words carry is added to the last ones, which carry nothing themselves.
  std::memset(window + kReach, 0, kChunk);
  for (std::size_t i = 0; i < kReach; i += kPair) Fold(bytes + i, window + i, window + i);
  return TakeWords(TakeWords(0, window, kReach), bytes + kReach, behind);
}

}  // namespace

void Crc32::Update(const void* bytes, std::size_t size) noexcept {
  const auto* at = static_cast<const std::uint8_t*>(bytes);
  const std::size_t unaligned = (0 - reinterpret_cast<std::uintptr_t>(at)) % kWord;
  const std::size_t first = unaligned < size ? unaligned : size;
  remainder_ = TakeBytes(remainder_, at, first);
  at += first;
  size -= first;
  if constexpr (kLargeCore) {
    if (size >= kFoldFrom) {
      remainder_ = TakeFolding(remainder_, at, size);
      return;
    }
  }
  remainder_ = TakeWords(remainder_, at, size);
}

}  // namespace base
