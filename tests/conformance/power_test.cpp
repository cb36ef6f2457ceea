// Power status and requirements, seen through the platform alone.
#include <gtest/gtest.h>

#include <cstring>

#include "coredll.h"

namespace {

TEST(GetSystemPowerStatusExTest, FillsTheWholeRecord) {
  SYSTEM_POWER_STATUS_EX status;
  std::memset(&status, 0xBD, sizeof status);

  ASSERT_TRUE(GetSystemPowerStatusEx(&status, TRUE));

  EXPECT_TRUE(status.ACLineStatus <= 1 || status.ACLineStatus == 255);
  EXPECT_TRUE(status.BatteryLifePercent <= 100 || status.BatteryLifePercent == 255);
  EXPECT_NE(status.BatteryFlag, 0xBD);
  EXPECT_NE(status.BackupBatteryFlag, 0xBD);
}

TEST(SetPowerRequirementTest, GivesAHandleThatIsReleasedOnce) {
  WCHAR backlight[] = TEXT("BKL1:");
  const HANDLE requirement = SetPowerRequirement(backlight, D0, POWER_NAME, nullptr, 0);
  ASSERT_NE(requirement, nullptr);

  EXPECT_EQ(ReleasePowerRequirement(requirement), DWORD{ERROR_SUCCESS});
  EXPECT_NE(ReleasePowerRequirement(requirement), DWORD{ERROR_SUCCESS});
}

TEST(SetPowerRequirementTest, RefusesAMissingName) {
  SetLastError(0xDEADBEEF);

  EXPECT_EQ(SetPowerRequirement(nullptr, D0, POWER_NAME, nullptr, 0), nullptr);

  EXPECT_NE(GetLastError(), 0xDEADBEEF);
  EXPECT_NE(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(SystemIdleTimerResetTest, LeavesTheLastErrorAlone) {
  SetLastError(4711);

  SystemIdleTimerReset();

  EXPECT_EQ(GetLastError(), 4711U);
}

}  // namespace
