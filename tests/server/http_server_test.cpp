#include "server/http_server.h"

#include <arpa/inet.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <asio/io_context.hpp>
#include <asio/post.hpp>
#include <future>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "server/scratch_folder.h"

namespace server {
namespace {

using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::StartsWith;

constexpr const char* kAddress = "127.0.0.2";

/// A client with plain blocking calls, as the device makes them.
class Client {
 public:
  explicit Client(std::uint16_t port) : socket_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    ::inet_pton(AF_INET, kAddress, &address.sin_addr);
    const timeval limit{20, 0};  // only so that a broken server cannot hang the test
    ::setsockopt(socket_, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof limit);
    connected_ =
        ::connect(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
  }
  ~Client() { ::close(socket_); }
  Client(const Client&) = delete;
  Client& operator=(const Client&) = delete;

  [[nodiscard]] bool connected() const { return connected_; }

  void Send(std::string_view bytes) const {
    while (!bytes.empty()) {
      const ssize_t sent = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
      if (sent <= 0) return;
      bytes.remove_prefix(static_cast<std::size_t>(sent));
    }
  }
  /// What one recv() gives; empty at the end or on an error.
  [[nodiscard]] std::string ReceiveBlock() const {
    std::string block(65536, '\0');
    const ssize_t got = ::recv(socket_, block.data(), block.size(), 0);
    block.resize(got > 0 ? static_cast<std::size_t>(got) : 0);
    return block;
  }
  struct Answer {
    std::string head;
    std::string body;
  };
  /// An answer whose body has `size` bytes, in however many blocks it came.
  [[nodiscard]] Answer ReceiveAnswer(std::size_t size) const {
    std::string bytes;
    std::size_t end = std::string::npos;
    while (end == std::string::npos || bytes.size() < end + 4 + size) {
      const std::string block = ReceiveBlock();
      if (block.empty()) break;
      bytes += block;
      if (end == std::string::npos) end = bytes.find("\r\n\r\n");
    }
    if (end == std::string::npos) return {bytes, ""};
    return {bytes.substr(0, end + 4), bytes.substr(end + 4)};
  }
  [[nodiscard]] std::string ReceiveAll() const {
    std::string bytes;
    for (std::string block = ReceiveBlock(); !block.empty(); block = ReceiveBlock()) bytes += block;
    return bytes;
  }
  void EndSending() const { ::shutdown(socket_, SHUT_WR); }

 private:
  int socket_;
  bool connected_ = false;
};

class HttpServerThreadsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    scratch_.Write("small.txt", "small");
    scratch_.Write("large.bin", std::string(3'000'000, 'L'));
  }

  void Start(HttpServerOptions options = {}) {
    options.address = kAddress;
    server_ = std::make_unique<HttpServer>(loop_, site_, ledger_, options);
    port_ = server_->port();
    thread_ = std::thread([this] { loop_.run(); });
  }

  /// Lets `action` run in the server's thread and waits for it.
  template <typename Action>
  void InServer(Action action) {
    std::promise<void> done;
    asio::post(loop_, [&] {
      action();
      done.set_value();
    });
    done.get_future().wait();
  }

  void TearDown() override {
    if (!thread_.joinable()) return;
    InServer([this] { server_->Stop(); });
    thread_.join();
  }

  ScratchFolder scratch_;
  Site site_{scratch_.path()};
  DeviceLedger ledger_;
  asio::io_context loop_;
  std::unique_ptr<HttpServer> server_;
  std::uint16_t port_ = 0;
  std::thread thread_;
};

TEST_F(HttpServerThreadsTest, DeliversTheHeadInABlockOfItsOwnAndTheBodyInLaterOnes) {
  HttpServerOptions options;
  options.session.body_pause = std::chrono::seconds(1);  // long enough for this client to read
  Start(options);
  const Client client(port_);

  client.Send("GET small.txt:1,1 HTTP/1.1\r\nCore-name: MR1\r\n\r\n");

  const std::string head = client.ReceiveBlock();
  EXPECT_THAT(head, StartsWith("HTTP/1.1 200 OK\r\nContent-Length: 5\r\n"));
  EXPECT_EQ(head.substr(head.size() - 4), "\r\n\r\n");
  EXPECT_EQ(client.ReceiveBlock(), "small");
}

TEST_F(HttpServerThreadsTest, ServesManyFilesOnOneConnection) {
  Start();
  const Client client(port_);
  for (int i = 0; i < 3; ++i) {
    client.Send("GET large.bin HTTP/1.1\r\n\r\n");
    const Client::Answer answer = client.ReceiveAnswer(3'000'000);
    ASSERT_THAT(answer.head, HasSubstr("Content-Length: 3000000\r\n"));
    ASSERT_TRUE(answer.body == std::string(3'000'000, 'L'));
  }
}

