// One receiver: the product's own multicast client on a simulated device of the real world.
//
//   bench_multicast_client DEVICE_FOLDER ADDRESS "-A=239.1.1.1 -P=7000"
//
// Receives until the last file; prints one JSON line of figures.

#include "process_figures.h"
// The platform's names come after the host's.
#include <coredll.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <string>

#include "device/device.h"
#include "mcftp/start.h"
#include "world/world.h"

int main(int count, char** arguments) {
  if (count != 4) {
    std::fprintf(stderr, "usage: bench_multicast_client DEVICE_FOLDER ADDRESS COMMAND_LINE\n");
    return 2;
  }
  std::filesystem::create_directories(arguments[1]);
  sim::Profile profile;
  profile.address = arguments[2];
  profile.store_pages = 160000;  // 640,000 KiB: room for the file
  const auto world = sim::World::MakeReal();
  sim::Device device(*world, profile, arguments[1]);
  const sim::AttachedThread host(device);

  std::string line = arguments[3];
  const auto start = std::chrono::steady_clock::now();
  const std::int32_t result = mcftp::StartMulticastClient(line.data());
  const std::chrono::duration<double> wall = std::chrono::steady_clock::now() - start;

  std::printf("{\"result\": %d, \"wall_s\": %.6f, \"cpu_s\": %.6f, \"peak_kib\": %ld}\n", result,
              wall.count(), bench::ProcessorSeconds(), bench::PeakKib());
  return result == 0 ? 0 : 1;
}
