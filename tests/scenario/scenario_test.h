// A device, its management client and the upgrade server in one virtual world.
#pragma once

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "net/virtual/virtual_network.h"
#include "product_support/host.h"
#include "product_support/log_lines.h"
#include "product_support/upgrade_server.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace test {

class ScenarioTest : public DeviceTest {
 protected:
  explicit ScenarioTest(const sim::Profile& profile = {});
  ~ScenarioTest() override;

  [[nodiscard]] UpgradeServer& server() { return server_; }
  [[nodiscard]] sim::VirtualNetwork& network() { return network_; }

  /// Every line that the progress window has shown, in order.
  [[nodiscard]] std::vector<std::string> ShownLines() const;

  /// Runs `action` so much later in the world's time.
  void After(std::chrono::seconds delay, std::function<void()> action) {
    network_.At(world().now() + delay, std::move(action));
  }

  /// Walks the job and ends it. @return the result.
  std::uint32_t Start(const HostJob& job) {
    WalkJob(job);
    return EndJob();
  }

 private:
  UpgradeServer server_;
  sim::VirtualNetwork network_;
  std::vector<std::string> shown_;
};

}  // namespace test
