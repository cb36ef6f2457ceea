#include <gtest/gtest.h>

#include <string>

#include "device/handle.h"
#include "device/local_memory.h"
#include "device/wide_text.h"
#include "faults/faults.h"
#include "support/device_test.h"

namespace device {
namespace {

class ConversionTest : public DeviceTest {};

TEST_F(ConversionTest, MakesWideTextAndBack) {
  const WideText<> wide("\\Temp\\a.txt");
  EXPECT_EQ(wide.view(), TEXT("\\Temp\\a.txt"));
  EXPECT_STREQ(NarrowText<>(wide.c_str()).c_str(), "\\Temp\\a.txt");
}

TEST_F(ConversionTest, TakesNullAsEmpty) {
  EXPECT_TRUE(WideText<>(static_cast<const char*>(nullptr)).empty());
  EXPECT_TRUE(NarrowText<>(static_cast<const WCHAR*>(nullptr)).empty());
}

TEST_F(ConversionTest, CutsWhatDoesNotFitAndSaysSo) {
  WideText<4> wide;
  EXPECT_FALSE(wide.Assign("abcdef"));
  EXPECT_EQ(wide.view(), TEXT("abc"));
  EXPECT_TRUE(wide.Assign("xyz"));
  NarrowText<4> narrow;
  EXPECT_FALSE(narrow.Assign(TEXT("abcdef")));
  EXPECT_EQ(narrow.view(), "abc");
}

TEST_F(ConversionTest, AddsBehindWhatIsThere) {
  WideText<8> wide("ab");
  EXPECT_TRUE(wide.Append("cd"));
  EXPECT_FALSE(wide.Append("efgh"));
  EXPECT_EQ(wide.view(), TEXT("abcdefg"));
  NarrowText<8> narrow(TEXT("ab"));
  EXPECT_TRUE(narrow.Append(TEXT("cd")));
  EXPECT_EQ(narrow.view(), "abcd");
}

TEST_F(ConversionTest, LeavesAnEmptyTextWhenThePlatformFails) {
  device().faults().Add({"MultiByteToWideChar", 1, 1, 0});
  WideText<> wide;
  EXPECT_FALSE(wide.Assign("abc"));
  EXPECT_TRUE(wide.empty());
  device().faults().Add({"WideCharToMultiByte", 1, 0, 0});
  NarrowText<> narrow;
  EXPECT_FALSE(narrow.Assign(TEXT("abc")));
  EXPECT_TRUE(narrow.empty());
}

class OwnerTest : public DeviceTest {};

TEST_F(OwnerTest, ClosesItsHandleOnce) {
  HANDLE const raw = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  {
    EventHandle first(raw);
    EventHandle second(std::move(first));
    EXPECT_FALSE(static_cast<bool>(first));
    EXPECT_EQ(second.get(), raw);
    first = std::move(second);
    EXPECT_EQ(first.get(), raw);
  }
  EXPECT_EQ(SetEvent(raw), 0) << "it is closed";
}

TEST_F(OwnerTest, GivesAHandleUpUnclosed) {
  EventHandle owner(CreateEventW(nullptr, FALSE, FALSE, nullptr));
  HANDLE const raw = owner.Release();
  EXPECT_FALSE(static_cast<bool>(owner));
  EXPECT_NE(SetEvent(raw), 0);
  CloseHandle(raw);
}

TEST_F(OwnerTest, KeepsTheTwoEmptyValuesApart) {
  EXPECT_FALSE(static_cast<bool>(FileHandle(INVALID_HANDLE_VALUE)));
  EXPECT_FALSE(static_cast<bool>(EventHandle(nullptr)));
}

TEST_F(OwnerTest, OfABlockGetsZeroedMemoryOrNothing) {
  {
    const auto block = LocalBlock<std::uint32_t>::Allocate(100);
    ASSERT_TRUE(block);
    for (std::size_t i = 0; i < 100; ++i) EXPECT_EQ(block[i], 0U);
  }
  EXPECT_FALSE(LocalBlock<std::uint32_t>::Allocate(0x7FFFFFFF)) << "the size would overflow";
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  EXPECT_FALSE(LocalBlock<std::uint32_t>::Allocate());
}

}  // namespace
}  // namespace device