TEST_F(HttpServerThreadsTest, ServesFiveHundredDevicesAtOnce) {
  constexpr int kDevices = 500;
  RaiseDescriptorLimit();
  Start();
  std::vector<std::unique_ptr<Client>> clients;
  for (int i = 0; i < kDevices; ++i) {
    clients.push_back(std::make_unique<Client>(port_));
    ASSERT_TRUE(clients.back()->connected()) << i;
  }
  for (int i = 0; i < kDevices; ++i) {
    clients[i]->Send("GET small.txt HTTP/1.1\r\nCore-name: MR" + std::to_string(i) + "\r\n\r\n");
  }

  for (int i = 0; i < kDevices; ++i) {
    const Client::Answer answer = clients[i]->ReceiveAnswer(5);
    ASSERT_THAT(answer.head, StartsWith("HTTP/1.1 200 OK\r\n")) << i;
    ASSERT_EQ(answer.body, "small") << i;
  }

  InServer([this] {
    EXPECT_EQ(server_->figures().connections, 500U);
    EXPECT_EQ(ledger_.devices().size(), 500U);
  });
}

TEST_F(HttpServerThreadsTest, ClosesAsSoonAsTheDeviceEndsItsSide) {
  Start();
  const Client client(port_);
  client.Send("GET small.txt HTTP/1.1\r\n\r\n");
  EXPECT_EQ(client.ReceiveAnswer(5).body, "small");

  client.EndSending();

  EXPECT_EQ(client.ReceiveBlock(), "") << "the device reads until the server closes";
}

TEST_F(HttpServerThreadsTest, TakesAReportAndSendsNothing) {
  Start();
  const Client client(port_);

  client.Send("GET HTTP/1.1\r\nCore-name: MR1\r\nBundle-transfer: COMPLETE\r\n\r\n");
  client.EndSending();

  EXPECT_EQ(client.ReceiveAll(), "");
  InServer([this] { EXPECT_EQ(ledger_.devices().at("MR1").reports, 1U); });
}

TEST_F(HttpServerThreadsTest, LetsAClientReadTheRefusalOfARequestThatIsTooLong) {
  Start();
  const Client client(port_);

  client.Send(std::string(100'000, 'a'));

  EXPECT_THAT(client.ReceiveAll(), StartsWith("HTTP/1.1 431 Request Header Fields Too Large\r\n"));
}

TEST_F(HttpServerThreadsTest, OutlivesClientsThatVanishAtAnyPoint) {
  Start();
  for (const char* bytes : {"", "GE", "GET large.bin HTTP/1.1\r\n\r\n", "garbage\r\n\r\n"}) {
    for (int i = 0; i < 5; ++i) {
      const Client client(port_);
      client.Send(bytes);
    }
  }
  const Client client(port_);

  client.Send("GET small.txt HTTP/1.1\r\n\r\n");

  EXPECT_THAT(client.ReceiveBlock(), StartsWith("HTTP/1.1 200 OK\r\n"));
}

TEST_F(HttpServerThreadsTest, KeepsServingOthersWhileOneClientReadsNothing) {
  scratch_.Write("huge.bin", std::string(20'000'000, 'H'));
  Start();
  const Client lazy(port_);
  lazy.Send("GET huge.bin HTTP/1.1\r\n\r\n");
  EXPECT_THAT(lazy.ReceiveBlock(), StartsWith("HTTP/1.1 200 OK\r\n"));
  const Client client(port_);

  client.Send("GET large.bin HTTP/1.1\r\n\r\n");

  EXPECT_EQ(client.ReceiveAnswer(3'000'000).body.size(), 3'000'000U);
}

TEST_F(HttpServerThreadsTest, TurnsAwayWhoComesAboveTheLimit) {
  HttpServerOptions options;
  options.max_connections = 2;
  Start(options);
  const Client first(port_);
  const Client second(port_);
  const Client third(port_);

  EXPECT_EQ(third.ReceiveAll(), "");

  first.Send("GET small.txt HTTP/1.1\r\n\r\n");
  EXPECT_THAT(first.ReceiveBlock(), StartsWith("HTTP/1.1 200 OK\r\n"));
  InServer([this] { EXPECT_EQ(server_->figures().turned_away, 1U); });
}

TEST_F(HttpServerThreadsTest, SaysSoWhenItsAddressIsTaken) {
  Start();
  HttpServerOptions options;
  options.address = kAddress;
  options.port = port_;

  EXPECT_THROW(HttpServer(loop_, site_, ledger_, options), std::system_error);
}

}  // namespace
}  // namespace server
