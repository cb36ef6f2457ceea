#include "mcftp/rules/overrun.h"

#include <gtest/gtest.h>

namespace {

using mcftp::OverrunReport;
using mcftp::OverrunWatch;
using mcftp::TextsOf;

TEST(OverrunWatchTest, ReportsOnceWhenTheReceivedShareDropsBelowTheThreshold) {
  OverrunWatch watch(/*grace_blocks=*/100, /*threshold_percent=*/85);

  const auto first = watch.OnBlock(/*block=*/120, /*data_length=*/512, /*received_bytes=*/40960);
  ASSERT_TRUE(first.has_value());
  EXPECT_EQ(first->percent, 67.5F);  // (512 + 40,960) / (512 * 120)
  EXPECT_EQ(first->block, 120);
  EXPECT_EQ(watch.recorded_block(), 120);
  EXPECT_TRUE(watch.is_short());
  EXPECT_STREQ(TextsOf(*first).line, "<< OVERRUN ERROR: 67.50 at 120");
  EXPECT_STREQ(TextsOf(*first).message, "Overrun:6750:120");

  EXPECT_FALSE(watch.OnBlock(121, 512, 41472).has_value()) << "no second report within 100 blocks";
}

TEST(OverrunWatchTest, ChecksNothingUpToTheWindowStart) {
  OverrunWatch watch(100, 85);

  EXPECT_FALSE(watch.OnBlock(100, 512, 0).has_value());
  EXPECT_EQ(watch.recorded_block(), 0);
  EXPECT_TRUE(watch.OnBlock(101, 512, 0).has_value());
}

TEST(OverrunWatchTest, IsContentWithAllAndWithEnough) {
  OverrunWatch watch(100, 85);

  EXPECT_FALSE(watch.OnBlock(200, 512, 199 * 512).has_value());
  EXPECT_FALSE(watch.is_short());
  EXPECT_FALSE(watch.OnBlock(200, 512, 169 * 512).has_value()) << "170 of 200 are exactly 85";
  EXPECT_TRUE(watch.is_short());
  EXPECT_EQ(watch.recorded_block(), 0);
  EXPECT_TRUE(watch.OnBlock(200, 512, 168 * 512).has_value());
}

TEST(OverrunWatchTest, ReportsAgainOnlyMoreThanTheGraceBehindTheRecordedBlock) {
  OverrunWatch watch(100, 85);
  ASSERT_TRUE(watch.OnBlock(120, 512, 0).has_value());

  EXPECT_FALSE(watch.OnBlock(220, 512, 0).has_value());
  const auto again = watch.OnBlock(221, 512, 0);
  ASSERT_TRUE(again.has_value());
  EXPECT_EQ(again->block, 221);
  EXPECT_EQ(watch.recorded_block(), 221);
}

TEST(OverrunWatchTest, ForgetsTheRecordWhenCaughtUpAndStartsAgainAGraceBehindIt) {
  OverrunWatch watch(100, 85);
  ASSERT_TRUE(watch.OnBlock(120, 512, 0).has_value());

  EXPECT_FALSE(watch.OnBlock(200, 512, 190 * 512).has_value());
  EXPECT_EQ(watch.recorded_block(), 0);

  EXPECT_FALSE(watch.OnBlock(220, 512, 0).has_value()) << "checked only behind 120 + 100";
  EXPECT_TRUE(watch.OnBlock(221, 512, 0).has_value());
}

TEST(OverrunWatchTest, KeepsTheRecordAtExactlyTheThreshold) {
  OverrunWatch watch(100, 85);
  ASSERT_TRUE(watch.OnBlock(120, 512, 0).has_value());

  EXPECT_FALSE(watch.OnBlock(200, 512, 169 * 512).has_value());
  EXPECT_EQ(watch.recorded_block(), 120);
}

TEST(OverrunWatchTest, SkipsABlockWithoutData) {
  OverrunWatch watch(0, 85);

  EXPECT_FALSE(watch.OnBlock(200, 0, 0).has_value());
}

TEST(OverrunWatchTest, BeginsANewFileAsIfItWereTheFirst) {
  OverrunWatch watch(100, 85);
  ASSERT_TRUE(watch.OnBlock(120, 512, 0).has_value());
  ASSERT_FALSE(watch.OnBlock(200, 512, 190 * 512).has_value());

  watch.Reset();

  EXPECT_EQ(watch.recorded_block(), 0);
  EXPECT_TRUE(watch.OnBlock(101, 512, 0).has_value());
}

TEST(OverrunWatchTest, RoundsEachStepToSinglePrecision) {
  OverrunWatch watch(0, 100);

  // One byte of 65,535,000 is missing, which single precision does not see.
  EXPECT_FALSE(watch.OnBlock(65535, 1000, 65534000 - 1).has_value());
  EXPECT_FALSE(watch.is_short());
}

TEST(OverrunWatchTest, TakesTheLargestFileThereIs) {
  OverrunWatch watch(0, 85);

  EXPECT_FALSE(watch.OnBlock(65535, 65535, 65534U * 65535U).has_value());
  EXPECT_FALSE(watch.is_short()) << "4,294,836,225 bytes are counted without a sign";
}

TEST(OverrunWatchTest, TakesAnyGrace) {
  OverrunWatch watch(0xFFFFFFFF, 85);

  EXPECT_FALSE(watch.OnBlock(65535, 512, 0).has_value());
}

TEST(OverrunTextsTest, ShowHundredthsAndSendThemCutTo16Bits) {
  EXPECT_STREQ(TextsOf({0.0F, 1}).line, "<< OVERRUN ERROR: 0.00 at 1");
  EXPECT_STREQ(TextsOf({0.0F, 1}).message, "Overrun:0:1");
  EXPECT_STREQ(TextsOf({84.996F, 65535}).line, "<< OVERRUN ERROR: 85.00 at 65535");
  EXPECT_STREQ(TextsOf({84.996F, 65535}).message, "Overrun:8499:65535");
  EXPECT_STREQ(TextsOf({9.0625F, 3}).line, "<< OVERRUN ERROR: 9.06 at 3");
  // A short block behind long ones: far more than it alone would make.
  EXPECT_STREQ(TextsOf({700.0F, 5}).line, "<< OVERRUN ERROR: 700.00 at 5");
  EXPECT_STREQ(TextsOf({700.0F, 5}).message, "Overrun:4464:5") << "70,000 - 65,536";
}

}  // namespace
