// Clients on real threads and the host's own sockets.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "mcftp/client/frames.h"
#include "support/device_files.h"
#include "support/device_test.h"

// The platform's names and the host's do not mix: this file is the host's.
namespace test {
std::int32_t RunCountingClient(const std::string& options, std::atomic<int>& lines);
}

namespace {

/// A server on the loopback network that announces an empty last file until it has been asked for.
class Announcer {
 public:
  Announcer(in_addr own, in_addr group, std::uint16_t port, int clients)
      : socket_(socket(AF_INET, SOCK_DGRAM, 0)), clients_(clients) {
    sockaddr_in local{};
    local.sin_family = AF_INET;
    local.sin_addr = own;
    EXPECT_EQ(bind(socket_, reinterpret_cast<sockaddr*>(&local), sizeof local), 0);
    EXPECT_EQ(setsockopt(socket_, IPPROTO_IP, IP_MULTICAST_IF, &own, sizeof own), 0);
    group_.sin_family = AF_INET;
    group_.sin_addr = group;
    group_.sin_port = htons(port);
    thread_ = std::thread([this] { Run(); });
  }
  ~Announcer() {
    thread_.join();
    close(socket_);
  }
  Announcer(const Announcer&) = delete;
  Announcer& operator=(const Announcer&) = delete;

 private:
  void Run() {
    test::Offer offer;
    offer.header = "00 21";
    offer.size = 0;
    offer.name = "\\empty.bin";
    const std::string frame = test::Announcement(offer);
    // A client that has ended can no longer ask: each asks once, and then there is one less.
    for (int round = 0; asked_ < clients_ && round < 1000; ++round) {
      sendto(socket_, frame.data(), frame.size(), 0, reinterpret_cast<sockaddr*>(&group_),
             sizeof group_);
      pollfd file = {socket_, POLLIN, 0};
      while (poll(&file, 1, 20) > 0) {
        char bytes[600];
        if (recv(socket_, bytes, sizeof bytes, 0) > 2 && bytes[1] == 0x11) ++asked_;
      }
    }
  }

  int socket_;
  int clients_;
  int asked_ = 0;
  sockaddr_in group_{};
  std::thread thread_;
};

/// Addresses of this process alone.
struct Addresses {
  std::string group;
  std::string server;
  std::string device;
  std::string neighbour;
};
Addresses Mine() {
  const int number = getpid();
  const std::string middle =
      std::to_string(number / 250 % 250) + "." + std::to_string(number % 250 + 1);
  return {"239.77." + middle, "127.11." + middle, "127.12." + middle, "127.13." + middle};
}

sim::Profile ProfileOf(const std::string& address) {
  sim::Profile profile;
  profile.address = address;
  return profile;
}

class MulticastThreadsTest : public RealDeviceTest {
 protected:
  MulticastThreadsTest() : RealDeviceTest(ProfileOf(Mine().device)) {}
};

TEST_F(MulticastThreadsTest, ClientsOfTwoDevicesRunBesideEachOther) {
  const Addresses mine = Mine();
  const std::string options = "-A=" + mine.group + " -P=7000";
  in_addr server{};
  in_addr group{};
  inet_aton(mine.server.c_str(), &server);
  inet_aton(mine.group.c_str(), &group);
  test::TemporaryFolder folder;
  sim::Device neighbour(world(), ProfileOf(mine.neighbour), folder.path() / "device");
  std::atomic<int> lines{0};
  std::atomic<int> neighbours_lines{0};
  const Announcer announcer(server, group, 7000, 2);

  std::thread other([&] {
    EXPECT_EQ(test::RunProgram(neighbour,
                               [&]() -> std::uint32_t {
                                 return static_cast<std::uint32_t>(
                                     test::RunCountingClient(options, neighbours_lines));
                               }),
              0U);
  });
  EXPECT_EQ(test::RunCountingClient(options, lines), 0);
  other.join();

  EXPECT_GT(lines, 20);
  EXPECT_EQ(lines, neighbours_lines);
  EXPECT_TRUE(test::Exists("\\empty.bin"));
}

}  // namespace
