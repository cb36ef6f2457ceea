// The demo's job in a virtual world: as many files of the same sizes, one already right, one
// damaged, from the host's first call to the end of the last thread. The device's time costs
// nothing there, so what is left is what tests pay for a job.
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "device/device.h"
#include "net/virtual/virtual_network.h"
#include "orvenix/configlet.h"
#include "product_support/host.h"
#include "product_support/upgrade_server.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;

constexpr std::size_t kKib = 1024;
constexpr std::size_t kSizes[] = {
    36 * kKib * kKib, 6 * kKib* kKib, 1500 * kKib, 300 * kKib, 12 * kKib, 9 * kKib,
    5 * kKib,         1000,           30,          24,         0};
constexpr std::size_t kRight = 2;    ///< already on the device
constexpr std::size_t kDamaged = 3;  ///< there, with one other byte
constexpr double kTargetSeconds = 2.0;

std::string RandomBytes(std::size_t size, std::uint64_t seed) {
  std::mt19937_64 random(seed);
  std::string bytes;
  bytes.reserve(size + 8);
  while (bytes.size() < size) {
    const std::uint64_t eight = random();
    bytes.append(reinterpret_cast<const char*>(&eight), sizeof eight);
  }
  bytes.resize(size);
  return bytes;
}

struct Files {
  test::HostJob job;
  std::vector<std::string> contents;
};

Files Publish(test::UpgradeServer& server) {
  Files files;
  for (const std::size_t size : kSizes) {
    const std::size_t number = files.contents.size();
    files.contents.push_back(RandomBytes(size, number));
    const std::string name = "file" + std::to_string(number) + ".bin";
    const std::string crc = server.Put(name, files.contents.back());
    files.job.files.push_back({name, "\\Application\\" + name, "*", size == 0 ? "1" : crc});
  }
  return files;
}

bool AllRight(const Files& files) {
  for (std::size_t i = 0; i < files.contents.size(); ++i) {
    if (test::GetFile(files.job.files[i].destination.c_str()) != files.contents[i]) return false;
  }
  return true;
}

}  // namespace

int main() {
  const test::TemporaryFolder folder;
  const auto world = sim::World::MakeVirtual(1);
  sim::Profile profile;
  profile.store_pages = 40000;  // 160,000 KiB
  sim::Device device(*world, profile, folder.path() / "device");
  const sim::AttachedThread host(device, "host");
  sim::VirtualNetwork network(*world);
  test::UpgradeServer server(*world);
  const Files files = Publish(server);
  std::string damaged = files.contents[kDamaged];
  damaged[damaged.size() / 2] ^= 0x55;
  test::PutFile(files.job.files[kRight].destination.c_str(), files.contents[kRight]);
  test::PutFile(files.job.files[kDamaged].destination.c_str(), damaged);

  const auto start = Clock::now();
  const auto device_start = world->now();
  IcfgInitialize();
  test::WalkJob(files.job);
  const bool ended = test::EndJob() == ICFG_OK && test::AwaitEndOfJobs(device);
  const double real = Seconds(Clock::now() - start).count();
  const double virtual_time = Seconds(world->now() - device_start).count();

  const bool good =
      ended && AllRight(files) && server.RequestedPaths().size() == files.contents.size() - 1;
  std::printf(
      "  the demo's job, %zu files: %.2f s for %.1f s of the device's time (target %.1f s)%s\n",
      files.contents.size(), real, virtual_time, kTargetSeconds, good ? "" : "; IT FAILED");
  test::DropKeptJob();
  return good ? 0 : 1;
}
