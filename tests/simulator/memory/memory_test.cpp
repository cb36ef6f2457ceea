#include "memory/memory.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/faults.h"
#include "memory/space.h"
#include "support/device_test.h"

namespace {

sim::Profile SmallDevice() {
  sim::Profile profile;
  profile.page_size = 4096;
  profile.store_pages = 10;
  profile.ram_pages = 20;
  profile.ram_used_pages = 5;
  return profile;
}

class MemoryTest : public DeviceTest {
 protected:
  MemoryTest() : DeviceTest(SmallDevice()) {}
  [[nodiscard]] sim::Memory& memory() { return device().memory(); }
};

TEST_F(MemoryTest, CountsLiveBlocksBytesAndThePeak) {
  const HLOCAL first = LocalAlloc(LPTR, 100);
  const HLOCAL second = LocalAlloc(LMEM_FIXED, 50);
  EXPECT_EQ(memory().live_blocks(), 2U);
  EXPECT_EQ(memory().live_bytes(), 150U);

  LocalFree(first);

  EXPECT_EQ(memory().live_blocks(), 1U);
  EXPECT_EQ(memory().live_bytes(), 50U);
  EXPECT_EQ(memory().peak_bytes(), 150U);
  EXPECT_EQ(LocalSize(second), 50U);
  LocalFree(second);
}

TEST_F(MemoryTest, NoticesADoubleFreeAndAForeignAddress) {
  const HLOCAL block = LocalAlloc(LPTR, 100);
  EXPECT_EQ(LocalFree(block), nullptr);
  int foreign = 0;
  testing::internal::CaptureStderr();

  EXPECT_EQ(LocalFree(block), block);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_HANDLE});
  EXPECT_EQ(LocalFree(&foreign), &foreign);

  EXPECT_EQ(memory().bad_frees(), 2U);
  EXPECT_NE(testing::internal::GetCapturedStderr().find("no live block"), std::string::npos);
  EXPECT_EQ(LocalSize(&foreign), 0U);
}

TEST_F(MemoryTest, FillsABlockWithRubbishUnlessItIsToBeZeroed) {
  auto* const block = static_cast<unsigned char*>(LocalAlloc(LMEM_FIXED, 16));

  EXPECT_EQ(block[0], 0xCC);
  EXPECT_EQ(block[15], 0xCC);

  LocalFree(block);
}

TEST_F(MemoryTest, FailsAllocationsOnOrder) {
  device().faults().Add({"LocalAlloc", 2, 1, 0});
  const HLOCAL first = LocalAlloc(LPTR, 1);

  EXPECT_EQ(LocalAlloc(LPTR, 1), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_OUTOFMEMORY});

  const HLOCAL third = LocalAlloc(LPTR, 1);
  EXPECT_NE(third, nullptr);
  LocalFree(first);
  LocalFree(third);
}

TEST_F(MemoryTest, FailsAllocationsWhenProgramMemoryIsUsedUp) {
  // 20 pages less the 5 that other programs use.
  const HLOCAL most = LocalAlloc(LMEM_FIXED, 15 * 4096);
  ASSERT_NE(most, nullptr);

  EXPECT_EQ(LocalAlloc(LMEM_FIXED, 1), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_OUTOFMEMORY});

  LocalFree(most);
  const HLOCAL again = LocalAlloc(LMEM_FIXED, 1);
  EXPECT_NE(again, nullptr);
  LocalFree(again);
}

TEST_F(MemoryTest, ShowsItsBlocksAsUsedProgramMemory) {
  MEMORYSTATUS before = {};
  GlobalMemoryStatus(&before);
  EXPECT_EQ(before.dwTotalPhys, 20U * 4096);
  EXPECT_EQ(before.dwAvailPhys, 15U * 4096);
  EXPECT_EQ(before.dwMemoryLoad, 25U);
  const HLOCAL block = LocalAlloc(LMEM_FIXED, 5 * 4096);

  MEMORYSTATUS after = {};
  GlobalMemoryStatus(&after);

  EXPECT_EQ(after.dwAvailPhys, 10U * 4096);
  LocalFree(block);
}

/// Writes until it fails. @return the bytes that went in.
std::size_t Fill(const WCHAR* name, std::size_t step) {
  const HANDLE file = CreateFileW(name, GENERIC_WRITE, 0, nullptr, OPEN_ALWAYS, 0, nullptr);
  SetFilePointer(file, 0, nullptr, FILE_END);
  const std::vector<char> bytes(step, 'x');
  std::size_t total = 0;
  DWORD written = 0;
  while (WriteFile(file, bytes.data(), static_cast<DWORD>(step), &written, nullptr)) total += step;
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  CloseHandle(file);
  return total;
}

