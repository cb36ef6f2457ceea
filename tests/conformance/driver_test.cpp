// Drivers and what goes to them, seen through the platform alone.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

#include "coredll.h"

namespace {

constexpr WCHAR kKey[] = TEXT("Drivers\\Conformance");

void SetText(HKEY key, const WCHAR* name, const WCHAR* text) {
  std::size_t length = 0;
  while (text[length] != 0) ++length;
  ASSERT_EQ(RegSetValueExW(key, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(text),
                           static_cast<DWORD>((length + 1) * sizeof(WCHAR))),
            LONG{ERROR_SUCCESS});
}

/// Registers a driver under the test's key.
void Register(const WCHAR* prefix, const WCHAR* library) {
  HKEY key = nullptr;
  ASSERT_EQ(RegCreateKeyExW(HKEY_LOCAL_MACHINE, kKey, 0, nullptr, REG_OPTION_NON_VOLATILE,
                            KEY_ALL_ACCESS, nullptr, &key, nullptr),
            LONG{ERROR_SUCCESS});
  SetText(key, TEXT("Prefix"), prefix);
  SetText(key, TEXT("Dll"), library);
  RegCloseKey(key);
}

HANDLE OpenDevice(const WCHAR* name) {
  return CreateFileW(name, GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING,
                     FILE_ATTRIBUTE_NORMAL, nullptr);
}

TEST(ActivateDeviceTest, RefusesAKeyThatIsNotThere) {
  SetLastError(0);

  EXPECT_EQ(ActivateDevice(TEXT("Drivers\\None"), 0), nullptr);

  EXPECT_NE(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(ActivateDeviceTest, RefusesALibraryThatIsNotThere) {
  Register(TEXT("XYZ"), TEXT("none.dll"));
  EXPECT_EQ(ActivateDevice(kKey, 0), nullptr);
}

TEST(ActivateDeviceTest, GivesAHandleOf32BitsUntilTheDriverIsDeactivated) {
  Register(TEXT("EFL"), TEXT("eflashdrv.dll"));
  const HANDLE driver = ActivateDevice(kKey, 0);
  ASSERT_NE(driver, nullptr);
  EXPECT_LE(reinterpret_cast<std::uintptr_t>(driver), 0xFFFFFFFFU);
  const HANDLE opened = OpenDevice(TEXT("EFL1:"));
  ASSERT_NE(opened, INVALID_HANDLE_VALUE);
  EXPECT_TRUE(CloseHandle(opened));

  EXPECT_TRUE(DeactivateDevice(driver));

  EXPECT_EQ(OpenDevice(TEXT("EFL1:")), INVALID_HANDLE_VALUE);
  EXPECT_FALSE(DeactivateDevice(driver));
}

TEST(DeviceIoControlTest, ReachesADriverThatAnswersThroughItsInput) {
  Register(TEXT("EFL"), TEXT("eflashdrv.dll"));
  ASSERT_NE(ActivateDevice(kKey, 0), nullptr);
  const HANDLE driver = OpenDevice(TEXT("EFL1:"));
  ASSERT_NE(driver, INVALID_HANDLE_VALUE);
  DWORD returned = 1;
  std::uint32_t store = 4096;
  ASSERT_TRUE(
      DeviceIoControl(driver, 0x22CFF9, &store, sizeof store, nullptr, 0, &returned, nullptr));
  EXPECT_EQ(returned, 0U);
  std::uint32_t block[10] = {0x61, 0, 0, 0, 0, 100};  // "a", of 100 bytes
  ASSERT_TRUE(
      DeviceIoControl(driver, 0x22CFFA, block, sizeof block, nullptr, 0, &returned, nullptr));
  ASSERT_TRUE(
      DeviceIoControl(driver, 0x22CFEE, block, sizeof block, nullptr, 0, &returned, nullptr));
  EXPECT_EQ(block[5], 0U);  // nothing is written yet
  CloseHandle(driver);
}

TEST(DeviceIoControlTest, RefusesWhatIsNoDevice) {
  DWORD returned = 0;
  SetLastError(0);
  EXPECT_FALSE(
      DeviceIoControl(INVALID_HANDLE_VALUE, 1, nullptr, 0, nullptr, 0, &returned, nullptr));
  EXPECT_NE(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(VirtualAllocTest, GivesZeroedPagesUntilTheyAreFreed) {
  auto* const pages = static_cast<unsigned char*>(
      VirtualAlloc(nullptr, 5000, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE));
  ASSERT_NE(pages, nullptr);
  EXPECT_EQ(reinterpret_cast<std::uintptr_t>(pages) % 4096, 0U);
  for (int i = 0; i < 5000; ++i) ASSERT_EQ(pages[i], 0);
  std::memset(pages, 0xFF, 5000);

  EXPECT_TRUE(VirtualFree(pages, 0, MEM_RELEASE));
  EXPECT_FALSE(VirtualFree(pages, 0, MEM_RELEASE));
}

TEST(StandardOutputTest, TakesBytesAndIsFlushed) {
  EXPECT_EQ(fwrite("text", 1, 4, stdout), 4U);
  EXPECT_EQ(fflush(stdout), 0);
}

}  // namespace
