#include "tools/fleet/fleet.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <numeric>
#include <stdexcept>

#include "base/crc32.h"
#include "device/device.h"
#include "net/virtual/virtual_network.h"
#include "server/multicast_run.h"
#include "storage/storage.h"
#include "tools/fleet/device_program.h"
#include "tools/fleet/fleet_folder.h"
#include "tools/virtual_multicast.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace fleet {
namespace {

constexpr sim::Endpoint kServer{0x0AFF0001, 7001};  // 10.255.0.1
constexpr sim::Address kFirstDevice = 0x0A000101;   // 10.0.1.1
constexpr std::uint32_t kMostDevices = 60000;
/// Clients begin at the world's beginning; by then all of them wait.
constexpr sim::Micros kServerStart = std::chrono::seconds(1);

std::uint32_t CrcOf(const std::string& bytes) {
  base::Crc32 crc;
  crc.Update(bytes.data(), bytes.size());
  return crc.value();
}

/// One fleet under way.
class Voyage {
 public:
  explicit Voyage(const Plan& plan);
  ~Voyage();
  Voyage(const Voyage&) = delete;
  Voyage& operator=(const Voyage&) = delete;
  Outcome Go();

 private:
  void MakeDevices();
  [[nodiscard]] sim::Profile ProfileOf(std::uint32_t index) const;
  void MakeServer();
  void SetUpNetwork();
  [[nodiscard]] bool IsAbsent(sim::Address address, sim::Micros now) const;
  void StartClients();
  std::uint32_t RunDevice(std::uint32_t index);
  [[nodiscard]] FileFate FateOf(std::size_t file) const;
  void AwaitEnd();

