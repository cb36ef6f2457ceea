// The conformance tests know nothing but the platform. On Linux the platform is a simulated device:
// here each test's thread becomes a program of a fresh one.
#include <gtest/gtest.h>

#include <memory>

#include "conformance/differences.h"
#include "support/device_test.h"
// Last: it renames some of the build machine's names.
#include "conformance/target.h"

namespace conformance {

bool OnDesktop() {
  return false;
}

SampleLibrary KnownLibrary() {
  return {TEXT("kx_clapi_dll"), TEXT("KX_CLAPI_DLL.dll"), TEXT("lapi_open"), TEXT("lapi_close"),
          TEXT("LAPI_OPEN")};
}

/// Any file will do: a simulated device runs what its profile says.
void MakeProgram(const WCHAR* name) {
  CloseHandle(
      CreateFileW(name, GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr));
}

}  // namespace conformance

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
