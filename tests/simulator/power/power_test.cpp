#include "power/power.h"

#include <gmock/gmock.h>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "support/device_test.h"

namespace {

using ::testing::SizeIs;

sim::Profile OnBattery() {
  sim::Profile profile;
  profile.ac_line = 0;
  profile.battery_flag = 9;  // high and charging
  profile.battery_percent = 42;
  return profile;
}

class BatteryPowerTest : public DeviceTest {
 protected:
  BatteryPowerTest() : DeviceTest(OnBattery()) {}
};

using PowerTest = DeviceTest;

TEST_F(BatteryPowerTest, BeginsAsTheProfileSays) {
  SYSTEM_POWER_STATUS_EX status = {};

  ASSERT_TRUE(GetSystemPowerStatusEx(&status, TRUE));

  EXPECT_EQ(status.ACLineStatus, 0);
  EXPECT_EQ(status.BatteryFlag, 9);
  EXPECT_EQ(status.BatteryLifePercent, 42);
}

TEST_F(PowerTest, ChangesWhileThingsRun) {
  device().power().SetStatus(AC_LINE_OFFLINE, BATTERY_FLAG_CRITICAL, 3);

  SYSTEM_POWER_STATUS_EX status = {};
  ASSERT_TRUE(GetSystemPowerStatusEx(&status, TRUE));
  EXPECT_EQ(status.ACLineStatus, 0);
  EXPECT_EQ(status.BatteryFlag, 4);
  EXPECT_EQ(status.BatteryLifePercent, 3);
}

TEST_F(PowerTest, KeepsARecordOfTheRequirementsThatAreHeld) {
  WCHAR backlight[] = TEXT("BKL1:");
  WCHAR radio[] = TEXT("WLN1:");
  const HANDLE first = SetPowerRequirement(backlight, D0, POWER_NAME, nullptr, 0);
  const HANDLE second = SetPowerRequirement(radio, D2, POWER_NAME, nullptr, 0);

  const auto held = device().power().Held();
  ASSERT_THAT(held, SizeIs(2));
  EXPECT_EQ(held[0].device, u"BKL1:");
  EXPECT_EQ(held[0].state, D0);
  EXPECT_EQ(held[1].device, u"WLN1:");

  EXPECT_EQ(ReleasePowerRequirement(first), ERROR_SUCCESS);
  ASSERT_THAT(device().power().Held(), SizeIs(1));
  EXPECT_EQ(device().power().Held()[0].device, u"WLN1:");
  EXPECT_EQ(ReleasePowerRequirement(second), ERROR_SUCCESS);
  EXPECT_THAT(device().power().Held(), SizeIs(0));
}

TEST_F(PowerTest, FailsWhenTold) {
  WCHAR backlight[] = TEXT("BKL1:");
  device().faults().Add({"SetPowerRequirement", 1, 1, 21});
  device().faults().Add({"GetSystemPowerStatusEx", 1, 1, 0});
  SYSTEM_POWER_STATUS_EX status = {};

  EXPECT_EQ(SetPowerRequirement(backlight, D0, POWER_NAME, nullptr, 0), nullptr);
  EXPECT_EQ(GetLastError(), 21U);
  EXPECT_FALSE(GetSystemPowerStatusEx(&status, TRUE));
  EXPECT_THAT(device().power().Held(), SizeIs(0));
}

TEST_F(PowerTest, CountsIdleTimerResets) {
  EXPECT_EQ(device().power().IdleTimerResets(), 0U);

  SystemIdleTimerReset();
  SystemIdleTimerReset();

  EXPECT_EQ(device().power().IdleTimerResets(), 2U);
}

}  // namespace
