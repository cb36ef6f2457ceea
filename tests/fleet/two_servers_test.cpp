// Two servers that announce on one group, and the product's own clients between them.
#include <gmock/gmock.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "base/crc32.h"
#include "device/device.h"
#include "net/virtual/virtual_network.h"
#include "server/multicast_run.h"
#include "tools/fleet/device_program.h"
#include "tools/fleet/fleet.h"
#include "tools/fleet/fleet_folder.h"
#include "tools/virtual_multicast.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace {

using server::DeviceState;
using std::chrono::milliseconds;
using ::testing::ElementsAre;

std::uint32_t CrcOf(const std::string& bytes) {
  base::Crc32 crc;
  crc.Update(bytes.data(), bytes.size());
  return crc.value();
}

/// One of the two servers, and what it sends.
struct Sender {
  sim::Endpoint at;
  sim::Micros begins;
  std::vector<fleet::File> files;
  server::MulticastOptions options;
  std::unique_ptr<server::MulticastRun> run;
  std::unique_ptr<tools::VirtualMulticast> port;
};

class TwoServersTest : public ::testing::Test {
 protected:
  static constexpr sim::Address kFirstDevice = 0x0A000101;  // 10.0.1.1
  static constexpr std::size_t kDevices = 4;

  void Make(std::uint64_t seed, double loss) {
    world_ = sim::World::MakeVirtual(seed, sim::ThreadKind::kLight);
    sim::LinkProfile link = fleet::Plan::DefaultLink();
    link.loss = loss;
    sim::VirtualNetwork(*world_).SetDefaultLink(link);
    folder_ = std::make_unique<fleet::FleetFolder>();
    senders_.clear();
    for (std::uint32_t i = 0; i < 2; ++i) {
      Sender& sender = senders_.emplace_back();
      sender.at = {0x0AFF0001 + i, 7001};
      sender.begins = milliseconds(1000 + 700 * i);
      sender.options.start.expected = kDevices;
      sender.options.seed = seed + i;
    }
  }

  /// Two files of one length, which begin at various distances, some of them under loss.
  void MakeDifferent(std::uint64_t seed) {
    Make(seed, seed % 2 == 0 ? 0.05 : 0);
    senders_[0].files = {{"\\Temp\\first.bin", "", fleet::Noise(60000, 7)}};
    senders_[1].files = {{"\\Temp\\second.bin", "", fleet::Noise(60000, 8)}};
    senders_[1].begins = milliseconds(1000 + 250 * seed);
  }

  void Run() {
    MakeDevices();
    for (Sender& sender : senders_) StartSender(sender);
    {
      const sim::AttachedThread conductor(*devices_[0], "conductor");
      const std::vector<sim::SimThread*> programs = StartClients();
      sim::World::Lock lock = world_->Acquire();
      for (sim::SimThread* program : programs) {
        world_->WaitUntil(lock, {&program->finished}, world_->now() + std::chrono::hours(1),
                          [program] { return program->state == sim::SimThread::State::kFinished; });
      }
      AwaitSenders(lock);
    }
    for (Sender& sender : senders_) sender.port.reset();
    devices_.clear();
  }

  [[nodiscard]] const server::FileFigures& Figures(std::size_t sender) const {
    return senders_[sender].run->figures().files[0];
  }
  /// Devices that hold the sender's file as it is.
  [[nodiscard]] std::size_t Right(std::size_t sender) const {
    return static_cast<std::size_t>(std::count(right_[sender].begin(), right_[sender].end(), true));
  }

  /// Nobody is called proven who has not the file of the server that says so.
  void CheckTruth() const {
    for (std::size_t sender = 0; sender < senders_.size(); ++sender) {
      for (const server::DeviceFigures& device : Figures(sender).devices) {
        if (device.state != DeviceState::kProven) continue;
        EXPECT_TRUE(right_[sender][device.peer.address - kFirstDevice])
            << "server " << sender << " calls " << ToText(device.peer) << " proven";
      }
    }
  }

  std::vector<Sender> senders_;

