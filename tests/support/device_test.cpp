#include "support/device_test.h"

#include <cstdlib>
#include <stdexcept>
#include <utility>

namespace test {

TemporaryFolder::TemporaryFolder() {
  std::string pattern = (std::filesystem::temp_directory_path() / "orvenix-test-XXXXXX").string();
  if (mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("no temporary folder");
  path_ = pattern;
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code ignored;  // a folder that cannot be removed fails no test
  std::filesystem::remove_all(path_, ignored);
}

std::uint32_t RunProgram(sim::Device& device, std::function<std::uint32_t()> program,
                         std::string name) {
  sim::World& world = device.world();
  const sim::AttachedThread waiter(device, "waiter for " + name);
  sim::World::Lock lock = world.Acquire();
  sim::SimThread& thread = world.Spawn(device, std::move(name), std::move(program), false);
  world.WaitUntil(lock, {&thread.finished}, std::nullopt,
                  [&] { return thread.state == sim::SimThread::State::kFinished; });
  return thread.exit_code;
}

DeviceTest::DeviceTest(sim::Profile profile, std::uint64_t seed)
    : DeviceTest(WorldKind::kVirtual, std::move(profile), seed) {}

DeviceTest::DeviceTest(WorldKind kind, sim::Profile profile, std::uint64_t seed)
    : world_(kind == WorldKind::kVirtual ? sim::World::MakeVirtual(seed) : sim::World::MakeReal()),
      profile_(std::move(profile)) {
  Restart(profile_);
}

DeviceTest::~DeviceTest() {
  host_.reset();
  device_.reset();
}

void DeviceTest::Restart() {
  Restart(profile_);
}

void DeviceTest::Restart(sim::Profile profile) {
  profile_ = std::move(profile);
  host_.reset();
  device_.reset();
  device_ = std::make_unique<sim::Device>(*world_, profile_, folder_.path() / "device");
  host_ = std::make_unique<sim::AttachedThread>(*device_, "test");
}

RealDeviceTest::RealDeviceTest(sim::Profile profile)
    : DeviceTest(WorldKind::kReal, std::move(profile)) {}

}  // namespace test
