// Upgrade servers in a virtual world.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "net/virtual/virtual_server.h"
#include "server/http_session.h"
#include "server/ledger.h"
#include "server/site.h"
#include "support/device_test.h"
#include "world/world.h"

namespace test {

/// The address that jobs of tests name.
inline constexpr sim::Address kServerAddress = 0x7F000002;
inline constexpr char kServerUrl[] = "http://127.0.0.2";

/// The real server's engine behind a port of the virtual network. Keeps every byte that devices
/// sent, connection by connection.
class UpgradeServer {
 public:
  explicit UpgradeServer(sim::World& world, std::uint16_t port = 80);
  ~UpgradeServer();
  UpgradeServer(const UpgradeServer&) = delete;
  UpgradeServer& operator=(const UpgradeServer&) = delete;

  /// Publishes a file. @return its CRC-32 as jobs write it.
  std::string Put(const std::string& path, std::string_view content);
  void Remove(const std::string& path);

  /// The first `times` connections made from now on are not served but treated by `treat`.
  using Treatment = std::function<std::unique_ptr<sim::StreamProgram>()>;
  void TreatNext(int times, Treatment treat);

  /// What each connection has received, in the order of their making.
  [[nodiscard]] const std::vector<std::string>& received() const { return received_; }
  /// The paths that were asked for, in order, with their counters.
  [[nodiscard]] std::vector<std::string> RequestedPaths() const;
  [[nodiscard]] const server::DeviceLedger& ledger() const { return ledger_; }
  /// The one device that reported; ends the test program when there is none.
  [[nodiscard]] const server::DeviceRecord& Device() const;
  [[nodiscard]] sim::VirtualServer& port() { return *server_; }

 private:
  class Session;
  std::unique_ptr<sim::StreamProgram> Accept(const sim::Endpoint& peer);

  TemporaryFolder folder_;
  server::Site site_;
  server::DeviceLedger ledger_;
  std::vector<std::string> received_;
  int to_treat_ = 0;
  Treatment treat_;
  std::unique_ptr<sim::VirtualServer> server_;
};

/// Says `answer` as soon as anything arrives, in one piece, and then does what it was told.
enum class Afterwards : std::uint8_t { kKeep, kEnd, kReset };
UpgradeServer::Treatment AnswerWith(std::string answer, Afterwards afterwards);

/// The CRC-32 of `content` in unsigned decimal.
std::string CrcText(std::string_view content);

}  // namespace test
