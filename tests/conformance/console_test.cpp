// The kernel's console, of which a program sees only that it may write there.
#include <gtest/gtest.h>

#include "coredll.h"

namespace {

TEST(NKDbgPrintfWTest, TakesTheUsualConversionsAndLeavesTheLastErrorAlone) {
  SetLastError(4711);

  NKDbgPrintfW(TEXT("SetPowerRequirement failed: %X %d %s %%\\n"), 0xBEEFU, -1, TEXT("text"));

  EXPECT_EQ(GetLastError(), 4711U);
}

}  // namespace
