// Many devices at once on the upgrade server, over loopback: each makes one connection a file, as
// devices do, and all have one open all the time.
//
//   bench_server_load [devices] [files a device] [bytes a file]
//
// The pause between head and body (50 ms) is part of every fetch; "beyond the pause" is what the
// server adds when it serves everybody.
#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/epoll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <asio/io_context.hpp>
#include <asio/post.hpp>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "server/http_server.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr const char* kAddress = "127.0.0.2";

struct Load {
  unsigned devices = 500;
  unsigned files = 20;
  std::size_t bytes = 256 * 1024;
};

/// One device: the connection it has, and how much of the answer has come.
struct Device {
  int socket = -1;
  unsigned fetched = 0;
  std::size_t head = 0;  ///< bytes of the head; 0 while it is not complete
  std::string start;     ///< of the answer, until the head is complete
  std::size_t got = 0;
  Clock::time_point asked;
};

class Crowd {
 public:
  Crowd(const Load& load, std::uint16_t port) : load_(load), port_(port), devices_(load.devices) {}

  /// Lets all devices fetch all their files. @return whether every byte came.
  bool Run() {
    poll_ = ::epoll_create1(EPOLL_CLOEXEC);
    for (Device& device : devices_) Ask(device);
    std::array<epoll_event, 256> events{};
    while (finished_ < devices_.size() && failed_ == 0) {
      const int ready = ::epoll_wait(poll_, events.data(), static_cast<int>(events.size()), 30000);
      if (ready <= 0) return false;
      for (int i = 0; i < ready; ++i) {
        Receive(*static_cast<Device*>(events[static_cast<std::size_t>(i)].data.ptr));
      }
    }
    ::close(poll_);
    return failed_ == 0;
  }

  [[nodiscard]] std::vector<double> milliseconds() const { return milliseconds_; }

 private:
  void Ask(Device& device) {
    device.socket = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port_);
    ::inet_pton(AF_INET, kAddress, &address.sin_addr);
    device.asked = Clock::now();
    const auto* target = static_cast<const void*>(&address);
    if (::connect(device.socket, static_cast<const sockaddr*>(target), sizeof address) != 0) {
      ++failed_;
      return;
    }
    const std::string request = "GET file.bin:" + std::to_string(device.fetched + 1) +
                                ",1 HTTP/1.1\r\nCore-name: MR" +
                                std::to_string(&device - devices_.data()) + "\r\n\r\n";
    if (::send(device.socket, request.data(), request.size(), MSG_NOSIGNAL) < 0) ++failed_;
    ::fcntl(device.socket, F_SETFL, O_NONBLOCK);
    epoll_event event{};
    event.events = EPOLLIN;
    event.data.ptr = &device;
    ::epoll_ctl(poll_, EPOLL_CTL_ADD, device.socket, &event);
  }

  void Receive(Device& device) {
    const ssize_t got = ::recv(device.socket, block_.data(), block_.size(), 0);
    if (got <= 0) {
      ++failed_;
      return;
    }
    device.got += static_cast<std::size_t>(got);
    if (device.head == 0) {
      device.start.append(block_.data(), static_cast<std::size_t>(got));
      const std::size_t end = device.start.find("\r\n\r\n");
      if (end == std::string::npos) return;
      device.head = end + 4;
    }
    if (device.got < device.head + load_.bytes) return;
    milliseconds_.push_back(
        std::chrono::duration<double, std::milli>(Clock::now() - device.asked).count());
    ::close(device.socket);
    const unsigned fetched = device.fetched + 1;
    device = Device{};
    device.fetched = fetched;
    if (fetched < load_.files) {
      Ask(device);
    } else {
      ++finished_;
    }
  }

  const Load load_;
  const std::uint16_t port_;
  std::vector<Device> devices_;
  std::vector<char> block_ = std::vector<char>(1 << 18);
  int poll_ = -1;
  unsigned failed_ = 0;
  std::size_t finished_ = 0;
  std::vector<double> milliseconds_;
};

double Percentile(std::vector<double>& values, double part) {
  std::sort(values.begin(), values.end());
  return values.at(static_cast<std::size_t>(part * static_cast<double>(values.size() - 1)));
}

double CpuSeconds(int who) {
  rusage usage{};
  ::getrusage(who, &usage);
  const auto seconds = [](const timeval& time) {
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
  };
  return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

long PeakKib() {
  rusage usage{};
  ::getrusage(RUSAGE_SELF, &usage);
  return usage.ru_maxrss;
}

int Measure(const Load& load, const std::filesystem::path& folder) {
  std::ofstream(folder / "file.bin") << std::string(load.bytes, 'x');
  server::RaiseDescriptorLimit();
  server::Site site(folder);
  site.Warm();
  server::DeviceLedger ledger;
  asio::io_context loop;
  server::HttpServerOptions options;
  options.address = kAddress;
  server::HttpServer http(loop, site, ledger, options);
  double server_cpu = 0;
  std::thread serving([&] {
    loop.run();
    server_cpu = CpuSeconds(RUSAGE_THREAD);
  });
  Crowd crowd(load, http.port());
  const auto start = Clock::now();
  const bool whole = crowd.Run();
  const double seconds = std::chrono::duration<double>(Clock::now() - start).count();
  asio::post(loop, [&http] { http.Stop(); });
  serving.join();
  if (!whole) {
    std::fprintf(stderr, "a fetch failed\n");
    return 1;
  }
  std::vector<double> times = crowd.milliseconds();
  const double mib = static_cast<double>(load.bytes) * static_cast<double>(times.size()) / 1048576;
  std::printf("devices at once       %zu of %u\n", http.figures().most_connections, load.devices);
  std::printf("fetches               %zu of %zu bytes\n", times.size(), load.bytes);
  std::printf("seconds               %.2f\n", seconds);
  std::printf("fetches a second      %.0f\n", static_cast<double>(times.size()) / seconds);
  std::printf("MiB a second          %.0f\n", mib / seconds);
  std::printf("beyond the pause      median %.1f ms, 99 of 100 within %.1f ms\n",
              Percentile(times, 0.5) - 50, Percentile(times, 0.99) - 50);
  std::printf("server's processor    %.2f s, %.0f us a fetch\n", server_cpu,
              1e6 * server_cpu / static_cast<double>(times.size()));
  std::printf("peak memory, both     %.1f MiB\n", static_cast<double>(PeakKib()) / 1024);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  Load load;
  if (argc > 1) load.devices = static_cast<unsigned>(std::atoi(argv[1]));
  if (argc > 2) load.files = static_cast<unsigned>(std::atoi(argv[2]));
  if (argc > 3) load.bytes = static_cast<std::size_t>(std::atoll(argv[3]));
  std::string name = (std::filesystem::temp_directory_path() / "orvenix-load-XXXXXX").string();
  if (::mkdtemp(name.data()) == nullptr) return 1;
  const int result = Measure(load, name);
  std::error_code ignored;
  std::filesystem::remove_all(name, ignored);
  return result;
}
