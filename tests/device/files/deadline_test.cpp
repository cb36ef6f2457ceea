#include "device/deadline.h"

#include <gtest/gtest.h>

#include "kernel/kernel.h"
#include "support/device_test.h"
// The platform's own names come last.
#include <coredll.h>

namespace {

using device::Deadline;

class DeadlineTest : public DeviceTest {
 protected:
  /// 99,999 when nothing is left.
  static std::uint32_t Left(Deadline& deadline) {
    std::uint32_t left_ms = 0;
    return deadline.HasLeft(left_ms) ? left_ms : 99999;
  }
};

TEST_F(DeadlineTest, GivesLessAndLessUntilNothingIsLeft) {
  Deadline deadline(100);
  EXPECT_EQ(Left(deadline), 100U);
  Sleep(30);
  EXPECT_EQ(Left(deadline), 70U);
  Sleep(69);
  EXPECT_EQ(Left(deadline), 1U);
  Sleep(1);
  EXPECT_EQ(Left(deadline), 99999U);
  Sleep(1000);
  EXPECT_EQ(Left(deadline), 99999U);
}

TEST_F(DeadlineTest, HasNoEndForAWaitOfZero) {
  Deadline deadline(0);
  EXPECT_EQ(Left(deadline), 0U);
  Sleep(1000000);
  EXPECT_EQ(Left(deadline), 0U);
}

TEST_F(DeadlineTest, BeginsAnewWhenToldTo) {
  Deadline deadline(100);
  Sleep(500);
  deadline.Restart();
  EXPECT_EQ(Left(deadline), 100U);
  Sleep(99);
  EXPECT_EQ(Left(deadline), 1U);
}

TEST_F(DeadlineTest, OutlastsTheClocksOwnEnd) {
  device().kernel().SetTickBase(0xFFFFFFFF - 50);
  Deadline deadline(100);
  EXPECT_EQ(Left(deadline), 100U);
  Sleep(60);
  EXPECT_EQ(Left(deadline), 40U);
  Sleep(40);
  EXPECT_EQ(Left(deadline), 99999U);
}

}  // namespace
