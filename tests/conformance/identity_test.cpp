// What the platform tells of itself, seen through the platform alone.
#include <gtest/gtest.h>

#include <array>
#include <cstring>

#include "coredll.h"

namespace {

constexpr DWORD kIdentityQuery = 0x010122C4;

TEST(GetVersionExWTest, NamesTheVersionAndWritesNothingBehindTheRecord) {
  struct {
    OSVERSIONINFOW version;
    std::array<BYTE, 8> behind;
  } guarded;
  std::memset(&guarded, 0xBD, sizeof guarded);
  guarded.version.dwOSVersionInfoSize = sizeof guarded.version;

  ASSERT_TRUE(GetVersionExW(&guarded.version));

  EXPECT_GE(guarded.version.dwMajorVersion, 4U);
  EXPECT_LT(guarded.version.dwMajorVersion, 100U);
  for (const BYTE byte : guarded.behind) EXPECT_EQ(byte, 0xBD);
}

TEST(GetVersionExWTest, RefusesARecordOfAnotherSize) {
  OSVERSIONINFOW version = {};
  version.dwOSVersionInfoSize = 4;

  EXPECT_FALSE(GetVersionExW(&version));
}

TEST(SystemParametersInfoWTest, RefusesAnActionThatDoesNotExist) {
  std::array<WCHAR, 256> text = {};
  SetLastError(0);

  EXPECT_FALSE(SystemParametersInfoW(0xFFFF, 256, text.data(), 0));

  EXPECT_NE(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(KernelIoControlTest, AnswersTheIdentityQueryWithinItsBuffer) {
  BYTE input[2] = {2, 0};
  std::array<BYTE, 256> output;
  output.fill(0xBD);
  DWORD returned = 0;

  ASSERT_TRUE(KernelIoControl(kIdentityQuery, input, 2, output.data(), 256, &returned));

  ASSERT_GE(returned, 1U);
  ASSERT_LE(returned, 255U);
  for (std::size_t i = returned; i < output.size(); ++i) EXPECT_EQ(output[i], 0xBD) << i;
}

TEST(KernelIoControlTest, RefusesABufferThatIsTooSmallAndUnknownCodes) {
  BYTE input[2] = {2, 0};
  std::array<BYTE, 4> output;
  output.fill(0xBD);
  DWORD returned = 0;

  EXPECT_FALSE(KernelIoControl(kIdentityQuery, input, 2, output.data(), 1, &returned));
  EXPECT_FALSE(KernelIoControl(0xDEAD, input, 2, output.data(), 4, &returned));

  for (const BYTE byte : output) EXPECT_EQ(byte, 0xBD);
}

}  // namespace
