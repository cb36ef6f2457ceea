#include "targets/judge/wire.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <array>
#include <asio/buffer.hpp>
#include <asio/io_context.hpp>
#include <asio/ip/udp.hpp>
#include <chrono>
#include <string>
#include <utility>

#include "server/http_server.h"
#include "server/ledger.h"
#include "server/multicast_driver.h"
#include "server/multicast_run.h"
#include "server/site.h"
#include "targets/judge/files.h"

namespace targets {
namespace {

namespace fs = std::filesystem;
using asio::ip::udp;

constexpr std::chrono::milliseconds kMoment{20};
/// Longer than a device may need to take the head, so that it always comes alone.
constexpr std::chrono::milliseconds kBodyPause{200};
constexpr std::uint32_t kFirstTransfer = 0x01020304;
/// Of all files; a device gives it to what it has received.
constexpr char kTimeStamp[] = "2006-03-01 14:05:08";
constexpr std::time_t kTime = 1141221908;  // the same

std::string Hexadecimal(std::string_view bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    text += {kDigits[byte >> 4U], kDigits[byte & 0xFU]};
  }
  return text;
}

fs::path PutSite(const Scenario& scenario, const fs::path& site) {
  fs::create_directories(site);
  for (const auto& [name, content] : scenario.site) {
    WriteFile(site / name, content);
    const timespec times[] = {{kTime, 0}, {kTime, 0}};
    ::utimensat(AT_FDCWD, (site / name).c_str(), times, 0);
  }
  return site;
}

/// One block on its way at a time, and nobody is ever asked twice, so that the same frames go in
/// the same order whatever the machine is busy with.
server::MulticastOptions Deliberately() {
  constexpr std::chrono::seconds kLong{20};
  server::MulticastOptions options;
  options.public_group.port = kGroupPort;
  options.start.expected = 1;
  options.announce_interval = std::chrono::milliseconds(1200);
  options.announce_max = 3;  // of a file that nobody wants
  options.window = 1;
  options.ack_wait = options.ack_wait_min = options.ack_wait_max = kLong;
  options.elect_wait = options.nak_wait = kLong;
  options.silence_limit = 2 * kLong;
  options.first_transfer_id = kFirstTransfer;
  options.seed = 1;
  return options;
}

std::vector<server::MulticastFile> FilesOf(const Scenario& scenario) {
  std::vector<server::MulticastFile> files;
  for (const SentFile& sent : scenario.sent) {
    server::MulticastFile file;
    file.device_path = sent.device_path;
    file.masks = sent.masks;
    file.time_stamp = kTimeStamp;
    file.content = server::MemoryContent(sent.content);
    files.push_back(std::move(file));
  }
  return files;
}

}  // namespace

class WireServer::Body {
 public:
  Body(const Scenario& scenario, const fs::path& run)
      : record_(run / "wire"),
        client_log_(run / "device/storage/mcast.log"),
        site_(PutSite(scenario, run / "site")),
        syslog_(loop_) {
    server::HttpServerOptions http;
    http.address = kServerAddress;
    http.port = kHttpPort;
    http.session.body_pause = kBodyPause;
    http.tap = [this](std::uint64_t connection, std::string_view bytes) {
      AppendFile(record_ / ("requests-" + std::to_string(connection)), bytes);
    };
    site_.Warm();
    http_ = std::make_unique<server::HttpServer>(loop_, site_, ledger_, std::move(http));
    syslog_.open(udp::v4());
    syslog_.bind({asio::ip::make_address(kServerAddress), kSyslogPort});
    TakeSyslog();
    if (!scenario.sent.empty()) PrepareMulticast(scenario);
  }

  void Serve() {
    if (driver_ != nullptr && !is_announcing_ && DeviceListens()) {
      is_announcing_ = true;
      driver_->Start([] {});
    }
    loop_.run_for(kMoment);
  }

 private:
  /// The device's multicast client tells how far it has come.
  [[nodiscard]] bool DeviceListens() const {
    return fs::exists(client_log_) &&
           ReadFile(client_log_).find("State machine thread created") != std::string::npos;
  }

  void TakeSyslog() {
    syslog_.async_receive(asio::buffer(line_),
                          [this](const asio::error_code& error, std::size_t size) {
                            if (error) return;
                            AppendFile(record_ / "syslog", std::string(line_.data(), size) + "\n");
                            TakeSyslog();
                          });
  }

  void PrepareMulticast(const Scenario& scenario) {
    run_ = std::make_unique<server::MulticastRun>(Deliberately(), FilesOf(scenario));
    server::MulticastSocketOptions socket;
    socket.address = kServerAddress;
    socket.port = kGroupPort + 1;
    socket.loop_back = true;
    socket.tap = [this](const server::Peer& from, const server::Peer& /*to*/,
                        std::string_view bytes) { OnFrame(from, Hexadecimal(bytes)); };
    driver_ = std::make_unique<server::MulticastDriver>(loop_, *run_, socket);
  }

  void OnFrame(const server::Peer& from, const std::string& frame) {
    if (from != driver_->local()) return AppendFile(record_ / "frames-from-device", frame + "\n");
    // An announcement is repeated until somebody asks, however long that takes.
    if (std::exchange(last_frame_, frame) == frame) return;
    AppendFile(record_ / "frames-from-server", frame + "\n");
  }

  const fs::path record_;
  const fs::path client_log_;
  asio::io_context loop_;
  server::Site site_;
  server::DeviceLedger ledger_;
  std::unique_ptr<server::HttpServer> http_;
  udp::socket syslog_;
  std::array<char, 4096> line_{};
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<server::MulticastDriver> driver_;
  bool is_announcing_ = false;
  std::string last_frame_;
};

WireServer::WireServer(const Scenario& scenario, const fs::path& run)
    : body_(std::make_unique<Body>(scenario, run)) {}
WireServer::~WireServer() = default;

void WireServer::Serve() {
  body_->Serve();
}

}  // namespace targets
