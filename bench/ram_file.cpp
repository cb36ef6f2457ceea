// Writing and checking a file of 64 MiB in the flash driver's store, beside the same in the object
// store of the device's disk, and what memory the program takes for it beside the store.
//
// Both go through the same class, block by block as a download writes them, and through the
// simulator, whose disk is a folder of this machine and whose flash driver keeps files in memory.
// The driver is told of each block by a request of its own and says so in the kernel's debug
// output, as it must; the claim is that this costs no more than the disk. Times are processor
// times, the best of interleaved rounds: others share the machine.
#include "process_figures.h"
// The platform's names come after the host's.
#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "device/device.h"
#include "memory/memory.h"
#include "support/device_test.h"
// The platform's own names come last.
#include "device/file.h"
#include "device/file_crc.h"
#include "device/flash/ram_file.h"

namespace {

constexpr std::uint32_t kMegabyte = 1U << 20U;
constexpr std::uint32_t kSize = 64 * kMegabyte;
constexpr std::uint32_t kBlock = 4096;
constexpr int kRounds = 7;

void Require(bool holds, const char* what) {
  if (holds) return;
  std::fprintf(stderr, "bench_ram_file: %s\n", what);
  std::exit(1);
}

/// A device with room for the file twice.
class Bench {
 public:
  Bench()
      : world_(sim::World::MakeReal()),
        device_(std::make_unique<sim::Device>(*world_, Roomy(), folder_.path() / "device")),
        host_(std::make_unique<sim::AttachedThread>(*device_)) {}
  ~Bench() {
    device::FreeRAMStore();
    host_.reset();
    device_.reset();
  }
  Bench(const Bench&) = delete;
  Bench& operator=(const Bench&) = delete;

  sim::Device& device() { return *device_; }

 private:
  static sim::Profile Roomy() {
    sim::Profile profile;
    profile.store_pages = 3 * kSize / profile.page_size;
    profile.ram_pages = 3 * kSize / profile.page_size;
    return profile;
  }

  test::TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> host_;
};

std::vector<std::uint8_t> Noise(std::uint32_t size) {
  std::vector<std::uint8_t> noise(size);
  std::uint32_t state = 1;
  for (std::uint8_t& byte : noise) {
    state = state * 1664525U + 1013904223U;
    byte = static_cast<std::uint8_t>(state >> 24U);
  }
  return noise;
}

void Write(device::File& file, const char* name, const std::vector<std::uint8_t>& content) {
  const auto size = static_cast<std::uint32_t>(content.size());
  Require(file.OpenForWriting(name, false, size), "a file cannot be made");
  for (std::uint32_t at = 0; at < size; at += kBlock) {
    Require(file.Write(content.data() + at, std::min(kBlock, size - at)), "a block is refused");
  }
  Require(file.Close(), "a file cannot be closed");
}

void WriteRam(const std::vector<std::uint8_t>& content) {
  device::RAMFile file;
  Write(file, "os.nb0", content);
}
void WriteDisk(const std::vector<std::uint8_t>& content) {
  device::File file;
  Write(file, "\\os.nb0", content);
}
std::uint32_t CheckRam(std::uint32_t size) {
  std::uint32_t crc = 0;
  Require(device::RAMFILECRC32("os.nb0", &crc, size, "RAM:os.nb0") == 0, "no CRC of the store");
  return crc;
}
std::uint32_t CheckDisk() {
  std::uint32_t crc = 0;
  Require(device::FILECRC32("\\os.nb0", &crc) == 0, "no CRC of the disk");
  return crc;
}

void MakeStore() {
  device::SetRAMSize(kSize + 40960);
  Require(device::InitRAMStore(), "there is no store");
}

double SecondsOf(const std::function<void()>& work) {
  const double began = bench::ProcessorSeconds();
  work();
  return bench::ProcessorSeconds() - began;
}

void PrintSpeeds() {
  Bench bench;
  MakeStore();
  const std::vector<std::uint8_t> content = Noise(kSize);
  double best[4] = {1e9, 1e9, 1e9, 1e9};
  for (int round = 0; round < kRounds; ++round) {
    std::uint32_t in_store = 0;
    std::uint32_t on_disk = 0;
    best[0] = std::min(best[0], SecondsOf([&] { WriteRam(content); }));
    best[1] = std::min(best[1], SecondsOf([&] { WriteDisk(content); }));
    best[2] = std::min(best[2], SecondsOf([&] { in_store = CheckRam(kSize); }));
    best[3] = std::min(best[3], SecondsOf([&] { on_disk = CheckDisk(); }));
    Require(in_store == on_disk, "the two files differ");
  }
  const auto print = [](const char* what, double seconds, double disk) {
    std::printf("  %-26s%8.0f MB/s%8.2f\n", what, kSize / 1e6 / seconds, disk / seconds);
  };
  print("writing, store", best[0], best[1]);
  print("writing, disk", best[1], best[1]);
  print("checking, store", best[2], best[3]);
  print("checking, disk", best[3], best[3]);
  print("both, store", best[0] + best[2], best[1] + best[3]);
}

/// The most memory that the program has held for a file of this size, in bytes.
std::uint64_t PeakFor(std::uint32_t size) {
  Bench bench;
  const std::vector<std::uint8_t> content = Noise(size);
  MakeStore();
  WriteRam(content);
  CheckRam(size);
  return bench.device().memory().peak_bytes();
}

}  // namespace

int main() {
  std::printf("files of 64 MiB                speed   times the disk's (target: 1)\n");
  PrintSpeeds();
  std::printf("memory of the program beside the store (target: the same for each)\n");
  for (const std::uint32_t size : {kMegabyte, kSize}) {
    std::printf("  a file of %2u MiB %15llu bytes\n", size / kMegabyte,
                static_cast<unsigned long long>(PeakFor(size)));
  }
  bench::FlushConsole();
  return 0;
}
