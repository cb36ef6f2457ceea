// The conformance tests know nothing but the platform. On Linux the platform is a simulated device:
// here each test's thread becomes a program of a fresh one.
#include <gtest/gtest.h>

#include <memory>

#include "support/device_test.h"

namespace {

class FreshDevice final : public ::testing::EmptyTestEventListener {
  struct Parts {
    test::TemporaryFolder folder;
    std::unique_ptr<sim::World> world = sim::World::MakeVirtual();
    sim::Device device{*world, sim::Profile{}, folder.path() / "device"};
    sim::AttachedThread program{device, "conformance test"};
  };

  void OnTestStart(const ::testing::TestInfo& /*info*/) override {
    parts_ = std::make_unique<Parts>();
  }
  void OnTestEnd(const ::testing::TestInfo& /*info*/) override { parts_.reset(); }

  std::unique_ptr<Parts> parts_;
};

// gtest owns the listener.
[[maybe_unused]] const bool kInstalled = [] {
  ::testing::UnitTest::GetInstance()->listeners().Append(new FreshDevice);
  return true;
}();

}  // namespace
