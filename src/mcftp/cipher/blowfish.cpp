#include "mcftp/cipher/blowfish.h"

#include <cstring>
#include <type_traits>
#include <utility>

#include "mcftp/cipher/pi.h"

namespace mcftp {
namespace {

using Schedule = Blowfish::Schedule;

constexpr std::size_t kRounds = Blowfish::kRounds;
constexpr std::size_t kBlock = Blowfish::kBlock;

constexpr bool kLargeCore = sizeof(void*) >= 8;

// A round of one block is a chain of table reads that each wait for the one before. Blocks do not
// depend on each other, so several go through the rounds together and wait at the same time: the
// halves of five are what the registers of a 64-bit core hold. A handheld's core waits little, but
// a loop costs it; beside the addresses of the boxes, two blocks are what the registers of a 32-bit
// ARM carry (18.8 instructions a round for one block, 16.8 for each of two, 18.2 of three, 19.2 of
// four).
constexpr std::size_t kSideBySide = kLargeCore ? 5 : 2;

// Rounds in a row without a loop: a large core has the room, a handheld's cache has not.
constexpr std::size_t kRoundsInARow = kLargeCore ? Blowfish::kRounds : 2;

constexpr std::make_index_sequence<1> kOneBlock;

enum class Direction : bool { kEncipher, kDecipher };

// KEPT ODDITY: the halves of a block are little-endian in memory, where the published cipher has
// them big-endian. Clients and servers in the field have it so, and so has every machine that this
// runs on: a half is copied as it stands.
static_assert(__BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__);

// A handheld's core reads no word at an odd address: the compiler would call a function for each.
std::uint32_t Load(const std::uint8_t* bytes) noexcept {
  if constexpr (kLargeCore) {
    std::uint32_t half = 0;
    std::memcpy(&half, bytes, sizeof half);
    return half;
  }
  return static_cast<std::uint32_t>(bytes[0]) | static_cast<std::uint32_t>(bytes[1]) << 8 |
         static_cast<std::uint32_t>(bytes[2]) << 16 | static_cast<std::uint32_t>(bytes[3]) << 24;
}

void Store(std::uint8_t* bytes, std::uint32_t half) noexcept {
  if constexpr (kLargeCore) {
    std::memcpy(bytes, &half, sizeof half);
  } else {
    for (unsigned at = 0; at < sizeof half; ++at) {
      bytes[at] = static_cast<std::uint8_t>(half >> (8 * at));
    }
  }
}

/// The value itself, of which the compiler knows nothing any more: it keeps it in a register.
template <typename Value>
[[gnu::always_inline]] inline Value Kept(Value value) noexcept {
  asm("" : "+r"(value));
  return value;
}

/// The boxes on a large core, where an address costs nothing.
struct LargeBoxes {
  explicit LargeBoxes(const Schedule& schedule) noexcept : box(schedule.boxes) {}

  const std::uint32_t (&box)[4][256];
  static constexpr std::uint32_t byte() noexcept { return 0xFF; }
};

/// On a handheld's, where the compiler would compute the address of a box for each look-up.
struct SmallBoxes {
  explicit SmallBoxes(const Schedule& schedule) noexcept
      : box{Kept(&schedule.boxes[0][0]), Kept(&schedule.boxes[1][0]), Kept(&schedule.boxes[2][0]),
            Kept(&schedule.boxes[3][0])} {}
  [[nodiscard]] std::uint32_t byte() const noexcept { return kept_byte; }

  const std::uint32_t* box[4];
  std::uint32_t kept_byte = Kept(std::uint32_t{0xFF});
};

using Boxes = std::conditional_t<kLargeCore, LargeBoxes, SmallBoxes>;

/// Deciphering is the same with the subkeys from behind.
template <Direction kDirection>
std::uint32_t Subkey(const Schedule& schedule, std::size_t at) noexcept {
  return schedule.subkeys[kDirection == Direction::kEncipher ? at : kRounds + 1 - at];
}

/// What a half does to the other one. The indices are of the machine's own width, so that none has
/// to be widened.
[[gnu::always_inline]] inline std::uint32_t Mix(const Boxes& boxes, std::uint32_t half) noexcept {
  const std::size_t first = half >> 24;
  const std::size_t second = half >> 16 & boxes.byte();
  const std::size_t third = half >> 8 & boxes.byte();
  const std::size_t fourth = half & boxes.byte();
  return ((boxes.box[0][first] + boxes.box[1][second]) ^ boxes.box[2][third]) +
         boxes.box[3][fourth];
}

/// One round of every lane.
template <std::size_t... kLane>
[[gnu::always_inline]] inline void Round(const Boxes& boxes, std::uint32_t subkey,
                                         std::uint32_t (&half)[sizeof...(kLane)],
                                         std::uint32_t (&other)[sizeof...(kLane)],
                                         std::index_sequence<kLane...> /*lanes*/) noexcept {
  ((half[kLane] ^= subkey, other[kLane] ^= Mix(boxes, half[kLane])), ...);
}

/// Rounds first + 2 * kPair and the one after it, for every kPair: after two rounds the halves are
/// in their places again.
template <Direction kDirection, std::size_t... kPair, std::size_t kLanes, typename Lanes>
[[gnu::always_inline]] inline void RoundsInARow(const Schedule& schedule, const Boxes& boxes,
                                                std::size_t first, std::uint32_t (&left)[kLanes],
                                                std::uint32_t (&right)[kLanes],
                                                std::index_sequence<kPair...> /*pairs*/,
                                                Lanes lanes) noexcept {
  ((Round(boxes, Subkey<kDirection>(schedule, first + 2 * kPair), left, right, lanes),
    Round(boxes, Subkey<kDirection>(schedule, first + 2 * kPair + 1), right, left, lanes)),
   ...);
}

/// Takes the blocks kLane... of `from` through the rounds side by side. All are read before the
/// first is written.
template <Direction kDirection, std::size_t... kLane>
void Transform(const Schedule& schedule, const std::uint8_t* from, std::uint8_t* to,
               std::index_sequence<kLane...> lanes) noexcept {
  std::uint32_t left[] = {Load(from + kLane * kBlock)...};
  std::uint32_t right[] = {Load(from + kLane * kBlock + 4)...};
  const Boxes boxes(schedule);
  constexpr std::make_index_sequence<kRoundsInARow / 2> kPairs;
  for (std::size_t round = 0; round < kRounds; round += kRoundsInARow) {
    RoundsInARow<kDirection>(schedule, boxes, round, left, right, kPairs, lanes);
  }
  const std::uint32_t last = Subkey<kDirection>(schedule, kRounds);
  const std::uint32_t behind_last = Subkey<kDirection>(schedule, kRounds + 1);
  (Store(to + kLane * kBlock, right[kLane] ^ behind_last), ...);
  (Store(to + kLane * kBlock + 4, left[kLane] ^ last), ...);
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
