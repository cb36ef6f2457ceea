#include "server/multicast/send_window.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>

namespace server {
namespace {

using std::chrono::milliseconds;

constexpr std::uint16_t kBlock = 1400;  // a device holds sixteen of them

/// A road that takes a block every millisecond, 20 ms long. Sends windowfuls for a while.
class Road {
 public:
  explicit Road(SendWindow& window) : window_(window) {}

  /// @param lose  every so manieth block; 0: none
  void Run(int blocks, int lose = 0) {
    for (int i = 1; i <= blocks; ++i) {
      // In flight are as many as the window says: this one went out when so many were left.
      const Micros sent = std::max(now_ - milliseconds(window_.size()), Micros(0));
      free_ = std::max(free_ + milliseconds(1), sent + milliseconds(20));
      now_ = free_;
      if (lose > 0 && i % lose == 0) {
        window_.OnLoss();
      } else {
        window_.OnAck(std::min(sent, now_ - milliseconds(20)), now_);
      }
    }
  }

 private:
  SendWindow& window_;
  Micros now_{std::chrono::seconds(1)};
  Micros free_{std::chrono::seconds(1)};
};

TEST(SendWindowTest, GrowsUntilTheRoadIsFullAndABitFurther) {
  SendWindow window(1000, kBlock);
  EXPECT_LE(window.size(), 4U);
  Road(window).Run(2000);
  EXPECT_GE(window.size(), 20U);
  EXPECT_LE(window.size(), 40U) << "more would wait before the device than it can hold";
}

TEST(SendWindowTest, TriesMoreOnlyWhereNobodyElseListens) {
  SendWindow shared(1000, kBlock);
  SendWindow alone(1000, kBlock);
  alone.SetAlone(true);
  Road(shared).Run(20'000);
  Road(alone).Run(20'000);
  EXPECT_GT(alone.size(), shared.size());
}

TEST(SendWindowTest, IsNotFrightenedBySingleLosses) {
  SendWindow window(1000, kBlock);
  Road road(window);
  road.Run(2000);
  const std::uint32_t before = window.size();
  road.Run(2000, 50);
  EXPECT_GE(window.size(), before / 2);
}

TEST(SendWindowTest, BeginsAnewAfterSilence) {
  SendWindow window(1000, kBlock);
  Road road(window);
  road.Run(2000);
  window.OnSilence();
  EXPECT_EQ(window.size(), 2U);
  road.Run(2000);
  EXPECT_GE(window.size(), 20U);
}

TEST(SendWindowTest, ShrinksWhenTheDeviceSaysThatItCannotFollow) {
  SendWindow window(1000, kBlock);
  Road(window).Run(2000);
  const std::uint32_t before = window.size();
  window.Reduce();
  EXPECT_LT(window.size(), before);
  for (int i = 0; i < 100; ++i) window.Reduce();
  EXPECT_EQ(window.size(), 2U);
}

TEST(SendWindowTest, KeepsItsLimit) {
  SendWindow window(8, kBlock);
  Road(window).Run(2000);
  EXPECT_EQ(window.size(), 8U);
  SendWindow one(1, kBlock);
  Road(one).Run(100);
  one.Reduce();
  one.OnSilence();
  EXPECT_EQ(one.size(), 1U);
}

}  // namespace
}  // namespace server
