// The memory functions of the device's library, in every alignment. Compiled with the sanitizers of
// addresses and of alignment, because the device stops a program for what others forgive.
#include "blocks.h"

#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <numeric>
#include <vector>

namespace {

using ce_runtime::Byte;

constexpr std::size_t kSizes[] = {0, 1, 2, 3, 4, 5, 7, 15, 16, 17, 18, 19, 20, 31, 32, 33, 63, 70};
constexpr std::size_t kRoom = 256;

std::vector<Byte> Numbered() {
  std::vector<Byte> bytes(kRoom);
  std::iota(bytes.begin(), bytes.end(), Byte{1});
  return bytes;
}

/// Calls with each size and each alignment of two sides.
template <typename Action>
void InEveryAlignment(Action action) {
  for (const std::size_t size : kSizes) {
    for (std::size_t to = 0; to < 8; ++to) {
      for (std::size_t from = 0; from < 8; ++from) action(size, to, from);
    }
  }
}

/// A block of its own on the heap that ends where its bytes end, so that what reads on is caught.
struct Exact {
  Exact(std::size_t offset, std::size_t size)
      : memory(std::make_unique<Byte[]>(offset + size)), bytes(memory.get() + offset) {}
  std::unique_ptr<Byte[]> memory;
  Byte* bytes;
};

TEST(CopyUpTest, CopiesEverySizeInEveryAlignmentAndTouchesNothingElse) {
  const std::vector<Byte> numbers = Numbered();
  InEveryAlignment([&](std::size_t size, std::size_t to, std::size_t from) {
    const Exact source(from, size);
    std::memcpy(source.bytes, numbers.data(), size);
    std::vector<Byte> target(kRoom, 0xEE);
    ce_runtime::CopyUp(target.data() + to, source.bytes, size);
    std::vector<Byte> expected(kRoom, 0xEE);
    std::copy_n(numbers.begin(), size, expected.begin() + static_cast<std::ptrdiff_t>(to));
    ASSERT_EQ(target, expected) << size << " bytes from " << from << " to " << to;
  });
}

TEST(MoveTest, MovesOverlappingBlocksBothWays) {
  InEveryAlignment([](std::size_t size, std::size_t to, std::size_t from) {
    std::vector<Byte> moved = Numbered();
    std::vector<Byte> expected = moved;
    ce_runtime::Move(moved.data() + to, moved.data() + from, size);
    std::memmove(expected.data() + to, expected.data() + from, size);
    ASSERT_EQ(moved, expected) << size << " bytes from " << from << " to " << to;
  });
}

TEST(FillTest, FillsEverySizeInEveryAlignmentAndTouchesNothingElse) {
  InEveryAlignment([](std::size_t size, std::size_t to, std::size_t /*from*/) {
    std::vector<Byte> filled(kRoom, 1);
    ce_runtime::Fill(filled.data() + to, 0xA5, size);
    std::vector<Byte> expected(kRoom, 1);
    std::fill_n(expected.begin() + static_cast<std::ptrdiff_t>(to), size, Byte{0xA5});
    ASSERT_EQ(filled, expected) << size << " bytes to " << to;
  });
}

TEST(CompareTest, FindsTheFirstDifferenceWhereverItLies) {
  const std::vector<Byte> numbers = Numbered();
  InEveryAlignment([&](std::size_t size, std::size_t to, std::size_t from) {
    const Exact first(to, size);
    const Exact second(from, size);
    std::memcpy(first.bytes, numbers.data(), size);
    std::memcpy(second.bytes, numbers.data(), size);
    ASSERT_EQ(ce_runtime::Compare(first.bytes, second.bytes, size), 0);
    for (std::size_t i = 0; i < size; ++i) {
      first.bytes[i] = 0xFF;
      ASSERT_GT(ce_runtime::Compare(first.bytes, second.bytes, size), 0) << i << " of " << size;
      ASSERT_LT(ce_runtime::Compare(second.bytes, first.bytes, size), 0) << i << " of " << size;
      first.bytes[i] = numbers[i];
    }
  });
}

TEST(FindTest, FindsTheFirstOfSeveralAndNothingBehindTheEnd) {
  const char text[] = "abcabc";
  EXPECT_EQ(ce_runtime::Find(text, 'c', 6), text + 2);
  EXPECT_EQ(ce_runtime::Find(text, 'c', 2), nullptr);
  const char16_t wide[] = u"ab\u20ac";
  EXPECT_EQ(ce_runtime::Find(wide, u'\u20ac', 3), wide + 2);
  EXPECT_EQ(ce_runtime::Find(wide, u'\xac', 3), nullptr) << "half of a unit is no match";
}

TEST(LengthTest, CountsUnitsOfAnyWidth) {
  EXPECT_EQ(ce_runtime::Length(""), 0U);
  EXPECT_EQ(ce_runtime::Length("four"), 4U);
  EXPECT_EQ(ce_runtime::Length(u"\u0100\u0200"), 2U);
}

TEST(FindTextTest, FindsAPartThatBeginsAgainInsideAFailedMatch) {
  const char text[] = "aabaaab";
  EXPECT_EQ(ce_runtime::FindText(text, "aaab"), text + 3);
  EXPECT_EQ(ce_runtime::FindText(text, ""), text);
  EXPECT_EQ(ce_runtime::FindText(text, "abb"), nullptr);
  EXPECT_EQ(ce_runtime::FindText("", "a"), nullptr);
}

}  // namespace
