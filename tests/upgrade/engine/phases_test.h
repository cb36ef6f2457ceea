// A device with a job and a server, for the phases that bring files onto the device.
#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "device/file.h"
#include "device/flash/ram_file.h"
#include "faults/faults.h"
#include "http/job_client.h"
#include "kernel/kernel.h"
#include "net/network.h"
#include "product_support/jobs.h"
#include "product_support/log_lines.h"
#include "product_support/status_lines.h"
#include "product_support/upgrade_server.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/fetch.h"
#include "upgrade/file_lists.h"
#include "upgrade/phases.h"

namespace upgrade {

class PhasesTest : public DeviceTest {
 protected:
  PhasesTest()
      : server_(world()), network_(world()), job_(std::make_unique<UpgradeConfig>()), run_(*job_) {
    test::ClearStatusLines();
    job().SetBaseURL(test::kServerUrl);
    test::SetMfgString(job(), "TQ52-A1");
  }

  ~PhasesTest() override {
    http::ReleaseJobClient();
    test::ClearStatusLines();
  }

  UpgradeConfig& job() { return *job_; }
  upgrade::Run& run() { return run_; }
  test::UpgradeServer& server() { return server_; }

  void At(std::chrono::seconds when, std::function<void()> action) {
    network_.At(world().now() + when, std::move(action));
  }

  /// How often the program slept for so long.
  std::size_t Sleeps(std::uint32_t length_ms) {
    std::size_t count = 0;
    for (const auto& sleep : device().kernel().Sleeps()) count += sleep.length_ms == length_ms;
    return count;
  }

  /// From now on there is no memory, after `spared` more allocations.
  void RunOutOfMemory(std::uint64_t spared = 0, std::uint32_t error = ERROR_OUTOFMEMORY) {
    device().faults().Add({"LocalAlloc", spared + 1, 0, error});
  }

 private:
  test::UpgradeServer server_;
  sim::VirtualNetwork network_;
  std::unique_ptr<UpgradeConfig> job_;
  upgrade::Run run_;
};

}  // namespace upgrade
