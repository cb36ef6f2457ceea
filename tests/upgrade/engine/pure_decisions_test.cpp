#include <gtest/gtest.h>

#include <string>

#include "upgrade/fetch.h"
#include "upgrade/memory_division.h"
#include "upgrade/progress.h"
#include "upgrade/run_state/run_state.h"

namespace upgrade {
namespace {

TEST(FileUrlTest, AddsPortAndCountersWithOneSlash) {
  EXPECT_EQ(FileUrl("http://10.0.0.2", 80, "apps/a.bin", 3, 14).view(),
            "http://10.0.0.2:80/apps/a.bin:3,14");
  EXPECT_EQ(FileUrl("http://10.0.0.2", 8080, "/apps/a.bin", 1, 1).view(),
            "http://10.0.0.2:8080/apps/a.bin:1,1");
  EXPECT_EQ(FileUrl("http://10.0.0.2", 80, "\\apps\\a.bin", 1, 1).view(),
            "http://10.0.0.2:80\\apps\\a.bin:1,1");
}

TEST(FileUrlTest, AddsNothingToABaseUrlThatNamesItsPort) {
  EXPECT_EQ(FileUrl("http://10.0.0.2:8080", 80, "/a.bin", 3, 14).view(),
            "http://10.0.0.2:8080/a.bin");
  EXPECT_EQ(FileUrl("http://h:80", 80, "a.bin", 3, 14).view(), "http://h:80a.bin")
      << "a source without a slash runs into the port";
  EXPECT_EQ(FileUrl("http://x/a:b/", 80, "f", 1, 1).view(), "http://x/a:b/f")
      << "any colon behind the first eight characters counts";
}

TEST(FileUrlTest, SeesNoPortInTheFirstEightCharacters) {
  EXPECT_EQ(FileUrl("http:", 80, "a", 1, 1).view(), "http::80/a:1,1");
  EXPECT_EQ(FileUrl("", 80, "", 1, 2).view(), ":80/:1,2");
  EXPECT_EQ(FileUrl("1234567:", 80, "a", 1, 1).view(), "1234567::80/a:1,1");
  EXPECT_EQ(FileUrl("12345678:", 80, "a", 1, 1).view(), "12345678:a");
}

TEST(FileUrlTest, HoldsTheLongestTextsOfAJob) {
  const std::string base(255, 'b');
  const std::string source(259, 's');
  EXPECT_EQ(FileUrl(base, -2147483647 - 1, source, 4294967295U, 4294967295U).view(),
            base + ":-2147483648/" + source + ":-1,-1");
}

TEST(StorePagesTest, GiveTheStoreItsFractionOfTheFreePages) {
  MemoryFigures memory;
  memory.page_size = 4096;
  memory.store_pages = 600;
  memory.ram_pages = 700;
  memory.store_size = 600 * 4096;
  memory.store_free = 500 * 4096;  // 100 pages used
  memory.physical_total = 700 * 4096;
  memory.physical_free = 500 * 4096;  // 200 pages used
  // 1300 - 1 - 100 - 200 = 999 free
  EXPECT_EQ(StorePagesFor(memory, 0.9), 100U + 899U);
  EXPECT_EQ(StorePagesFor(memory, 0.5), 100U + 499U);
}

TEST(StorePagesTest, TakeTheFractionInDoublePrecision) {
  MemoryFigures memory;
  memory.page_size = 1;
  memory.store_pages = 21;
  EXPECT_EQ(StorePagesFor(memory, 0.9), 18U) << "0.9 of 20 pages; single precision gives 17";
}

TEST(StorePagesTest, WrapWhereMoreIsUsedThanThereIs) {
  MemoryFigures memory;
  memory.page_size = 1;
  memory.store_pages = 10;
  memory.store_size = 20;
  // 10 - 1 - 20 wraps to 4294967285
  EXPECT_EQ(StorePagesFor(memory, 0.5), 20U + 2147483642U);
}

TEST(StorePagesTest, RoundEachFigureDownToPages) {
  MemoryFigures memory;
  memory.page_size = 10;
  memory.store_pages = 10;
  memory.ram_pages = 10;
  memory.store_size = 59;  // 5 pages
  memory.store_free = 21;  // 2
  EXPECT_EQ(StorePagesFor(memory, 0.5), 3U + 8U);
}

TEST(OverallPercentTest, StaysBetweenFiveAndAHundred) {
  EXPECT_EQ(OverallPercent(0, 1000), 5);
  EXPECT_EQ(OverallPercent(51, 1000), 5);
  EXPECT_EQ(OverallPercent(60, 1000), 6);
  EXPECT_EQ(OverallPercent(999, 1000), 99);
  EXPECT_EQ(OverallPercent(2000, 1000), 100);
}

TEST(OverallPercentTest, IsFullWhenNobodySaidHowMuchComes) {
  EXPECT_EQ(OverallPercent(0, 0), 100);
  EXPECT_EQ(OverallPercent(12345, 0), 100);
}

TEST(OverallPercentTest, DoesNotOverflowForLargeJobs) {
  EXPECT_EQ(OverallPercent(2000000000U, 4000000000U), 50);
}

TEST(RunStateTest, RefusesASecondUpgradeUntilTheFirstHasEnded) {
  EXPECT_FALSE(UpgradeInProgress());
  EXPECT_TRUE(TryBeginUpgrade());
  EXPECT_TRUE(UpgradeInProgress());
  EXPECT_FALSE(TryBeginUpgrade());
  EndUpgrade();
  EndUpgrade();
  EXPECT_TRUE(TryBeginUpgrade());
  EndUpgrade();
}

}  // namespace
}  // namespace upgrade
