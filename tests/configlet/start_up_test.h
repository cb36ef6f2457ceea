// The fixture of the tests that end "Upgrade".
#pragma once

#include <gmock/gmock.h>

#include <chrono>
#include <cstdint>
#include <string>

#include "ce/kernel.h"
#include "ce/system.h"
#include "configlet/configlet_test.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {

constexpr sim::Micros kPause = std::chrono::milliseconds(3000);

class StartUpTest : public ConfigletTest {
 protected:
  /// A job without files, for a device that has room.
  static void Fill(const char* required_space = "1") {
    Begin("Orvenix");
    Begin("Upgrade");
    Begin("Store");
    Set("Name", "\\");
    Set("RequiredSpace", required_space);
    End("Store");
    Set("ShowGUI", "false");
  }

  /// Adds a test of the value that StoreSystem stores.
  static void FillTest(const char* value, const char* message) {
    Begin("Registry");
    Set("Key", "Software\\Orvenix");
    Set("ValueName", "System");
    Set("Type", "REG_DWORD");
    Set("Operator", "EQ");
    Set("Value", value);
    Set("ErrorMsg", message);
    End("Registry");
  }
  static void StoreSystem(DWORD number) {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                    nullptr, &key, nullptr);
    RegSetValueExW(key, TEXT("System"), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&number),
                   sizeof number);
    RegCloseKey(key);
  }
  static void FillCleanup(const char* path, const char* action) {
    Begin("DiskCleanup");
    Begin("File");
    Set("Name", path);
    Set("Action", action);
    End("File");
    End("DiskCleanup");
  }

  /// Ends "Upgrade". @return its result; `took` is the time that it took.
  std::uint32_t EndUpgrade() {
    const sim::Micros start = world().now();
    const std::uint32_t result = End("Upgrade");
    took_ = world().now() - start;
    return result;
  }
  [[nodiscard]] sim::Micros took() const { return took_; }

  /// Lets the upgrade thread run to its end.
  static bool AwaitTheEnd() {
    for (int second = 0; second < 3600 && HasJob(); ++second) Sleep(1000);
    Sleep(10000);
    return !HasJob() && !upgrade::UpgradeInProgress();
  }

 private:
  sim::Micros took_{};
};

}  // namespace configlet
