// What one datagram costs that reaches a simulated device: the network, the turn of the device's
// thread, select, FIONREAD, recvfrom, and a write to a file. Prints a table of its own.
//
//   bench_deliveries [DEVICES [FRAMES]]
#include <sys/resource.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/winsock.h"
#include "device/device.h"
#include "net/virtual/virtual_server.h"
#include "storage/storage.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace {

constexpr sim::Address kGroup = 0xEF010101;
constexpr std::uint16_t kPort = 7000;
constexpr std::size_t kFrame = 1406;
constexpr std::size_t kHeader = 6;

/// Receives `frames` datagrams and writes what is in them to a file.
std::uint32_t Receive(int frames) {
  ce_WSADATA data{};
  ce_WSAStartup(0x0101, &data);
  const SOCKET socket = ce_socket(CE_AF_INET, CE_SOCK_DGRAM, CE_IPPROTO_UDP);
  ce_sockaddr_in local{};
  local.sin_family = CE_AF_INET;
  local.sin_port = sim::SwapOrder(kPort);
  ce_bind(socket, reinterpret_cast<const ce_sockaddr*>(&local), sizeof local);
  ce_ip_mreq membership{};
  membership.imr_multiaddr.s_addr = sim::SwapOrder(kGroup);
  ce_setsockopt(socket, CE_IPPROTO_IP, CE_IP_ADD_MEMBERSHIP,
                reinterpret_cast<const char*>(&membership), sizeof membership);
  HANDLE file = CreateFileW(TEXT("\\a.bin"), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr);
  std::vector<char> buffer(65536);
  for (int i = 0; i < frames; ++i) {
    ce_fd_set readable{};
    readable.fd_count = 1;
    readable.fd_array[0] = socket;
    const ce_timeval limit{32, 0};
    ce_select(0, &readable, nullptr, nullptr, &limit);
    std::uint32_t pending = 0;
    ce_ioctlsocket(socket, CE_FIONREAD, &pending);
    ce_sockaddr_in from{};
    int from_size = sizeof from;
    const int size = ce_recvfrom(socket, buffer.data(), static_cast<int>(buffer.size()), 0,
                                 reinterpret_cast<ce_sockaddr*>(&from), &from_size);
    if (size < static_cast<int>(kHeader)) break;
    SetFilePointer(file, static_cast<LONG>(i * static_cast<LONG>(kFrame - kHeader)), nullptr,
                   FILE_BEGIN);
    DWORD written = 0;
    WriteFile(file, buffer.data() + kHeader, static_cast<DWORD>(size) - DWORD{kHeader}, &written,
              nullptr);
  }
  CloseHandle(file);
  ce_closesocket(socket);
  ce_WSACleanup();
  return 0;
}

/// @return microseconds of processor time for each datagram that was delivered.
double Measure(sim::ThreadKind kind, int devices, int frames) {
  // In memory where there is such a folder: the disk is not what is measured.
  std::error_code none;
  const bool memory = std::filesystem::is_directory("/dev/shm", none);
  std::string pattern = memory ? "/dev/shm/orvenix-bench-XXXXXX" : "/tmp/orvenix-bench-XXXXXX";
  if (mkdtemp(pattern.data()) == nullptr) return 0;
  double micros = 0;
  {
    const auto world = sim::World::MakeVirtual(1, kind);
    const std::string frame(kFrame, 'x');
    const auto content =
        std::make_shared<const std::string>(static_cast<std::size_t>(frames) * kFrame, 'x');
    std::vector<std::unique_ptr<sim::Device>> fleet;
    for (int i = 0; i < devices; ++i) {
      sim::Profile profile;
      profile.address = sim::ToText(0x0A000101 + static_cast<sim::Address>(i));
      fleet.push_back(
          std::make_unique<sim::Device>(*world, profile, pattern + '/' + std::to_string(i)));
      fleet.back()->storage().ShareContent(content);
    }
    sim::VirtualNetwork network(*world);
    sim::LinkProfile link;
    link.delay = sim::Micros(500);
    link.loss = 0.0;
    network.SetDefaultLink(link);
    sim::VirtualPort server(*world, {0x0AFF0001, 7001},
                            [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {});
    const sim::AttachedThread conductor(*fleet[0]);
    std::vector<sim::SimThread*> threads;
    for (auto& device : fleet) {
      const auto lock = world->Acquire();
      threads.push_back(&world->Spawn(
          *device, "client", [frames] { return Receive(frames); }, false));
    }
    for (int i = 0; i < frames; ++i) {
      network.At(sim::Micros(1000000 + 120 * i), [&] { server.Send({kGroup, kPort}, frame); });
    }
    const std::clock_t began = std::clock();
    auto lock = world->Acquire();
    for (sim::SimThread* thread : threads) {
      world->WaitUntil(lock, {&thread->finished}, std::nullopt,
                       [&] { return thread->state == sim::SimThread::State::kFinished; });
    }
    const double took = static_cast<double>(std::clock() - began) / CLOCKS_PER_SEC;
    micros = took * 1e6 / (static_cast<double>(devices) * frames);
  }
  std::error_code ignored;
  std::filesystem::remove_all(pattern, ignored);
  return micros;
}

}  // namespace

int main(int argc, char** argv) {
  const int devices = argc > 1 ? std::atoi(argv[1]) : 1000;
  const int frames = argc > 2 ? std::atoi(argv[2]) : 500;
  rlimit limit{};
  getrlimit(RLIMIT_NOFILE, &limit);
  limit.rlim_cur = limit.rlim_max;
  setrlimit(RLIMIT_NOFILE, &limit);
  std::printf("%d devices, %d datagrams each, microseconds of processor a datagram\n", devices,
              frames);
  std::printf("  threads of the host  %7.2f\n", Measure(sim::ThreadKind::kHost, devices, frames));
  std::printf("  light threads        %7.2f\n", Measure(sim::ThreadKind::kLight, devices, frames));
  return 0;
}