 private:
  void MakeDevices() {
    for (std::uint32_t i = 0; i < kDevices; ++i) {
      sim::Profile profile;
      profile.address = sim::ToText(kFirstDevice + i);
      devices_.push_back(
          std::make_unique<sim::Device>(*world_, profile, folder_->path() / std::to_string(i)));
    }
    for (auto& right : right_) right.assign(kDevices, false);
  }
  void StartSender(Sender& sender) {
    std::vector<server::MulticastFile> files;
    for (const fleet::File& file : sender.files) {
      files.push_back({file.device_path, file.masks, 0x20, "2006-03-01 14:05:09",
                       server::MemoryContent(file.content)});
    }
    sender.run = std::make_unique<server::MulticastRun>(sender.options, std::move(files));
    sender.port = std::make_unique<tools::VirtualMulticast>(*world_, sender.at, *sender.run);
    sim::VirtualNetwork(*world_).At(sender.begins, [&sender] { sender.port->Start(); });
  }
  std::vector<sim::SimThread*> StartClients() {
    std::vector<sim::SimThread*> programs;
    const sim::World::Lock lock = world_->Acquire();
    for (std::size_t i = 0; i < kDevices; ++i) {
      programs.push_back(&world_->Spawn(
          *devices_[i], "client", [this, i] { return RunDevice(i); }, false));
    }
    return programs;
  }
  std::uint32_t RunDevice(std::size_t device) {
    fleet::RunClient("-A=239.1.1.1 -P=7000 -HV=TQ52");
    for (std::size_t sender = 0; sender < senders_.size(); ++sender) {
      const fleet::File& file = senders_[sender].files.front();
      std::uint32_t crc = 0;
      right_[sender][device] = fleet::FileCrc(file.device_path, crc) && crc == CrcOf(file.content);
    }
    return 0;
  }
  void AwaitSenders(sim::World::Lock& lock) {
    const auto ended = [this] {
      return std::all_of(senders_.begin(), senders_.end(),
                         [](const Sender& sender) { return sender.run->finished(); });
    };
    for (int second = 0; second < 600 && !ended(); ++second) {
      world_->WaitUntil(lock, {}, world_->now() + std::chrono::seconds(1), [] { return false; });
    }
    EXPECT_TRUE(ended()) << "a server does not come to its end";
  }
  std::unique_ptr<fleet::FleetFolder> folder_;
  std::unique_ptr<sim::World> world_;
  std::vector<std::unique_ptr<sim::Device>> devices_;
  std::vector<bool> right_[2];
};

TEST_F(TwoServersTest, WithTheSameFileEachBringsItToThoseWhoHeardItFirst) {
  for (std::uint64_t seed = 1; seed <= 5; ++seed) {
    Make(seed, 0.05);
    for (Sender& sender : senders_) {
      sender.files = {{"\\Temp\\same.bin", "", fleet::Noise(60000, 7)}};
    }
    Run();
    CheckTruth();
    EXPECT_EQ(Right(0), kDevices) << "seed " << seed;
    EXPECT_EQ(Figures(0).Count(DeviceState::kProven) + Figures(1).Count(DeviceState::kProven),
              kDevices)
        << "seed " << seed;
  }
}

TEST_F(TwoServersTest, WithGroupsOfTheirOwnForBlocksNeitherIsProvenByWhatTheOtherSent) {
  for (std::uint64_t seed = 1; seed <= 12; ++seed) {
    MakeDifferent(seed);
    senders_[1].options.private_group = 0xEF010103;
    Run();
    CheckTruth();
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_F(TwoServersTest, WithOneGroupForBlocksBothEndAndSayThatTheyWereNotAlone) {
  for (std::uint64_t seed = 1; seed <= 4; ++seed) {
    MakeDifferent(seed);
    Run();
    for (std::size_t i = 0; i < 2; ++i) {
      const auto& rivals = senders_[i].run->figures().rivals;
      EXPECT_THAT(rivals,
                  ElementsAre(server::Peer{0x0AFF0002 - static_cast<std::uint32_t>(i), 7001}))
          << "seed " << seed;
    }
  }
}

}  // namespace
