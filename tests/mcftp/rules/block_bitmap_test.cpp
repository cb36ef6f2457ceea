#include "mcftp/rules/block_bitmap.h"

#include <gtest/gtest.h>

#include <memory>
#include <random>
#include <set>

namespace {

using mcftp::BlockBitmap;

TEST(BlockBitmapTest, BeginsEmptyAndTellsNewBlocksFromOldOnes) {
  BlockBitmap bitmap;
  EXPECT_EQ(bitmap.FirstMissing(), 1U);
  EXPECT_TRUE(bitmap.Mark(1));
  EXPECT_FALSE(bitmap.Mark(1));
  EXPECT_TRUE(bitmap.Has(1));
  EXPECT_FALSE(bitmap.Has(2));
  EXPECT_EQ(bitmap.FirstMissing(), 2U);
}

TEST(BlockBitmapTest, NamesTheFirstBlockMissingWhateverCameBehindIt) {
  BlockBitmap bitmap;
  for (const int block : {1, 3, 4, 9, 20})
    EXPECT_TRUE(bitmap.Mark(static_cast<std::uint16_t>(block)));
  EXPECT_EQ(bitmap.FirstMissing(), 2U);
  bitmap.Mark(2);
  EXPECT_EQ(bitmap.FirstMissing(), 5U);
  for (std::uint16_t block = 5; block <= 8; ++block) bitmap.Mark(block);
  EXPECT_EQ(bitmap.FirstMissing(), 10U) << "the first byte is full, the second begins with a block";
}

TEST(BlockBitmapTest, KnowsNoBlockZero) {
  BlockBitmap bitmap;
  EXPECT_FALSE(bitmap.Mark(0));
  EXPECT_FALSE(bitmap.Has(0));
  EXPECT_EQ(bitmap.FirstMissing(), 1U);
}

TEST(BlockBitmapTest, EndsItsSearchWhenEveryNumberHasCome) {
  BlockBitmap bitmap;
  for (std::uint32_t block = 1; block <= BlockBitmap::kMaxBlocks; ++block) {
    ASSERT_TRUE(bitmap.Mark(static_cast<std::uint16_t>(block)));
  }
  EXPECT_EQ(bitmap.FirstMissing(), 65536U);
  EXPECT_TRUE(bitmap.Has(65535));
}

TEST(BlockBitmapTest, ForgetsAllForTheNextFile) {
  BlockBitmap bitmap;
  for (std::uint16_t block = 1; block <= 100; ++block) bitmap.Mark(block);
  EXPECT_EQ(bitmap.FirstMissing(), 101U);

  bitmap.Clear();

  EXPECT_EQ(bitmap.FirstMissing(), 1U);
  EXPECT_TRUE(bitmap.Mark(100));
}

TEST(BlockBitmapTest, AgreesWithASetOfNumbers) {
  std::mt19937 random(7);
  BlockBitmap bitmap;
  std::set<std::uint16_t> known;
  for (int i = 0; i < 20000; ++i) {
    const auto block = static_cast<std::uint16_t>(1 + random() % 3000);
    EXPECT_EQ(bitmap.Mark(block), known.insert(block).second);
    std::uint32_t missing = 1;
    if (i % 500 == 0) {
      while (known.count(static_cast<std::uint16_t>(missing)) != 0) ++missing;
      EXPECT_EQ(bitmap.FirstMissing(), missing);
    }
  }
}

TEST(BlockBitmapTest, TakesABitABlock) {
  EXPECT_LE(sizeof(BlockBitmap), 8193U + 8U);
}

}  // namespace
