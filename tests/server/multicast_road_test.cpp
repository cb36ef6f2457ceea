// A real server whose road goes away while a file is sent: in a network of its own, whose only
// interface is taken down and up again.
#include <gtest/gtest.h>
#include <net/if.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <asio/buffer.hpp>
#include <asio/io_context.hpp>
#include <asio/ip/multicast.hpp>
#include <asio/ip/udp.hpp>
#include <asio/steady_timer.hpp>
#include <cerrno>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "server/model_client.h"
#include "server/multicast_driver.h"
#include "server/multicast_script.h"

namespace server {
namespace {

using asio::ip::udp;
using std::chrono::milliseconds;
using test::ModelClient;

constexpr char kName[] = "\\Temp\\road.bin";

/// @return whether the interface "lo" of this process's network is what it was told to be
bool SetLoopBack(bool up) {
  const int socket = ::socket(AF_INET, SOCK_DGRAM, 0);
  ifreq request{};
  std::strcpy(request.ifr_name, "lo");
  bool good = ::ioctl(socket, SIOCGIFFLAGS, &request) == 0;
  const int flags = request.ifr_flags;
  request.ifr_flags = static_cast<short>(up ? flags | IFF_UP : flags & ~IFF_UP);
  good = good && ::ioctl(socket, SIOCSIFFLAGS, &request) == 0;
  ::close(socket);
  return good;
}

/// A client on a socket of this machine, which answers from 127.0.0.1.
class Device {
 public:
  explicit Device(asio::io_context& loop)
      : socket_(loop, udp::v4()), client_([this](const std::string& bytes) {
          asio::error_code lost;
          socket_.send_to(asio::buffer(bytes), server_, 0, lost);
        }) {
    socket_.set_option(asio::socket_base::reuse_address(true));  // as clients do
    socket_.bind(udp::endpoint(asio::ip::address_v4::any(), 0));
    for (const std::uint32_t group : {kPublic.address, kPrivate.address}) {
      socket_.set_option(asio::ip::multicast::join_group(asio::ip::address_v4(group),
                                                         asio::ip::address_v4::loopback()));
    }
    Receive();
  }

  [[nodiscard]] std::uint16_t port() const { return socket_.local_endpoint().port(); }
  [[nodiscard]] ModelClient& client() { return client_; }
  void Close() { socket_.close(); }

 private:
  void Receive() {
    socket_.async_receive_from(
        asio::buffer(buffer_), server_, [this](const asio::error_code& error, std::size_t size) {
          if (error) return;
          client_.OnDatagram({server_.address().to_v4().to_uint(), server_.port()}, kPublic,
                             {buffer_.data(), size}, NowMicros());
          Receive();
        });
  }

  udp::socket socket_;
  udp::endpoint server_;
  std::array<char, 65536> buffer_{};
  ModelClient client_;
};

/// Tests skip themselves where the system allows no network of one's own.
class MulticastRoadThreadsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    const bool own = ::unshare(CLONE_NEWNET) == 0 || ::unshare(CLONE_NEWUSER | CLONE_NEWNET) == 0;
    if (!own) {
      GTEST_SKIP() << "the system allows no network of one's own: " << std::strerror(errno);
    }
    ASSERT_TRUE(SetLoopBack(true));
    device_ = std::make_unique<Device>(loop_);
    MulticastOptions options;
    options.public_group = {kPublic.address, device_->port()};
    options.private_group = kPrivate.address;
    options.start.expected = 1;
    options.announce_interval = milliseconds(100);
    options.elect_wait = options.nak_wait = milliseconds(20);
    options.silence_limit = milliseconds(300);
    options.linger = milliseconds(10);
    run_ = std::make_unique<MulticastRun>(options, std::vector{FileOf(kName, content_)});
    MulticastSocketOptions socket;
    socket.address = "127.0.0.2";
    socket.loop_back = true;
    driver_ = std::make_unique<MulticastDriver>(loop_, *run_, socket);
    run_->SetListener([this](const MulticastEvent& event) { OnEvent(event); });
  }

  void Run() {
    driver_->Start([this] {
      ended_ = true;
      device_->Close();
    });
    loop_.run_for(std::chrono::seconds(60));
  }
  [[nodiscard]] const FileFigures& Figures() const { return run_->figures().files.front(); }

  const std::string content_ = SomeBytes(400'000);
  std::function<void()> on_master_ = [] {};
  std::function<void()> on_refused_ = [] {};
  asio::io_context loop_;
  std::unique_ptr<Device> device_;
  std::unique_ptr<MulticastRun> run_;
  std::unique_ptr<MulticastDriver> driver_;
  bool ended_ = false;
  int told_ = 0;

 private:
  void OnEvent(const MulticastEvent& event) {
    if (event.kind == MulticastEventKind::kMaster) std::exchange(on_master_, [] {})();
    if (event.kind != MulticastEventKind::kRefused) return;
    ++told_;
    EXPECT_EQ(event.error, ENETUNREACH) << event.detail;
    on_refused_();
  }
};

TEST_F(MulticastRoadThreadsTest, GoesOnWhenTheRoadIsBack) {
  on_master_ = [] { ASSERT_TRUE(SetLoopBack(false)); };
  asio::steady_timer soon(loop_);
  const std::function<void(const asio::error_code&)> look = [&](const asio::error_code& /*error*/) {
    if (run_->figures().refused < 2) {
      soon.expires_after(milliseconds(1));
      soon.async_wait(look);
      return;
    }
    EXPECT_TRUE(SetLoopBack(true));
  };
  on_refused_ = [&] { look({}); };
  Run();

  ASSERT_TRUE(ended_);
  EXPECT_EQ(told_, 1) << "of many refusals the first";
  EXPECT_GE(run_->figures().refused, 2U);
  EXPECT_EQ(Figures().Count(DeviceState::kProven), 1U) << Figures().devices.front().reason;
  EXPECT_EQ(device_->client().files().at(kName), content_);
}

TEST_F(MulticastRoadThreadsTest, EndsWhenTheRoadDoesNotComeBack) {
  on_master_ = [] { ASSERT_TRUE(SetLoopBack(false)); };
  Run();

  ASSERT_TRUE(ended_);
  EXPECT_EQ(told_, 1);
  EXPECT_EQ(Figures().Count(DeviceState::kDead), 1U);
  EXPECT_LT(run_->figures().refused, 1000U) << "a lost road is not tried without a pause";
}

TEST_F(MulticastRoadThreadsTest, OverhearsAServerBesideIt) {
  udp::socket rival(loop_, udp::endpoint(asio::ip::make_address_v4("127.0.0.3"), 7001));
  rival.set_option(asio::ip::multicast::outbound_interface(asio::ip::make_address_v4("127.0.0.3")));
  rival.set_option(asio::ip::multicast::enable_loopback(true));
  MulticastOptions options;
  options.public_group = {kPublic.address, device_->port()};
  MulticastRun other(options, {FileOf("\\Temp\\rival.bin", SomeBytes(10))});
  other.Start({0x7F000003, 7001}, NowMicros());
  const Outgoing* announcement = other.Next(NowMicros());
  ASSERT_NE(announcement, nullptr);
  on_master_ = [&] {
    rival.send_to(asio::buffer(announcement->bytes.data(), announcement->bytes.size()),
                  {asio::ip::address_v4(kPublic.address), device_->port()});
  };
  Run();

  ASSERT_TRUE(ended_);
  EXPECT_EQ(run_->figures().rivals, std::vector<Peer>{(Peer{0x7F000003, 7001})});
}

}  // namespace
}  // namespace server
