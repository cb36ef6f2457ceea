// Devices that are deaf, dead, hopeless, late or gone, and ways that repeat what they carry.
#include <gtest/gtest.h>

#include <array>
#include <random>
#include <string>

#include "server/multicast_fleet.h"

namespace server {
namespace {

class MulticastTroubleTest : public MulticastFleetTest {};

TEST_F(MulticastTroubleTest, BringsARoamingDeviceThroughThatIsDeafForThreeSeconds) {
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

TEST_F(MulticastTroubleTest, ReportsADeviceThatDiesWithTheLastThingHeardAndFinishesTheOthers) {
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

TEST_F(MulticastTroubleTest, TakesADeviceInThatComesInTheMiddle) {
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

TEST_F(MulticastTroubleTest, ReleasesAHopelessDeviceRatherThanSlowingTheOthers) {
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

TEST_F(MulticastTroubleTest, DoesNotCallADeviceProvenThatGaveTheFileUp) {
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

TEST_F(MulticastTroubleTest, ServesItsDevicesAmongHundredsThatOnlySeemToBeThere) {
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
TEST_F(MulticastTroubleTest, EndsThoughSomeDevicesHearQuestionsAndNoBlocks) {
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

TEST_F(MulticastTroubleTest, EndsThoughSomeDevicesHaveLeftTheFileAndGoOnAnswering) {
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

// ---- whoever dies, whenever it dies ----

constexpr std::array kPhases = {FilePhase::kStreaming, FilePhase::kRepairing, FilePhase::kClosing};

TEST_F(MulticastTroubleTest, EndsWhenTheMasterDiesInAnyPhase) {
  for (const FilePhase phase : kPhases) {
    Circumstances with;
    with.devices = 4;
    with.loss = 0.05;
    with.size = 60'000;
    ModelNetwork& network = Make(with);
    network.passes_down = [&](std::size_t /*device*/, std::string_view /*bytes*/) {
      if (Figures().phase == phase) network.SetDeaf(0, true);  // the first that is asked
      return true;
    };
    network.Run(std::chrono::minutes(10));
    ExpectTruth(/*all=*/false);
    EXPECT_EQ(Figures().Count(DeviceState::kProven), 3U) << PhaseName(phase);
    EXPECT_EQ(Figures().Count(DeviceState::kDead), 1U) << PhaseName(phase);
    EXPECT_LT(Figures().ended - Figures().data_began, std::chrono::minutes(1)) << PhaseName(phase);
  }
}

TEST_F(MulticastTroubleTest, EndsWhenEverybodyDiesInAnyPhaseAndSaysWhatWasHeardLast) {
  for (const FilePhase phase : kPhases) {
    Circumstances with;
    with.devices = 4;
    with.size = 60'000;
    with.loss = 0.05;
    ModelNetwork& network = Make(with);
    network.passes_down = [&](std::size_t /*device*/, std::string_view /*bytes*/) {
      for (std::size_t i = 0; Figures().phase == phase && i < 4; ++i) network.SetDeaf(i, true);
      return true;
    };
    network.Run(std::chrono::minutes(10));
    ASSERT_TRUE(network.run().finished());
    EXPECT_EQ(Figures().Count(DeviceState::kDead), 4U) << PhaseName(phase);
    for (const DeviceFigures& device : Figures().devices) {
      EXPECT_NE(device.last_heard, "nothing");
      EXPECT_NE(device.reason, "");
    }
    EXPECT_LT(Figures().ended - Figures().data_began, std::chrono::minutes(2)) << PhaseName(phase);
  }
}

TEST_F(MulticastTroubleTest, BringsEveryFileThroughBurstsOfLoss) {
  for (const std::size_t devices : {1U, 3U, 12U}) {
    for (std::uint64_t seed = 1; seed <= 10; ++seed) {
      Circumstances with;
      with.devices = devices;
      with.size = 30'000;
      with.seed = seed;
      ModelNetwork& network = Make(with);
      std::mt19937_64 random(seed);
      std::vector<Micros> deaf_until(devices, Micros(0));
      network.passes_down = [&](std::size_t device, std::string_view /*bytes*/) {
        const bool hears = network.now() >= deaf_until[device];
        if (hears && random() % 50 == 0) {
          deaf_until[device] = network.now() + Micros(random() % 20'000);
        }
        return hears;
      };
      network.Run(std::chrono::minutes(10));
      ExpectTruth(/*all=*/true);
      if (HasFailure()) FAIL() << devices << " devices, seed " << seed;
    }
  }
}

TEST_F(MulticastTroubleTest, CallsNobodyProvenWronglyWhenFramesOfASmallFileAreRepeated) {
  for (std::size_t blocks = 1; blocks <= 3; ++blocks) {
    for (std::uint64_t seed = 1; seed <= 12; ++seed) {
      Circumstances with;
      with.devices = 4;
      with.loss = 0.05;
      with.size = blocks * 1400 - seed;
      with.seed = seed;
      with.link.repeat = 0.1;
      Make(with).Run();
      ExpectTruth(/*all=*/false);
      EXPECT_GE(Figures().Count(DeviceState::kProven), 3U);
      if (HasFailure()) FAIL() << blocks << " blocks, seed " << seed;
    }
  }
}

TEST_F(MulticastTroubleTest, LosesNoLateDeviceToTheClockWhenTheRateIsLow) {
  content_ = SomeBytes(400'000);
  MulticastOptions options;
  options.start.expected = 1;
  options.rate = 1'000'000;  // the file takes three seconds
  options.release_after = std::chrono::seconds(1);
  network_ = std::make_unique<ModelNetwork>(options, std::vector{FileOf(kName, content_)}, 2,
                                            ModelNetwork::Link{}, 1);
  network_->passes_up = [this](std::size_t device, std::string_view /*bytes*/) {
    return device == 0 || network_->now() > std::chrono::seconds(2);
  };
  network_->Run(std::chrono::minutes(10));
  ExpectTruth(/*all=*/true);
  EXPECT_TRUE(Figures().devices[1].late);
}

}  // namespace
}  // namespace server