TEST_F(MemoryTest, MovingTheDivisionMakesRoomForFiles) {
  EXPECT_EQ(Fill(TEXT("\\a.bin"), 1024), 10U * 4096);
  STORE_INFORMATION store = {};
  ASSERT_TRUE(GetStoreInformation(&store));
  EXPECT_EQ(store.dwStoreSize, 10U * 4096);
  EXPECT_EQ(store.dwFreeSize, 0U);

  ASSERT_EQ(SetSystemMemoryDivision(14), SYSMEM_CHANGED);

  EXPECT_EQ(Fill(TEXT("\\a.bin"), 1024), 4U * 4096);
  MEMORYSTATUS status = {};
  GlobalMemoryStatus(&status);
  EXPECT_EQ(status.dwTotalPhys, 16U * 4096);
}

TEST_F(MemoryTest, RefusesADivisionThatTakesWhatIsInUse) {
  ASSERT_EQ(Fill(TEXT("\\a.bin"), 4096), 10U * 4096);

  EXPECT_EQ(SetSystemMemoryDivision(9), SYSMEM_FAILED) << "the files fill ten pages";
  EXPECT_EQ(SetSystemMemoryDivision(25), SYSMEM_CHANGED) << "five pages of programs are left";
  EXPECT_EQ(SetSystemMemoryDivision(26), SYSMEM_FAILED);
  EXPECT_EQ(SetSystemMemoryDivision(31), SYSMEM_FAILED) << "more than there is";
  EXPECT_EQ(SetSystemMemoryDivision(10), SYSMEM_CHANGED);
}

TEST_F(MemoryTest, StartsWithAStoreThatHoldsItsFiles) {
  ASSERT_EQ(SetSystemMemoryDivision(20), SYSMEM_CHANGED);
  ASSERT_EQ(Fill(TEXT("\\a.bin"), 4096), 20U * 4096);

  Restart();

  DWORD store = 0;
  DWORD ram = 0;
  DWORD page = 0;
  ASSERT_TRUE(GetSystemMemoryDivision(&store, &ram, &page));
  EXPECT_EQ(store, 20U) << "the profile's ten pages are too few";
  EXPECT_EQ(ram, 10U);
}

TEST_F(MemoryTest, RefusesNullPointers) {
  DWORD pages = 0;

  EXPECT_FALSE(GetStoreInformation(nullptr));
  EXPECT_FALSE(GetSystemMemoryDivision(nullptr, &pages, &pages));
  EXPECT_FALSE(GetSystemMemoryDivision(&pages, nullptr, &pages));
  EXPECT_FALSE(GetSystemMemoryDivision(&pages, &pages, nullptr));
  GlobalMemoryStatus(nullptr);
}

TEST(MemoryOfAStrangeProfileTest, HasPagesWhateverTheProfileSays) {
  test::TemporaryFolder folder;
  const auto world = sim::World::MakeVirtual();
  sim::Profile profile;
  profile.page_size = 0;
  profile.store_pages = 0xFFFFFFFF;
  profile.ram_pages = 0xFFFFFFFF;
  const sim::Device device(*world, profile, folder.path());

  EXPECT_GT(device.memory().division().page_size, 0U);
}

TEST(SpaceTest, TakesAllOrNothing) {
  sim::Space space(100);

  EXPECT_TRUE(space.Reserve(60));
  EXPECT_FALSE(space.Reserve(41));
  EXPECT_TRUE(space.Reserve(40));
  EXPECT_EQ(space.figures().free(), 0U);
  EXPECT_FALSE(space.Exchange(60, 61));
  EXPECT_TRUE(space.Exchange(60, 10));
  EXPECT_EQ(space.figures().used, 50U);
  EXPECT_FALSE(space.Resize(49));
  EXPECT_TRUE(space.Resize(50));
  EXPECT_FALSE(space.Reserve(UINT64_MAX));
}

TEST(SpaceTest, HasNothingFreeWhenItHoldsMoreThanFits) {
  sim::Space space(100);
  space.SetUsed(150);

  EXPECT_EQ(space.figures().free(), 0U);
  EXPECT_FALSE(space.Reserve(1));
  EXPECT_TRUE(space.Resize(120)) << "growing is always allowed";
  EXPECT_TRUE(space.Exchange(100, 50)) << "and so is taking less";
  space.Release(1000);
  EXPECT_EQ(space.figures().used, 0U);
}

class MemoryThreadsTest : public RealDeviceTest {};

TEST_F(MemoryThreadsTest, KeepsItsAccountsWhileManyThreadsAllocate) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this] {
      const sim::AttachedThread program(device());
      for (std::size_t i = 0; i < 500; ++i) LocalFree(LocalAlloc(LPTR, i));
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_EQ(device().memory().live_blocks(), 0U);
  EXPECT_EQ(device().memory().live_bytes(), 0U);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

}  // namespace