  const Plan& plan_;
  std::vector<std::uint32_t> crcs_;
  std::uint64_t bytes_ = 0;  ///< of all files
  FleetFolder folder_;
  std::unique_ptr<sim::World> world_;
  std::vector<std::unique_ptr<sim::Device>> devices_;
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<tools::VirtualMulticast> port_;
  std::vector<sim::SimThread*> programs_;
  Outcome outcome_;
};

Voyage::Voyage(const Plan& plan)
    : plan_(plan),
      world_(sim::World::MakeVirtual(
          plan.seed, plan.light_threads ? sim::ThreadKind::kLight : sim::ThreadKind::kHost)) {
  if (plan.devices == 0 || plan.devices > kMostDevices) {
    throw std::invalid_argument("a fleet has 1 to " + std::to_string(kMostDevices) + " devices");
  }
  if (plan.files.empty()) throw std::invalid_argument("there is no file to send");
  for (const File& file : plan.files) {
    crcs_.push_back(CrcOf(file.content));
    bytes_ += file.content.size();
  }
  MakeDevices();
  MakeServer();
  SetUpNetwork();
}

// What lives on the network goes before the devices, and these before their world.
Voyage::~Voyage() {
  port_.reset();
  devices_.clear();
}

sim::Profile Voyage::ProfileOf(std::uint32_t index) const {
  sim::Profile profile;
  profile.name = profile.host_name = "device" + std::to_string(index);
  profile.address = sim::ToText(kFirstDevice + index);
  profile.configuration = plan_.configuration;
  profile.store_pages += static_cast<std::uint32_t>(bytes_ / profile.page_size);
  return profile;
}

void Voyage::MakeDevices() {
  const auto largest = std::max_element(
      plan_.files.begin(), plan_.files.end(),
      [](const File& a, const File& b) { return a.content.size() < b.content.size(); });
  const auto shared = std::make_shared<const std::string>(largest->content);
  for (std::uint32_t i = 0; i < plan_.devices; ++i) {
    devices_.push_back(
        std::make_unique<sim::Device>(*world_, ProfileOf(i), folder_.path() / std::to_string(i)));
    devices_.back()->storage().ShareContent(shared);
  }
  outcome_.devices.resize(plan_.devices);
}

void Voyage::MakeServer() {
  server::MulticastOptions options = plan_.server;
  if (options.start.expected == 0) options.start.expected = plan_.devices;
  if (options.seed == 0) options.seed = plan_.seed;
  std::vector<server::MulticastFile> files;
  for (const File& file : plan_.files) {
    files.push_back({file.device_path, file.masks, 0x20, "2006-03-01 14:05:09",
                     server::MemoryContent(file.content)});
  }
  run_ = std::make_unique<server::MulticastRun>(options, std::move(files));
  port_ = std::make_unique<tools::VirtualMulticast>(*world_, kServer, *run_);
}

void Voyage::SetUpNetwork() {
  sim::VirtualNetwork network(*world_);
  network.SetDefaultLink(plan_.link);
  if (plan_.capture) network.StartCapture();
  if (plan_.absences.empty()) return;
  network.SetDatagramFilter([this](const sim::Frame& frame, sim::Address receiver) {
    return !IsAbsent(frame.from.address, frame.when) && !IsAbsent(receiver, frame.when);
  });
}

bool Voyage::IsAbsent(sim::Address address, sim::Micros now) const {
  const auto& files = run_->figures().files;
  const sim::Micros began = files.empty() ? sim::Micros{0} : files.front().data_began;
  if (began.count() == 0) return false;
  return std::any_of(plan_.absences.begin(), plan_.absences.end(), [&](const Absence& absence) {
    const sim::Micros begin = began + absence.begin;
    return address == kFirstDevice + absence.device && now >= begin &&
           (absence.length.count() == 0 || now < begin + absence.length);
  });
}

FileFate Voyage::FateOf(std::size_t file) const {
  std::uint32_t crc = 0;
  if (!FileCrc(plan_.files[file].device_path, crc)) return FileFate::kMissing;
  return crc == crcs_[file] ? FileFate::kRight : FileFate::kWrong;
}

std::uint32_t Voyage::RunDevice(std::uint32_t index) {
  const server::Peer& group = run_->options().public_group;
  DeviceOutcome& outcome = outcome_.devices[index];
  outcome.result =
      RunClient("-A=" + server::AddressText(group.address) + " -P=" + std::to_string(group.port) +
                " -HV=" + plan_.configuration.substr(0, 4));
  outcome.ended_at = world_->now();
  for (std::size_t i = 0; i < plan_.files.size(); ++i) outcome.files.push_back(FateOf(i));
  outcome.ended = true;
  return 0;
}

void Voyage::StartClients() {
  const sim::World::Lock lock = world_->Acquire();
  for (std::uint32_t i = 0; i < plan_.devices; ++i) {
    programs_.push_back(&world_->Spawn(
        *devices_[i], "client", [this, i] { return RunDevice(i); }, false));
  }
}

void Voyage::AwaitEnd() {
  sim::World::Lock lock = world_->Acquire();
  const sim::Micros deadline = world_->now() + plan_.limit;
  for (sim::SimThread* program : programs_) {
    world_->WaitUntil(lock, {&program->finished}, deadline,
                      [program] { return program->state == sim::SimThread::State::kFinished; });
  }
}

Outcome Voyage::Go() {
  for (std::uint32_t i = 0; i < plan_.devices; ++i) {
    outcome_.devices[i].address = kFirstDevice + i;
  }
  for (const Absence& absence : plan_.absences) {
    const bool for_ever = absence.length.count() == 0;
    if (for_ever && absence.device < plan_.devices) {
      outcome_.devices[absence.device].absent_for_ever = true;
    }
  }
  {
    const sim::AttachedThread conductor(*devices_[0], "conductor");
    outcome_.run_began = world_->now() + kServerStart;
    sim::VirtualNetwork(*world_).At(outcome_.run_began, [this] {
      port_->Start([this] { outcome_.run_ended = world_->now(); });
    });
    StartClients();
    AwaitEnd();
  }
  outcome_.figures = run_->figures();
  outcome_.run_finished = run_->finished();
  if (plan_.capture) outcome_.frames = sim::VirtualNetwork(*world_).Frames();
  return std::move(outcome_);
}

}  // namespace

std::size_t Outcome::Count(FileFate fate) const {
  return std::accumulate(devices.begin(), devices.end(), std::size_t{0},
                         [fate](std::size_t sum, const DeviceOutcome& device) {
                           return sum + static_cast<std::size_t>(std::count(
                                            device.files.begin(), device.files.end(), fate));
                         });
}

bool Outcome::all_right() const {
  return std::all_of(devices.begin(), devices.end(), [](const DeviceOutcome& device) {
    const auto right = std::count(device.files.begin(), device.files.end(), FileFate::kRight);
    return device.absent_for_ever ||
           (device.ended && right == static_cast<std::ptrdiff_t>(device.files.size()));
  });
}

Outcome Run(const Plan& plan) {
  return Voyage(plan).Go();
}

double IdealFrames(std::uint32_t devices, double loss) {
  if (loss >= 1) return HUGE_VAL;
  double frames = 0;
  double lost_so_far = 1;  // probability that a device has lost each frame of a block so far
  for (;;) {
    const double needed = -std::expm1(devices * std::log1p(-lost_so_far));
    frames += needed;
    lost_so_far *= loss;
    if (needed < 1e-12 || lost_so_far == 0) return frames;
  }
}

}  // namespace fleet
