// The fixture of the configlet's tests: the test is the host.
#pragma once

#include <string>
#include <string_view>

#include "ce/system.h"
#include "configlet/walk.h"
#include "faults/faults.h"
#include "kernel/handle_table.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace configlet {

/// Each test runs in a process of its own, as the module's state lives as long as its process.
class ConfigletTest : public DeviceTest {
 protected:
  explicit ConfigletTest(const sim::Profile& profile = {}) : DeviceTest(profile) {}

  static std::uint32_t Begin(const char* group, std::uint32_t mode = 0) {
    return IcfgBeginGroup(group, 0, mode);
  }
  static std::uint32_t Set(const char* field, const char* value) {
    return IcfgSetField(field, 0, value);
  }
  static std::uint32_t End(const char* group) { return IcfgEndGroup(group, 0, 0); }

  /// The job being filled.
  static UpgradeConfig& job() { return *TheWalk().job; }
  static bool HasJob() { return TheWalk().job != nullptr; }
  static std::string Group() { return TheWalk().group.c_str(); }

  /// What has been logged since the test began, or since ForgetLog.
  [[nodiscard]] std::string Log() const {
    return test::GetFile("\\FileXfer.log").value_or("").substr(forgotten_);
  }
  void ForgetLog() { forgotten_ += Log().size(); }

  [[nodiscard]] std::size_t OpenHandles() {
    const sim::World::Lock lock = world().Acquire();
    return device().handles().open_handles();
  }

 private:
  std::size_t forgotten_ = 0;
};

}  // namespace configlet
