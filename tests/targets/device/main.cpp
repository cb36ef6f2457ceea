// The management client as the program of a simulated device, on the host's clock and network.
//
//   target_host DEVICE [HURRY]
//
// DEVICE is the device's folder with its profile, and the library in its storage; HURRY divides the
// pauses that the device makes for its reader. Ends when the client and all threads of the device
// have, or the device wants to restart, with the client's outcome, or with 3 when the device could
// not be made.
#include <charconv>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <exception>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <thread>

#include "device/device.h"
#include "driver/drivers.h"
#include "kernel/kernel.h"
#include "library/library_code.h"
#include "net/network.h"
#include "profile/profile.h"
#include "targets/device/library.h"
#include "targets/host/host.h"
#include "world/world.h"

namespace {

constexpr std::chrono::seconds kThreadsLimit{30};
constexpr std::chrono::milliseconds kPoll{10};
constexpr int kNoDevice = 3;

/// Waits until no thread but the client's is left.
bool AwaitThreads(const sim::Device& device) {
  const auto limit = std::chrono::steady_clock::now() + kThreadsLimit;
  while (device.kernel().LiveThreads() > 1) {
    if (device.drivers().restart_requested()) return true;
    if (std::chrono::steady_clock::now() > limit) return false;
    std::this_thread::sleep_for(kPoll);
  }
  return true;
}

int Run(const std::filesystem::path& folder, std::uint32_t hurry) {
  sim::Profile profile;
  std::string error;
  if (!sim::LoadProfile(folder / "device.profile", profile, error)) throw std::runtime_error(error);
  sim::SetLibraryReader(host::LibraryReader());
  const auto world = sim::World::MakeReal();
  sim::Device device(*world, profile, folder);
  device.kernel().ShortenSleeps(hurry);
  const sim::AttachedThread client(device);
  const host::Outcome outcome = host::RunHost();
  std::printf("datagrams lost: %llu\n",
              static_cast<unsigned long long>(device.network().datagrams_lost()));
  if (!AwaitThreads(device)) throw std::runtime_error("threads of the upgrade do not end");
  return static_cast<int>(outcome);
}

}  // namespace

int main(int argc, char** argv) {
  try {
    if (argc < 2 || argc > 3) throw std::runtime_error("usage: target_host DEVICE [HURRY]");
    std::uint32_t hurry = 1;
    if (argc == 3) std::from_chars(argv[2], argv[2] + std::strlen(argv[2]), hurry);
    return Run(argv[1], hurry);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "target_host: %s\n", error.what());
    return kNoDevice;
  }
}
