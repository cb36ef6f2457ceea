// Many devices, lossy ways: everybody gets the right bytes, in few frames.
#include "server/multicast_fleet.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

namespace server {
namespace {

/// Sendings of each block until all of `devices` have it, when each loses `loss` of them.
double IdealSendings(double loss, std::size_t devices) {
  double sendings = 0;
  for (int k = 0; k < 100; ++k) {
    sendings += 1 - std::pow(1 - std::pow(loss, k), static_cast<double>(devices));
  }
  return sendings;
}

class MulticastEfficiencyTest : public MulticastFleetTest,
                                public ::testing::WithParamInterface<double> {};

TEST_P(MulticastEfficiencyTest, NeedsHardlyMoreThanTheIdealNumberOfBytesForEightDevices) {
  Circumstances with;
  with.loss = GetParam();
  with.size = 2 << 20;
  Make(with).Run();
  ExpectTruth(/*all=*/true);
  const double headers = static_cast<double>(WireBytes(1406)) / 1400;
  const double ideal = IdealSendings(with.loss, 8) * headers;
  EXPECT_LT(Figures().WirePerByte(), ideal * 1.03) << "ideal " << ideal;
}

INSTANTIATE_TEST_SUITE_P(Losses, MulticastEfficiencyTest, ::testing::Values(0, 0.01, 0.05, 0.1));

TEST_F(MulticastFleetTest, SendsEveryBlockOnceWhenNothingIsLost) {
  Circumstances with;
  with.size = 2 << 20;
  Make(with).Run();
  ExpectTruth(/*all=*/true);
  EXPECT_EQ(Figures().first_pass_frames, Figures().block_count);
  EXPECT_EQ(Figures().repair_frames, 0U);
  EXPECT_LE(Figures().WirePerByte(), 1.04);
}

TEST_F(MulticastFleetTest, ProvesEveryDeviceWhateverTheSeed) {
  for (const std::size_t devices : {1U, 3U, 20U}) {
    for (std::uint64_t seed = 1; seed <= (devices == 20 ? 12U : 40U); ++seed) {
      Circumstances with;
      with.devices = devices;
      with.loss = 0.1;
      with.size = 30'000 + seed * 501;
      with.seed = seed;
      Make(with).Run();
      ExpectTruth(/*all=*/true);
      if (HasFailure()) FAIL() << devices << " devices, seed " << seed;
    }
  }
}

TEST_F(MulticastFleetTest, ProvesEveryDeviceInLockStepToo) {
  for (std::uint64_t seed = 1; seed <= 20; ++seed) {
    Circumstances with;
    with.devices = 3;
    with.loss = 0.02;
    with.size = 60'000;
    with.seed = seed;
    with.window = 1;
    Make(with).Run();
    ExpectTruth(/*all=*/false);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_F(MulticastFleetTest, CallsNobodyProvenWronglyWhenFramesAreRepeatedAndOvertakeEachOther) {
  for (std::uint64_t seed = 1; seed <= 60; ++seed) {
    Circumstances with;
    with.devices = 5;
    with.loss = 0.05;
    with.size = 40'000;
    with.seed = seed;
    with.link.repeat = 0.05;
    with.link.jitter = std::chrono::milliseconds(3);
    with.link.reorders = true;
    Make(with).Run();
    // A repeated last block can end a dally before its acknowledgement has arrived; then nothing
    // more can be known, and nothing is claimed.
    ExpectTruth(/*all=*/false);
    EXPECT_GE(Figures().Count(DeviceState::kProven), 4U) << "seed " << seed;
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_F(MulticastFleetTest, FinishesFilesOfEveryFewBlocks) {
  for (std::size_t blocks = 1; blocks <= 5; ++blocks) {
    for (std::uint64_t seed = 1; seed <= 10; ++seed) {
      Circumstances with;
      with.devices = 4;
      with.loss = 0.1;
      with.size = blocks * 1400 - seed;
      with.seed = seed;
      Make(with).Run();
      ExpectTruth(/*all=*/true);
      if (HasFailure()) FAIL() << blocks << " blocks, seed " << seed;
    }
  }
}

TEST_F(MulticastFleetTest, SendsFileAfterFileAndEndsEveryDeviceWithTheLast) {
  MulticastOptions options;
  options.start.expected = 4;
  std::vector<MulticastFile> files;
  std::vector<std::string> contents;
  for (int i = 0; i < 5; ++i) {
    contents.push_back(SomeBytes(static_cast<std::size_t>(i) * 10'000));
    files.push_back(FileOf("\\Temp\\" + std::to_string(i), contents.back()));
  }
  ModelNetwork::Link link;
  link.loss_down = link.loss_up = 0.02;
  ModelNetwork network(options, files, 4, link, 3);
  network.Run();
  ASSERT_TRUE(network.run().finished());
  for (std::size_t d = 0; d < 4; ++d) {
    for (std::size_t i = 1; i < 5; ++i) {
      EXPECT_EQ(network.device(d).files().at(files[i].device_path), contents[i]);
    }
  }
  EXPECT_LT(network.now(), std::chrono::seconds(45));
}

/// What a client says last of one file it remembers in the next when nothing resets it between.
TEST_F(MulticastFleetTest, SendsFilesOfEqualLengthOneAfterTheOther) {
  int proven = 0;
  for (std::uint64_t seed = 1; seed <= 6; ++seed) {
    MulticastOptions options;
    options.start.expected = 4;
    std::vector<MulticastFile> files;
    std::vector<std::string> contents;
    for (int i = 0; i < 4; ++i) {
      contents.push_back(SomeBytes(10'000));
      contents.back()[0] = static_cast<char>('0' + i);
      files.push_back(FileOf("\\Temp\\" + std::to_string(i), contents.back()));
    }
    ModelNetwork::Link link;
    link.loss_down = link.loss_up = 0.1;
    ModelNetwork network(options, files, 4, link, seed);
    network.Run();
    ASSERT_TRUE(network.run().finished());
    for (std::size_t i = 0; i < files.size(); ++i) {
      for (const DeviceFigures& device : network.run().figures().files[i].devices) {
        if (device.state != DeviceState::kProven) continue;
        ++proven;
        const auto index = device.peer.address - ModelNetwork::PeerOf(0).address;
        EXPECT_TRUE(network.device(index).files().at(files[i].device_path) == contents[i])
            << "device " << index << ", file " << i << ", seed " << seed;
      }
    }
  }
  // Who misses every copy of an announcement, or two answers in a row, has the file by HTTP.
  EXPECT_GE(proven, 6 * 16 - 3);
}

TEST_F(MulticastFleetTest, SaysHowMuchEachDeviceLoses) {
  Circumstances with;
  with.devices = 4;
  with.loss = 0.1;
  Make(with).Run();
  for (const DeviceFigures& device : Figures().devices) {
    EXPECT_GT(device.loss, 0.05) << ToText(device.peer);
    EXPECT_LT(device.loss, 0.2) << ToText(device.peer);
  }
}

TEST_F(MulticastFleetTest, WastesLittleOnALoneDevicesLossyWay) {
  Circumstances with;
  with.devices = 1;
  with.loss = 0.02;
  with.size = 3'000'000;
  Make(with).Run();
  ExpectTruth(/*all=*/true);
  EXPECT_LT(Figures().WirePerByte(), 1.035 * 1.0204 * 1.03);
}

TEST_F(MulticastFleetTest, KeepsALineFullWithoutDrowningIt) {
  for (const std::size_t devices : {1U, 4U}) {
    for (const std::size_t queue : {24U, 1000U}) {  // 24 frames: what a device's buffer holds
      Circumstances with;
      with.devices = devices;
      with.size = 2'000'000;
      with.window = 1000;
      with.link.bits_per_second = 10'000'000;
      with.link.queue = queue;
      Make(with).Run();
      ExpectTruth(/*all=*/true);
      const double seconds =
          static_cast<double>((Figures().ended - Figures().data_began).count()) / 1e6;
      const double line = static_cast<double>(Figures().wire_bytes) * 8 / 10e6;
      EXPECT_LT(seconds, line * 1.02 + 0.15) << devices << " devices, queue " << queue;
      EXPECT_LT(Figures().repair_frames, Figures().block_count / 50)
          << devices << " devices, queue " << queue;
    }
  }
}

TEST_F(MulticastFleetTest, DoesTheSameWithTheSameSeed) {
  Circumstances with;
  with.loss = 0.05;
  Make(with).Run();
  const std::uint64_t frames = Figures().frames;
  const std::uint64_t naks = Figures().naks;
  Make(with).Run();
  EXPECT_EQ(Figures().frames, frames);
  EXPECT_EQ(Figures().naks, naks);
}

}  // namespace
}  // namespace server
