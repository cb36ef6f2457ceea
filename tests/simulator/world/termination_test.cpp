// A terminated thread's stack is abandoned: nothing of the device's code runs on it any more,
// however that code was built.
#include <gtest/gtest.h>

#include "ce/kernel.h"
#include "simulator/world/device_code.h"
#include "support/device_test.h"

namespace {

class TerminationTest : public DeviceTest {
 protected:
  static test::DeviceCodeSteps Terminate(LPTHREAD_START_ROUTINE routine) {
    test::DeviceCodeSteps steps{};
    HANDLE thread = CreateThread(nullptr, 0, routine, &steps, 0, nullptr);
    Sleep(1);
    EXPECT_NE(TerminateThread(thread, 6), FALSE);
    EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
    DWORD code = 0;
    EXPECT_NE(GetExitCodeThread(thread, &code), FALSE);
    EXPECT_EQ(code, 6U);
    return steps;
  }
};

TEST_F(TerminationTest, CodeWithoutExceptionsIsLeftWithoutCleaningUp) {
  const test::DeviceCodeSteps steps = Terminate(test::WaitWithoutExceptions);
  EXPECT_EQ(steps.begun, 1);
  EXPECT_EQ(steps.went_on, 0);
  EXPECT_EQ(steps.cleaned_up, 0);
}

TEST_F(TerminationTest, CodeWithoutUnwindTablesIsLeftWithoutCleaningUp) {
  const test::DeviceCodeSteps steps = Terminate(test::WaitWithoutTables);
  EXPECT_EQ(steps.begun, 1);
  EXPECT_EQ(steps.went_on, 0);
  EXPECT_EQ(steps.cleaned_up, 0);
}

}  // namespace
