// What the run time of the device's library does, carried out: a DLL that was made as the library
// is.
#include <gtest/gtest.h>

#include <array>
#include <filesystem>
#include <string>

#include "ce/kernel.h"
#include "kernel/debug.h"
#include "loader/dll.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

/// With the stack as the device has it, and as the host does.
class RunTimeTest : public DeviceTest, public testing::WithParamInterface<bool> {
 protected:
  void SetUp() override {
    if (!std::filesystem::exists(ORVENIX_RUN_TIME_DLL)) {
      GTEST_SKIP() << ORVENIX_RUN_TIME_DLL << " is not there: build the preset ce before";
    }
    sim::SetLibraryReader(loader::DllReader({std::nullopt, GetParam()}));
    test::PutFile("\\probe.dll", loader::ReadDllFile(ORVENIX_RUN_TIME_DLL));
    module_ = LoadLibraryW(u"\\probe.dll");
    ASSERT_NE(module_, nullptr);
  }
  ~RunTimeTest() override {
    if (module_ != nullptr) FreeLibrary(module_);
    sim::SetLibraryReader({});
  }

  template <typename Kind>
  Kind* Find(const char16_t* name) {
    const FARPROC function = GetProcAddressW(module_, name);
    EXPECT_NE(function, nullptr) << "no such export";
    return reinterpret_cast<Kind*>(reinterpret_cast<loader::Function>(function));
  }

  HMODULE module_ = nullptr;
};

INSTANTIATE_TEST_SUITE_P(Stack, RunTimeTest, testing::Values(false, true),
                         [](const auto& way) { return way.param ? "Misaligned" : "Aligned"; });

TEST_P(RunTimeTest, MakesObjectsBeforeTheLibraryHearsOfItAndDestroysThemAfterwards) {
  EXPECT_EQ(device().debug().KernelText(), "first made, second made, attached");
  FreeLibrary(module_);
  module_ = nullptr;
  EXPECT_EQ(device().debug().KernelText(),
            "first made, second made, attacheddetached, second gone, first gone, ");
}

TEST_P(RunTimeTest, MakesObjectsOnTheDevicesHeap) {
  EXPECT_EQ(Find<int(int)>(u"ProbeArea")(7), 49);
  EXPECT_NE(device().debug().KernelText().find("square 7 gone"), std::string::npos);
}

TEST_P(RunTimeTest, CalculatesWhatTheProcessorCannot) {
  auto* const divide =
      Find<std::uint32_t(std::uint32_t, std::uint32_t, std::uint32_t)>(u"ProbeDivide");
  EXPECT_EQ(divide(1, 0, 3), 0x55555555U);
  EXPECT_EQ(divide(0, 100, 7), 14U);
  auto* const percent = Find<int(std::uint32_t, std::uint32_t)>(u"ProbePercent");
  EXPECT_EQ(percent(1, 8), 12);
  EXPECT_EQ(percent(4000000000U, 4000000000U), 100);
}

TEST_P(RunTimeTest, MovesMemoryThatOverlaps) {
  auto* const move = Find<void(char*, const char*, std::uint32_t)>(u"ProbeMove");
  std::string text = "0123456789abcdefghijklmnopqrstuvwxyz";
  move(text.data() + 1, text.data(), 30);
  EXPECT_EQ(text, "00123456789abcdefghijklmnopqrstvwxyz");
  move(text.data(), text.data() + 1, 35);
  EXPECT_EQ(text, "0123456789abcdefghijklmnopqrstvwxyzz");
}

TEST_P(RunTimeTest, CountsWideCharactersOfTwoBytes) {
  EXPECT_EQ(Find<std::uint32_t(const char16_t*)>(u"ProbeLength")(u"f\u00fcnf\u20ac"), 5U);
}

TEST_P(RunTimeTest, SignalsEventsThroughTheOneFunctionThatTheDeviceHas) {
  HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  EXPECT_NE(Find<int(HANDLE)>(u"ProbeSignal")(event), 0);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_OBJECT_0);
}

}  // namespace
