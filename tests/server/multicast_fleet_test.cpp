// Many devices, lossy ways: everybody gets the right bytes, in few frames.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "server/model_client.h"
#include "server/multicast_script.h"

namespace server {
namespace {

using test::ModelNetwork;

constexpr char kName[] = "\\Temp\\fleet.bin";

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
  with.size = 10 << 20;
  Make(with).Run();
  ExpectTruth(/*all=*/true);
  const double headers = static_cast<double>(WireBytes(1406)) / 1400;
  const double ideal = IdealSendings(with.loss, 8) * headers;
  EXPECT_LT(Figures().WirePerByte(), ideal * 1.03) << "ideal " << ideal;
}

INSTANTIATE_TEST_SUITE_P(Losses, MulticastEfficiencyTest, ::testing::Values(0, 0.01, 0.05, 0.1));

TEST_F(MulticastFleetTest, SendsEveryBlockOnceWhenNothingIsLost) {
  Circumstances with;
  with.size = 10 << 20;
  Make(with).Run();
  ExpectTruth(/*all=*/true);
  EXPECT_EQ(Figures().first_pass_frames, Figures().block_count);
  EXPECT_EQ(Figures().repair_frames, 0U);
  EXPECT_LE(Figures().WirePerByte(), 1.04);
}

TEST_F(MulticastFleetTest, ProvesEveryDeviceWhateverTheSeed) {
  for (const std::size_t devices : {1U, 3U, 20U}) {
    for (std::uint64_t seed = 1; seed <= 40; ++seed) {
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

TEST_F(MulticastFleetTest, BringsARoamingDeviceThroughThatIsDeafForThreeSeconds) {
  Circumstances with;
  with.devices = 5;
  with.loss = 0.01;
  with.size = 5'000'000;
  with.link.bits_per_second = 10'000'000;
  ModelNetwork& network = Make(with);
  network.At(std::chrono::milliseconds(2500), [&] { network.SetDeaf(2, true); });
  network.At(std::chrono::milliseconds(5500), [&] { network.SetDeaf(2, false); });
  network.At(std::chrono::milliseconds(3000), [&] { network.SetDeaf(0, true); });  // the master
  network.At(std::chrono::milliseconds(6000), [&] { network.SetDeaf(0, false); });
  network.Run();
  ExpectTruth(/*all=*/true);
}

TEST_F(MulticastFleetTest, ReportsADeviceThatDiesWithTheLastThingHeardAndFinishesTheOthers) {
  Circumstances with;
  with.devices = 5;
  with.loss = 0.01;
  with.size = 2'000'000;
  with.link.bits_per_second = 10'000'000;
  ModelNetwork& network = Make(with);
  network.At(std::chrono::milliseconds(2000), [&] { network.SetDeaf(3, true); });
  network.Run();
  ExpectTruth(/*all=*/false);
  EXPECT_EQ(Figures().Count(DeviceState::kProven), 4U);
  EXPECT_EQ(Figures().Count(DeviceState::kDead), 1U);
}

TEST_F(MulticastFleetTest, TakesADeviceInThatComesInTheMiddle) {
  Circumstances with;
  with.devices = 3;
  with.size = 3'000'000;
  with.link.bits_per_second = 10'000'000;
  ModelNetwork& network = Make(with);
  std::string first_request;
  network.passes_up = [&](std::size_t device, std::string_view bytes) {
    const bool request = (static_cast<unsigned char>(bytes[1]) >> 4U) == 1;
    // It asks, but not before the others are halfway through.
    return !(device == 2 && request && network.now() < std::chrono::milliseconds(1500));
  };
  network.At(std::chrono::milliseconds(100), [&] {
    network.run().StartNow(network.now());
    network.Pump();
  });
  network.Run();
  ExpectTruth(/*all=*/true);
  ASSERT_EQ(Figures().devices.size(), 3U);
  EXPECT_TRUE(Figures().devices[2].late);
  EXPECT_LT(Figures().WirePerByte(), 1.95);  // it lacks four fifths of the file
}

TEST_F(MulticastFleetTest, ReleasesAHopelessDeviceRatherThanSlowingTheOthers) {
  Circumstances with;
  with.devices = 4;
  with.size = 1'000'000;
  ModelNetwork& network = Make(with);
  std::uint32_t state = 7;
  network.passes_down = [&](std::size_t device, std::string_view bytes) {
    state = state * 1664525U + 1013904223U;
    return device != 3 || bytes.size() < 100 || state >> 24U < 12;  // 95 % of its blocks are lost
  };
  network.Run();
  ExpectTruth(/*all=*/false);
  EXPECT_EQ(Figures().Count(DeviceState::kProven), 3U);
  EXPECT_EQ(Figures().Count(DeviceState::kReleased), 1U);
  EXPECT_LT(Figures().WirePerByte(), 3.5);
}

TEST_F(MulticastFleetTest, DoesNotCallADeviceProvenThatGaveTheFileUp) {
  Circumstances with;
  with.devices = 2;
  with.size = 100'000;
  ModelNetwork& network = Make(with);
  network.passes_up = [&](std::size_t /*device*/, std::string_view bytes) {
    return (static_cast<unsigned char>(bytes[1]) >> 4U) != 6;  // its ERROR is lost
  };
  network.device(1).fails_to_write = true;
  network.Run();
  ExpectTruth(/*all=*/false);
  EXPECT_EQ(Figures().Count(DeviceState::kProven), 1U);
}

TEST_F(MulticastFleetTest, ServesItsDevicesAmongHundredsThatOnlySeemToBeThere) {
  for (const std::size_t size : {500U, 2000U, 100'000U}) {
    Circumstances with;
    with.devices = 6;
    with.size = size;
    with.loss = 0.02;
    with.expected = 506;
    ModelNetwork& network = Make(with);
    network.At(std::chrono::microseconds(200), [&] {
      for (std::uint32_t i = 0; i < 500; ++i) {
        network.run().OnDatagram({0x0A020000 + i, 7000}, Request(0x11, kName, true), network.now());
      }
      network.Pump();
    });
    network.Run();
    ExpectTruth(/*all=*/true);
    EXPECT_EQ(Figures().Count(DeviceState::kDead), 500U);
    EXPECT_LT(Figures().ended - Figures().data_began, std::chrono::seconds(60)) << size;
  }
}

bool IsData(std::string_view bytes) {
  return (static_cast<unsigned char>(bytes[1]) >> 4U) == 3;
}

/// As behind a switch that does not forward the files' group.
TEST_F(MulticastFleetTest, EndsThoughSomeDevicesHearQuestionsAndNoBlocks) {
  struct Case {
    std::size_t devices;
    std::size_t deaf;
  };
  for (const Case& c : {Case{1, 1}, Case{2, 2}, Case{5, 1}, Case{5, 2}}) {
    for (const std::size_t size : {500U, 2000U, 300'000U}) {
      for (const std::uint32_t window : {1U, 64U}) {
        Circumstances with;
        with.devices = c.devices;
        with.size = size;
        with.window = window;
        ModelNetwork& network = Make(with);
        network.passes_down = [&c](std::size_t device, std::string_view bytes) {
          return device >= c.deaf || !IsData(bytes);
        };
        network.Run(std::chrono::minutes(10));
        ASSERT_TRUE(network.run().finished());
        // In lock-step the receipt of a last block that is all a device lacks rests on its copies.
        if (window > 1) {
          ExpectTruth(/*all=*/false);
          EXPECT_EQ(Figures().Count(DeviceState::kProven), c.devices - c.deaf)
              << c.devices << " devices, " << c.deaf << " deaf, " << size << " bytes";
        }
        EXPECT_LT(Figures().ended - Figures().data_began, std::chrono::minutes(2));
      }
    }
  }
}

TEST_F(MulticastFleetTest, EndsThoughSomeDevicesHaveLeftTheFileAndGoOnAnswering) {
  for (const std::uint32_t window : {1U, 64U}) {
    for (const int milliseconds : {1130, 1200, 1400, 1900}) {
      Circumstances with;
      with.devices = 5;
      with.size = 600'000;
      with.loss = 0.01;
      with.window = window;
      with.link.bits_per_second = 10'000'000;
      ModelNetwork& network = Make(with);
      network.At(std::chrono::milliseconds(milliseconds), [&] {
        network.device(1).Abort();
        network.device(3).Abort();
      });
      network.Run(std::chrono::minutes(10));
      ExpectTruth(/*all=*/false);
      EXPECT_GE(Figures().Count(DeviceState::kProven), 3U) << milliseconds;
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

TEST_F(MulticastFleetTest, KeepsALineFullWithoutDrowningIt) {
  for (const std::size_t devices : {1U, 4U}) {
    for (const std::size_t queue : {24U, 1000U}) {  // 24 frames: what a device's buffer holds
      Circumstances with;
      with.devices = devices;
      with.size = 4'000'000;
      with.window = 1000;
      with.link.bits_per_second = 10'000'000;
      with.link.queue = queue;
      Make(with).Run();
      ExpectTruth(/*all=*/true);
      const double seconds =
          static_cast<double>((Figures().ended - Figures().data_began).count()) / 1e6;
      const double line = static_cast<double>(Figures().wire_bytes) * 8 / 10e6;
      EXPECT_LT(seconds, line * 1.02 + 0.1) << devices << " devices, queue " << queue;
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
