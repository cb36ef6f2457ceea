#include <gtest/gtest.h>

#include <string>

#include "device/file.h"
#include "device/memory.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace device {
namespace {

/// A store that says it is full, for a while or for good.
class FullStoreTest : public DeviceTest {
 protected:
  FullStoreTest() {
    EXPECT_TRUE(file_.OpenFile("\\a.bin", true));
    device().kernel().ForgetSleeps();
    writes_before_ = device().faults().Count("WriteFile");
    moves_before_ = device().faults().Count("SetSystemMemoryDivision");
  }

  [[nodiscard]] std::uint64_t writes() {
    return device().faults().Count("WriteFile") - writes_before_;
  }
  [[nodiscard]] std::uint64_t moves() {
    return device().faults().Count("SetSystemMemoryDivision") - moves_before_;
  }

  File file_;

 private:
  std::uint64_t writes_before_ = 0;
  std::uint64_t moves_before_ = 0;
};

TEST_F(FullStoreTest, WritesSeventeenTimesWithTenMillisecondsBetween) {
  device().faults().Add({"WriteFile", 1, 0, ERROR_DISK_FULL});

  EXPECT_FALSE(file_.Write("abc", 3));

  EXPECT_EQ(file_.last_error(), ERROR_DISK_FULL);
  EXPECT_EQ(writes(), 17U) << "one, and exactly 16 rounds";
  EXPECT_EQ(moves(), 16U);
  const auto sleeps = device().kernel().Sleeps();
  ASSERT_EQ(sleeps.size(), 16U);
  for (const sim::SleepRecord& sleep : sleeps) EXPECT_EQ(sleep.length_ms, 10U);
}

TEST_F(FullStoreTest, GoesOnToTheLastRoundAlsoAfterAWriteHasSucceeded) {
  device().faults().Add({"WriteFile", 1, 1, ERROR_DISK_FULL});

  EXPECT_TRUE(file_.Write("ab", 2));

  EXPECT_EQ(writes(), 17U);
  file_.Close();
  std::string sixteen_times;
  for (int i = 0; i < 16; ++i) sixteen_times += "ab";
  EXPECT_EQ(test::GetFile("\\a.bin"), sixteen_times) << "each round writes at the moved position";
}

TEST_F(FullStoreTest, GivesTheResultOfTheLastWrite) {
  device().faults().Add({"WriteFile", 1, 1, ERROR_DISK_FULL});
  device().faults().Add({"WriteFile", 17, 1, ERROR_GEN_FAILURE});
  EXPECT_FALSE(file_.Write("ab", 2));
  EXPECT_EQ(file_.last_error(), ERROR_GEN_FAILURE);
}

TEST_F(FullStoreTest, TriesNoSecondTimeAfterAnotherError) {
  device().faults().Add({"WriteFile", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(file_.Write("abc", 3));
  EXPECT_EQ(file_.last_error(), ERROR_ACCESS_DENIED);
  EXPECT_EQ(writes(), 1U);
  EXPECT_EQ(moves(), 0U);
}

TEST_F(FullStoreTest, WritesOnceWhenThereIsRoom) {
  EXPECT_TRUE(file_.Write("abc", 3));
  EXPECT_EQ(writes(), 1U);
}

TEST_F(FullStoreTest, DoesWithoutRebalancingWhereTheDivisionIsNotTold) {
  device().faults().Add({"WriteFile", 1, 1, ERROR_DISK_FULL});
  device().faults().Add({"GetSystemMemoryDivision", 1, 0, 0});
  EXPECT_TRUE(file_.Write("abc", 3));
  EXPECT_EQ(moves(), 0U);
  EXPECT_EQ(writes(), 17U);
}

/// A device whose store of 8 pages is really full, with memory to spare.
class SmallStoreTest : public DeviceTest {
 protected:
  static sim::Profile Small() {
    sim::Profile profile;
    profile.store_pages = 8;
    profile.ram_pages = 200;
    profile.ram_used_pages = 20;
    return profile;
  }
  SmallStoreTest() : DeviceTest(Small()) {}
};

TEST_F(SmallStoreTest, TakesMemoryFromProgramsForAFileThatDoesNotFit) {
  File file;
  ASSERT_TRUE(file.OpenFile("\\big.bin", true));
  const std::string block(4096, 'x');
  for (int i = 0; i < 32; ++i) {
    EXPECT_TRUE(file.Seek(static_cast<std::uint32_t>(i) * 4096)) << "block " << i;
    EXPECT_TRUE(file.Write(block.data(), 4096)) << "block " << i;
  }
  MemoryPages pages;
  ASSERT_TRUE(GetMemoryPages(&pages));
  EXPECT_GT(pages.store, 8U);
  EXPECT_EQ(pages.total, 208U);
}

TEST(RamPagesTest, CountsOnePageTooMany) {
  // Pure arithmetic of the accounting: 1,000 store and 500 program pages in use of 2,501.
  EXPECT_EQ(BalancedStorePages({2501, 1000, 500, 900}), 1500U);
  EXPECT_EQ(BalancedStorePages({100, 80, 40, 50}), 80U + ((100U - 120U) >> 1))
      << "more in use than there is wraps, as on the device";
}

class MemoryPagesTest : public DeviceTest {};

TEST_F(MemoryPagesTest, AddsUpToTheDevicesMemory) {
  DWORD store = 0;
  DWORD ram = 0;
  DWORD page = 0;
  ASSERT_NE(GetSystemMemoryDivision(&store, &ram, &page), 0);
  STORE_INFORMATION information = {};
  ASSERT_NE(GetStoreInformation(&information), 0);
  MEMORYSTATUS status = {};
  status.dwLength = sizeof status;
  GlobalMemoryStatus(&status);

  MemoryPages pages;
  ASSERT_TRUE(GetMemoryPages(&pages));

  EXPECT_EQ(pages.total, store + ram);
  EXPECT_EQ(pages.store, store);
  EXPECT_EQ(pages.store_in_use, information.dwStoreSize / page - information.dwFreeSize / page);
  EXPECT_EQ(pages.programs_in_use, status.dwTotalPhys / page - status.dwAvailPhys / page + 1);
  EXPECT_EQ(GetRamPagesInUse(0), 0U);
}

TEST_F(MemoryPagesTest, AreZeroWhenThePlatformDoesNotTell) {
  MemoryPages pages;
  device().faults().Add({"GetStoreInformation", 1, 1, 0});
  EXPECT_FALSE(GetMemoryPages(&pages));
  EXPECT_EQ(pages.total, 0U);
}

}  // namespace
}  // namespace device
