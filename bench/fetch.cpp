// Fetches files with the product's own HTTP client, as the upgrade thread does: real sockets, real
// files on a simulated device, CRC-32 of each. Prints one JSON line of figures.
//
//   bench_fetch DEVICE_FOLDER http://127.0.0.2:PORT SOURCE COUNT [skip]
//
// SOURCE may hold a %d, which is replaced by 1 to COUNT. With "skip" the pauses of the product are
// noted but not made: after each of them a processor that has been idle starts from cold caches.

#include "process_figures.h"
// The platform's names come after the host's.
#include <coredll.h>

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <string>

#include "device/device.h"
#include "device/wide_text.h"
#include "http/http_client.h"
#include "kernel/kernel.h"
#include "world/world.h"

namespace {

/// @return false when the file did not arrive whole and checked.
bool Fetch(http::CHTTPClient& client, const std::string& url, const std::string& destination) {
  http::UrlText path;
  client.SetDestination(device::WideText<>(destination.c_str()).c_str());
  return client.OpenURL(device::WideText<640>(url.c_str()).c_str(), path) &&
         client.Get(path.c_str());
}

std::string Numbered(std::string text, int number) {
  const std::size_t at = text.find("%d");
  return at == std::string::npos ? text : text.replace(at, 2, std::to_string(number));
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 5 && count != 6) {
    std::fprintf(stderr,
                 "usage: bench_fetch DEVICE_FOLDER http://ADDRESS:PORT SOURCE COUNT [skip]\n");
    return 2;
  }
  const std::filesystem::path folder = arguments[1];
  std::filesystem::create_directories(folder);
  const std::string server = arguments[2];
  const std::string source = arguments[3];
  const int files = std::atoi(arguments[4]);

  sim::Profile profile;
  profile.store_pages = 160000;  // 640,000 KiB: room for the large file
  const auto world = sim::World::MakeReal();
  sim::Device device(*world, profile, folder);
  const sim::AttachedThread host(device);
  if (count == 6) device.kernel().SkipSleeps();
  WSADATA winsock;
  WSAStartup(MAKEWORD(1, 1), &winsock);

  int good = 0;
  const auto start = std::chrono::steady_clock::now();
  {
    http::CHTTPClient client;
    client.SetIdentity({"T", "Q", "52", "MR700123", "TQ52MR700123"});
    for (int i = 1; i <= files; ++i) {
      const std::string path = Numbered(source, i);
      good += Fetch(client, server + "/" + path + ":1,1", Numbered("\\f%d.bin", i)) ? 1 : 0;
    }
  }
  const std::chrono::duration<double> wall = std::chrono::steady_clock::now() - start;
  WSACleanup();

  double slept = 0;
  for (const sim::SleepRecord& sleep : device.kernel().Sleeps()) slept += sleep.length_ms / 1000.0;
  std::printf(
      "{\"files\": %d, \"good\": %d, \"wall_s\": %.6f, \"pauses_s\": %.3f, \"cpu_s\": %.6f, "
      "\"peak_kib\": %ld}\n",
      files, good, wall.count(), slept, bench::ProcessorSeconds(), bench::PeakKib());
  return good == files ? 0 : 1;
}
