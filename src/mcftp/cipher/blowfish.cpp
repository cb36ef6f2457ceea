#include "mcftp/cipher/blowfish.h"

#include <cstring>
#include <utility>

#include "mcftp/cipher/pi.h"

namespace mcftp {
namespace {

using Schedule = Blowfish::Schedule;

constexpr std::size_t kRounds = Blowfish::kRounds;
constexpr std::size_t kBlock = Blowfish::kBlock;

// A round of one block is a chain of table reads that each wait for the one before. Blocks do not
// depend on each other, so several go through the rounds together and wait at the same time: eight
// saturate a large core. A handheld's core waits little, but a loop costs it; three blocks are what
// the registers of a 32-bit ARM carry (20.3 instructions a round for one of two blocks, 19.8 of
// three, 20.6 of four).
constexpr std::size_t kSideBySide = sizeof(void*) >= 8 ? 8 : 3;

constexpr std::make_index_sequence<1> kOneBlock;

enum class Direction : bool { kEncipher, kDecipher };

/// Half a block, 32 bits, in a whole register: its bytes become table indices without more ado.
using Half = std::size_t;

// KEPT ODDITY: the halves of a block are little-endian in memory, where the published cipher has
// them big-endian. Clients and servers in the field have it so.
std::uint32_t Load(const std::uint8_t* bytes) noexcept {
  return static_cast<std::uint32_t>(bytes[0]) | static_cast<std::uint32_t>(bytes[1]) << 8 |
         static_cast<std::uint32_t>(bytes[2]) << 16 | static_cast<std::uint32_t>(bytes[3]) << 24;
}

void Store(std::uint8_t* bytes, std::uint32_t word) noexcept {
  bytes[0] = static_cast<std::uint8_t>(word);
  bytes[1] = static_cast<std::uint8_t>(word >> 8);
  bytes[2] = static_cast<std::uint8_t>(word >> 16);
  bytes[3] = static_cast<std::uint8_t>(word >> 24);
}

/// Deciphering is the same with the subkeys from behind.
template <Direction kDirection>
std::uint32_t Subkey(const Schedule& schedule, std::size_t at) noexcept {
  return schedule.subkeys[kDirection == Direction::kEncipher ? at : kRounds + 1 - at];
}

/// One round of every lane. Each step is taken for all lanes before the next, so that instructions
/// that stand beside each other do not wait for each other.
template <std::size_t... kLane>
[[gnu::always_inline]] inline void Round(const Schedule& schedule, std::uint32_t subkey,
                                         Half (&half)[sizeof...(kLane)],
                                         Half (&other)[sizeof...(kLane)],
                                         std::index_sequence<kLane...> /*lanes*/) noexcept {
  const auto& boxes = schedule.boxes;
  std::uint32_t mixed[sizeof...(kLane)];
  ((half[kLane] ^= subkey), ...);
  ((mixed[kLane] = boxes[0][half[kLane] >> 24]), ...);
  ((mixed[kLane] += boxes[1][half[kLane] >> 16 & 0xFF]), ...);
  ((mixed[kLane] ^= boxes[2][half[kLane] >> 8 & 0xFF]), ...);
  ((mixed[kLane] += boxes[3][half[kLane] & 0xFF]), ...);
  ((other[kLane] ^= mixed[kLane]), ...);
}

/// Takes the blocks kLane... of `from` through the rounds side by side. All are read before the
/// first is written.
template <Direction kDirection, std::size_t... kLane>
void Transform(const Schedule& schedule, const std::uint8_t* from, std::uint8_t* to,
               std::index_sequence<kLane...> lanes) noexcept {
  Half left[] = {Load(from + kLane * kBlock)...};
  Half right[] = {Load(from + kLane * kBlock + 4)...};
  for (std::size_t round = 0; round < kRounds; round += 2) {
    Round(schedule, Subkey<kDirection>(schedule, round), left, right, lanes);
    Round(schedule, Subkey<kDirection>(schedule, round + 1), right, left, lanes);
  }
  const Half last = Subkey<kDirection>(schedule, kRounds);
  const Half behind_last = Subkey<kDirection>(schedule, kRounds + 1);
  (Store(to + kLane * kBlock, static_cast<std::uint32_t>(right[kLane] ^ behind_last)), ...);
  (Store(to + kLane * kBlock + 4, static_cast<std::uint32_t>(left[kLane] ^ last)), ...);
}

/// Takes `blocks` blocks, kLanes at a time, and the rest with half as many lanes.
template <Direction kDirection, std::size_t kLanes>
void TransformAll(const Schedule& schedule, const std::uint8_t* from, std::uint8_t* to,
                  std::size_t blocks) noexcept {
  for (; blocks >= kLanes; blocks -= kLanes) {
    Transform<kDirection>(schedule, from, to, std::make_index_sequence<kLanes>());
    from += kLanes * kBlock;
    to += kLanes * kBlock;
  }
  if constexpr (kLanes > 1) TransformAll<kDirection, kLanes / 2>(schedule, from, to, blocks);
}

template <Direction kDirection>
void TransformHalves(const Schedule& schedule, std::uint32_t& left, std::uint32_t& right) noexcept {
  std::uint8_t block[kBlock];
  Store(block, left);
  Store(block + 4, right);
  Transform<kDirection>(schedule, block, block, kOneBlock);
  left = Load(block);
  right = Load(block + 4);
}

/// Replaces the words two by two with what enciphering the halves again and again gives.
void Fill(const Blowfish& cipher, std::uint32_t* words, std::size_t count, std::uint32_t& left,
          std::uint32_t& right) noexcept {
  for (std::size_t i = 0; i < count; i += 2) {
    cipher.EncipherBlock(left, right);
    words[i] = left;
    words[i + 1] = right;
  }
}

}  // namespace

Blowfish::Blowfish(const std::uint8_t* key, std::size_t length) noexcept {
  std::memcpy(&schedule_, &kPiSchedule, sizeof schedule_);
  std::size_t at = 0;
  for (std::uint32_t& subkey : schedule_.subkeys) {
    std::uint32_t word = 0;
    for (int i = 0; i < 4; ++i) {
      word = word << 8 | (length == 0 ? 0U : key[at]);
      at = at + 1 < length ? at + 1 : 0;
    }
    subkey ^= word;
  }
  std::uint32_t left = 0;
  std::uint32_t right = 0;
  Fill(*this, schedule_.subkeys, kRounds + 2, left, right);
  for (auto& box : schedule_.boxes) Fill(*this, box, 256, left, right);
}

std::size_t Blowfish::Encipher(const void* from, void* to, std::size_t length) const noexcept {
  const auto* clear = static_cast<const std::uint8_t*>(from);
  auto* enciphered = static_cast<std::uint8_t*>(to);
  const std::size_t whole = length / kBlock * kBlock;
  TransformAll<Direction::kEncipher, kSideBySide>(schedule_, clear, enciphered, whole / kBlock);
  if (whole < length) {
    std::uint8_t last[kBlock] = {};
    std::memcpy(last, clear + whole, length - whole);
    Transform<Direction::kEncipher>(schedule_, last, enciphered + whole, kOneBlock);
  }
  return PaddedLength(length);
}

void Blowfish::Decipher(const void* from, void* to, std::size_t length) const noexcept {
  TransformAll<Direction::kDecipher, kSideBySide>(schedule_, static_cast<const std::uint8_t*>(from),
                                                  static_cast<std::uint8_t*>(to),
                                                  PaddedLength(length) / kBlock);
}

void Blowfish::EncipherBlock(std::uint32_t& left, std::uint32_t& right) const noexcept {
  TransformHalves<Direction::kEncipher>(schedule_, left, right);
}

void Blowfish::DecipherBlock(std::uint32_t& left, std::uint32_t& right) const noexcept {
  TransformHalves<Direction::kDecipher>(schedule_, left, right);
}

}  // namespace mcftp
