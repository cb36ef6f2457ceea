// A fleet of model clients, one file, and what became of it.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "server/model_client.h"
#include "server/multicast_script.h"

namespace server {

using test::ModelNetwork;

struct Circumstances {
  std::size_t devices = 8;
  double loss = 0;
  std::size_t size = 1'000'000;
  std::uint64_t seed = 1;
  std::uint32_t window = 64;
  std::uint32_t expected = 0;  ///< 0: as many as there are devices
  ModelNetwork::Link link;
};

class MulticastFleetTest : public ::testing::Test {
 protected:
  static constexpr char kName[] = "\\Temp\\fleet.bin";

  ModelNetwork& Make(const Circumstances& with) {
    content_ = SomeBytes(with.size);
    MulticastOptions options;
    options.window = with.window;
    options.start.expected =
        with.expected > 0 ? with.expected : static_cast<std::uint32_t>(with.devices);
    options.first_transfer_id = 0x11;
    options.seed = with.seed;
    ModelNetwork::Link link = with.link;
    link.loss_down = with.loss;
    link.loss_up = with.loss;
    network_ =
        std::make_unique<ModelNetwork>(options, std::vector<MulticastFile>{FileOf(kName, content_)},
                                       with.devices, link, with.seed);
    return *network_;
  }
  [[nodiscard]] bool HasFile(std::size_t device) const {
    const auto& files = network_->device(device).files();
    const auto file = files.find(kName);
    return file != files.end() && file->second == content_;
  }
  [[nodiscard]] const FileFigures& Figures() const { return network_->run().figures().files[0]; }

  /// Nobody is called proven that has not every byte; with `all`, everybody is.
  void ExpectTruth(bool all) {
    ASSERT_TRUE(network_->run().finished());
    for (std::size_t i = 0; i < network_->devices(); ++i) {
      const auto at =
          std::find_if(Figures().devices.begin(), Figures().devices.end(),
                       [i](const DeviceFigures& d) { return d.peer == ModelNetwork::PeerOf(i); });
      const bool proven = at != Figures().devices.end() && at->state == DeviceState::kProven;
      EXPECT_TRUE(!proven || HasFile(i)) << "device " << i << " is called proven";
      if (all) {
        EXPECT_TRUE(proven) << "device " << i << ": "
                            << (at == Figures().devices.end() ? "never asked" : at->reason);
      }
    }
  }

  std::string content_;
  std::unique_ptr<ModelNetwork> network_;
};

}  // namespace server
