// What the platform's memory calls do, seen through the platform alone.
#include <gtest/gtest.h>

#include <array>
#include <cstring>

#include "conformance/differences.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;

constexpr BYTE kPoisonByte = 0xBD;

TEST(LocalAllocTest, GivesZeroedMemoryWhenAskedTo) {
  auto* const block = static_cast<BYTE*>(LocalAlloc(LPTR, 1000));
  ASSERT_NE(block, nullptr);

  for (std::size_t i = 0; i < 1000; ++i) ASSERT_EQ(block[i], 0) << i;

  EXPECT_GE(LocalSize(block), 1000U);
  EXPECT_EQ(LocalFree(block), nullptr);
}

TEST(LocalAllocTest, GivesEveryBlockAnAddressOfItsOwnEvenAnEmptyOne) {
  const HLOCAL first = LocalAlloc(LMEM_FIXED, 0);
  const HLOCAL second = LocalAlloc(LMEM_FIXED, 0);

  EXPECT_NE(first, nullptr);
  EXPECT_NE(second, nullptr);
  EXPECT_NE(first, second);

  LocalFree(first);
  LocalFree(second);
}

TEST(LocalAllocTest, FailsWhenThereIsNotThatMuch) {
  SetLastError(0);

  EXPECT_EQ(LocalAlloc(LMEM_FIXED, static_cast<std::size_t>(-1) / 2), nullptr);

  EXPECT_NE(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(LocalFreeTest, TakesNullAsDone) {
  EXPECT_EQ(LocalFree(nullptr), nullptr);
}

TEST(GlobalMemoryStatusTest, FillsTheRecordAndNothingBehindIt) {
  struct {
    MEMORYSTATUS status;
    std::array<BYTE, 8> behind;
  } guarded;
  std::memset(&guarded, kPoisonByte, sizeof guarded);
  guarded.status.dwLength = sizeof guarded.status;

  GlobalMemoryStatus(&guarded.status);

  EXPECT_EQ(guarded.status.dwLength, sizeof guarded.status);
  EXPECT_GT(guarded.status.dwTotalPhys, 0U);
  EXPECT_LE(guarded.status.dwAvailPhys, guarded.status.dwTotalPhys);
  EXPECT_LE(guarded.status.dwMemoryLoad, 100U);
  EXPECT_LE(guarded.status.dwAvailVirtual, guarded.status.dwTotalVirtual);
  for (const BYTE byte : guarded.behind) EXPECT_EQ(byte, kPoisonByte);
}

TEST(GetStoreInformationTest, AgreesWithTheDivision) {
  STORE_INFORMATION store;
  std::memset(&store, kPoisonByte, sizeof store);
  DWORD store_pages = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;

  ASSERT_TRUE(GetStoreInformation(&store));
  ASSERT_TRUE(GetSystemMemoryDivision(&store_pages, &ram_pages, &page_size));

  EXPECT_GT(page_size, 0U);
  EXPECT_EQ(store.dwStoreSize, store_pages * page_size);
  EXPECT_LE(store.dwFreeSize, store.dwStoreSize);
}

TEST(SetSystemMemoryDivisionTest, MovesPagesFromOneHalfToTheOther) {
  if (Differs(Difference::kDivision)) GTEST_SKIP() << "the store is a disk here";
  DWORD store_pages = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;
  ASSERT_TRUE(GetSystemMemoryDivision(&store_pages, &ram_pages, &page_size));

  ASSERT_EQ(SetSystemMemoryDivision(store_pages + 100), SYSMEM_CHANGED);

  DWORD now_store = 0;
  DWORD now_ram = 0;
  ASSERT_TRUE(GetSystemMemoryDivision(&now_store, &now_ram, &page_size));
  EXPECT_EQ(now_store, store_pages + 100);
  EXPECT_EQ(now_ram, ram_pages - 100);
}

TEST(SetSystemMemoryDivisionTest, RefusesToTakeMemoryThatIsInUse) {
  DWORD store_pages = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;
  ASSERT_TRUE(GetSystemMemoryDivision(&store_pages, &ram_pages, &page_size));

  EXPECT_EQ(SetSystemMemoryDivision(store_pages + ram_pages), SYSMEM_FAILED);
  EXPECT_EQ(SetSystemMemoryDivision(0xFFFFFFFF), SYSMEM_FAILED);
  DWORD now = 0;
  ASSERT_TRUE(GetSystemMemoryDivision(&now, &ram_pages, &page_size));
  EXPECT_EQ(now, store_pages);
}

}  // namespace
