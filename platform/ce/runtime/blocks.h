// Copying, filling and comparing memory: by words where both sides allow it, without an access that
// is not aligned and without touching a byte outside the blocks.
#pragma once

#include <cstddef>
#include <cstdint>

namespace ce_runtime {

using Byte = unsigned char;
/// Four bytes of whatever lies there.
using Word [[gnu::may_alias]] = std::uint32_t;

/// Four words, which travel in one instruction each way.
struct [[gnu::may_alias]] Run {
  std::uint32_t words[4];
};

inline constexpr std::size_t kWord = sizeof(Word);
inline constexpr std::size_t kRun = sizeof(Run);
/// Below this it does not pay to look for words.
inline constexpr std::size_t kShort = 16;

inline std::size_t Misalignment(const void* address) noexcept {
  return reinterpret_cast<std::uintptr_t>(address) % kWord;
}

/// The words at an address that is aligned.
inline Word* Words(void* aligned) noexcept {
  return static_cast<Word*>(aligned);
}
inline const Word* Words(const void* aligned) noexcept {
  return static_cast<const Word*>(aligned);
}

inline void CopyBytes(Byte* to, const Byte* from, std::size_t size) noexcept {
  while (size-- > 0) *to++ = *from++;
}

/// Both sides are aligned.
inline std::size_t CopyWords(Byte* to, const Byte* from, std::size_t size) noexcept {
  std::size_t left = size;
  const std::uintptr_t ahead =
      reinterpret_cast<std::uintptr_t>(from) - reinterpret_cast<std::uintptr_t>(to);
  if (ahead >= kRun) {  // else one run would reach into its own source
    for (; left >= kRun; left -= kRun, to += kRun, from += kRun) {
      *static_cast<Run*>(static_cast<void*>(to)) =
          *static_cast<const Run*>(static_cast<const void*>(from));
    }
  }
  auto* target = Words(to);
  const auto* source = Words(from);
  for (; left >= kWord; left -= kWord) *target++ = *source++;
  return size - left;
}

/// Only the target is aligned: each word is put together from two of the source.
inline std::size_t CopyShiftedWords(Byte* to, const Byte* from, std::size_t size) noexcept {
  const std::size_t ahead = kWord - Misalignment(from);  // bytes until the source is aligned
  const auto low = static_cast<unsigned>(8 * ahead);
  const auto high = static_cast<unsigned>(32 - 8 * ahead);
  Word kept = 0;
  for (std::size_t i = 0; i < ahead; ++i) kept |= static_cast<Word>(from[i]) << (8 * i);
  auto* target = Words(to);
  const auto* source = Words(from + ahead);
  std::size_t left = size;
  for (; left >= ahead + kWord; left -= kWord) {
    const Word next = *source++;
    *target++ = kept | next << low;
    kept = next >> high;
  }
  return size - left;
}

/// From the lower addresses up; the blocks do not overlap, or the target lies lower.
inline void CopyUp(Byte* to, const Byte* from, std::size_t size) noexcept {
  if (size >= kShort) {
    const std::size_t head = (kWord - Misalignment(to)) % kWord;
    CopyBytes(to, from, head);
    to += head;
    from += head;
    size -= head;
    const std::size_t done =
        Misalignment(from) == 0 ? CopyWords(to, from, size) : CopyShiftedWords(to, from, size);
    to += done;
    from += done;
    size -= done;
  }
  CopyBytes(to, from, size);
}

/// From the upper addresses down; the blocks do not overlap, or the target lies higher.
inline void CopyDown(Byte* to, const Byte* from, std::size_t size) noexcept {
  Byte* target = to + size;
  const Byte* source = from + size;
  if (Misalignment(target) == Misalignment(source)) {
    for (; size > 0 && Misalignment(target) != 0; --size) *--target = *--source;
    for (; size >= kWord; size -= kWord) {
      target -= kWord;
      source -= kWord;
      *Words(target) = *Words(source);
    }
  }
  while (size-- > 0) *--target = *--source;
}

inline void Move(Byte* to, const Byte* from, std::size_t size) noexcept {
  // One comparison for both: a target below the source is far above it when counted unsigned.
  const std::uintptr_t distance =
      reinterpret_cast<std::uintptr_t>(to) - reinterpret_cast<std::uintptr_t>(from);
  if (distance >= size) {
    CopyUp(to, from, size);
  } else {
    CopyDown(to, from, size);
  }
}

inline void Fill(Byte* to, Byte value, std::size_t size) noexcept {
  if (size >= kShort) {
    for (; Misalignment(to) != 0; --size) *to++ = value;
    const Word word = value * 0x01010101U;
    auto* target = Words(to);
    for (; size >= kRun; size -= kRun, target += 4) {
      target[0] = word;
      target[1] = word;
      target[2] = word;
      target[3] = word;
    }
    for (; size >= kWord; size -= kWord) *target++ = word;
    to = reinterpret_cast<Byte*>(target);
  }
  while (size-- > 0) *to++ = value;
}

/// @return 0, or the difference of the first two bytes that differ.
inline int Compare(const Byte* first, const Byte* second, std::size_t size) noexcept {
  if (size >= kShort && Misalignment(first) == Misalignment(second)) {
    for (; Misalignment(first) != 0 && *first == *second; --size) {
      ++first;
      ++second;
    }
    if (Misalignment(first) == 0) {
      for (; size >= kWord && *Words(first) == *Words(second); size -= kWord) {
        first += kWord;
        second += kWord;
      }
    }
  }
  for (; size > 0; --size, ++first, ++second) {
    if (*first != *second) return static_cast<int>(*first) - static_cast<int>(*second);
  }
  return 0;
}

/// @return the first unit that equals `value`, or null.
template <typename Unit>
const Unit* Find(const Unit* units, Unit value, std::size_t count) noexcept {
  for (; count > 0; --count, ++units) {
    if (*units == value) return units;
  }
  return nullptr;
}

template <typename Unit>
std::size_t Length(const Unit* text) noexcept {
  std::size_t length = 0;
  while (text[length] != 0) ++length;
  return length;
}

/// @return where `part` begins in `text` for the first time, or null.
inline const char* FindText(const char* text, const char* part) noexcept {
  for (;; ++text) {
    std::size_t same = 0;
    while (part[same] != 0 && text[same] == part[same]) ++same;
    if (part[same] == 0) return text;
    if (*text == 0) return nullptr;
  }
}

}  // namespace ce_runtime
