#include "server/multicast_driver.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <asio/buffer.hpp>
#include <asio/io_context.hpp>
#include <asio/ip/multicast.hpp>
#include <asio/ip/udp.hpp>
#include <asio/steady_timer.hpp>
#include <chrono>
#include <stdexcept>
#include <string>
#include <system_error>

#include "server/model_client.h"
#include "server/multicast_script.h"
#include "server/scratch_folder.h"

namespace server {
namespace {

using asio::ip::udp;
using test::ModelClient;

constexpr char kName[] = "\\Temp\\driven.bin";

/// A client on a socket of this machine, which answers from 127.0.0.1.
class SocketClient {
 public:
  explicit SocketClient(asio::io_context& loop)
      : socket_(loop, udp::endpoint(asio::ip::address_v4::any(), 0)),
        client_(
            [this](const std::string& bytes) { socket_.send_to(asio::buffer(bytes), server_); }) {
    // All groups that a test uses are joined at once: the model sorts them.
    const auto interface = asio::ip::address_v4::loopback();
    for (const std::uint32_t group : {kPublic.address, kPrivate.address}) {
      socket_.set_option(asio::ip::multicast::join_group(asio::ip::address_v4(group), interface));
    }
    Receive();
  }

  [[nodiscard]] std::uint16_t port() const { return socket_.local_endpoint().port(); }
  [[nodiscard]] ModelClient& client() { return client_; }
  [[nodiscard]] const udp::endpoint& server() const { return server_; }
  void Close() { socket_.close(); }

 private:
  void Receive() {
    socket_.async_receive_from(
        asio::buffer(buffer_), from_, [this](const asio::error_code& error, std::size_t size) {
          if (error) return;
          server_ = from_;
          client_.OnDatagram({from_.address().to_v4().to_uint(), from_.port()}, kPublic,
                             {buffer_.data(), size}, NowMicros());
          Receive();
        });
  }

  udp::socket socket_;
  udp::endpoint from_;
  udp::endpoint server_;
  std::array<char, 65536> buffer_{};
  ModelClient client_;
};

class MulticastDriverThreadsTest : public ::testing::Test {
 protected:
  MulticastOptions OptionsFor(std::uint16_t public_port) {
    MulticastOptions options;
    options.public_group = {kPublic.address, public_port};
    options.private_group = kPrivate.address;
    options.start.expected = 1;
    options.announce_interval = std::chrono::milliseconds(100);
    return options;
  }
  static MulticastSocketOptions Own() {
    MulticastSocketOptions options;
    options.address = "127.0.0.2";
    options.loop_back = true;
    return options;
  }

  asio::io_context loop_;
};

TEST_F(MulticastDriverThreadsTest, BringsAFileThroughRealSockets) {
  SocketClient device(loop_);
  const std::string content = SomeBytes(2'000'000);
  MulticastRun run(OptionsFor(device.port()), {FileOf(kName, content)});
  MulticastDriver driver(loop_, run, Own());
  EXPECT_EQ(driver.local().address, 0x7F000002U);
  EXPECT_NE(driver.local().port, device.port());
  bool ended = false;
  driver.Start([&] {
    ended = true;
    device.Close();
  });

  loop_.run_for(std::chrono::seconds(60));

  ASSERT_TRUE(ended);
  EXPECT_EQ(run.figures().files[0].Count(DeviceState::kProven), 1U);
  EXPECT_EQ(device.client().files().at(kName), content);
  EXPECT_EQ(device.server().address().to_string(), "127.0.0.2");
  EXPECT_EQ(device.server().port(), driver.local().port);
}

TEST_F(MulticastDriverThreadsTest, EndsByItselfWhenNobodyUnderstandsIt) {
  // The model knows no cipher.
  SocketClient device(loop_);
  MulticastOptions options = OptionsFor(device.port());
  options.encrypt = true;
  options.window = 1;
  options.announce_max = 2;
  options.announce_interval = std::chrono::milliseconds(10);
  options.linger = std::chrono::milliseconds(10);
  MulticastRun run(options, {FileOf(kName, SomeBytes(5000))});
  MulticastDriver driver(loop_, run, Own());
  bool ended = false;
  driver.Start([&] {
    ended = true;
    device.Close();
  });

  loop_.run_for(std::chrono::seconds(60));

  EXPECT_TRUE(ended);
  EXPECT_TRUE(run.figures().files[0].devices.empty());
  EXPECT_EQ(run.figures().files[0].announcements, 2U);
}

TEST_F(MulticastDriverThreadsTest, SurvivesGarbageAndStopsWhenItIsToldTo) {
  SocketClient device(loop_);
  MulticastOptions options = OptionsFor(device.port());
  options.start.expected = 2;  // which do not come
  options.start.longest_wait = std::chrono::hours(1);
  MulticastRun run(options, {FileOf(kName, SomeBytes(5000))});
  MulticastDriver driver(loop_, run, Own());
  bool ended = false;
  driver.Start([&] { ended = true; });
  udp::socket stranger(loop_, udp::endpoint(asio::ip::address_v4::loopback(), 0));
  const udp::endpoint to(asio::ip::address_v4(driver.local().address), driver.local().port);
  for (const std::size_t size : {0U, 1U, 2U, 6U, 100U, 60000U}) {
    stranger.send_to(asio::buffer(std::string(size, '\x55')), to);
  }
  asio::steady_timer soon(loop_, std::chrono::milliseconds(50));
  const std::function<void(const asio::error_code&)> look = [&](const asio::error_code& /*error*/) {
    if (run.figures().garbage < 6) {
      soon.expires_after(std::chrono::milliseconds(10));
      soon.async_wait(look);
      return;
    }
    run.Stop(NowMicros());
    driver.Wake();
    device.Close();
  };
  soon.async_wait(look);

  loop_.run_for(std::chrono::seconds(60));

  EXPECT_TRUE(ended);
  EXPECT_EQ(run.figures().garbage, 6U);
}

TEST_F(MulticastDriverThreadsTest, TakesThePortOfTheServerBeforeIt) {
  const ScratchFolder folder;
  MulticastOptions options = OptionsFor(40000);
  options.session_file = folder.path() / "session";
  std::uint16_t port = 0;
  {
    MulticastRun run(options, {FileOf(kName, SomeBytes(5000))});
    MulticastDriver driver(loop_, run, Own());
    driver.Start(nullptr);
    port = driver.local().port;
    run.Stop(NowMicros());
    driver.Wake();
  }
  MulticastRun run(options, {FileOf(kName, SomeBytes(5000))});
  EXPECT_EQ(run.former_port(), port);
  const MulticastDriver driver(loop_, run, Own());
  EXPECT_EQ(driver.local().port, port);
}

TEST_F(MulticastDriverThreadsTest, SaysWhichStepOfOpeningFailed) {
  MulticastRun run(OptionsFor(40000), {FileOf(kName, SomeBytes(10))});
  MulticastSocketOptions options = Own();
  options.address = "not an address";
  EXPECT_THROW(MulticastDriver(loop_, run, options), std::invalid_argument);
  options.address = "203.0.113.7";  // nobody's
  try {
    const MulticastDriver driver(loop_, run, options);
    FAIL() << "an address that is not this machine's";
  } catch (const std::system_error& error) {
    EXPECT_THAT(error.what(), ::testing::HasSubstr("the address 203.0.113.7:0"));
  }
  options = Own();
  options.port = 40000;
  EXPECT_THROW(MulticastDriver(loop_, run, options), std::invalid_argument);
}

}  // namespace
}  // namespace server
