// The fixture of the multicast client's tests: a device at 10.0.0.1 on which a client runs on a
// thread of its own, and a server at 10.0.0.2:7001 that the test plays by hand.
#pragma once

#include <gmock/gmock.h>

#include <chrono>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mcftp/client/frames.h"
#include "net/virtual/virtual_server.h"
#include "support/device_files.h"
#include "support/device_test.h"
// The platform's own names come last.
#include "mcftp/start.h"

namespace test {

inline constexpr sim::Address kDeviceAddress = 0x0A000001;  // 10.0.0.1
inline constexpr sim::Address kServerAddress = 0x0A000002;
inline constexpr sim::Endpoint kServer = {kServerAddress, 7001};
inline constexpr sim::Endpoint kClient = {kDeviceAddress, 7000};
inline constexpr sim::Endpoint kPublicGroup = {0xEF010101, 7000};   // 239.1.1.1
inline constexpr sim::Endpoint kPrivateGroup = {0xEF010102, 7000};  // 239.1.1.2

inline constexpr char kWaiting[] = "Waiting for a Multicast MCFTP Server to announce a file...";

/// The options of most tests.
inline constexpr char kOptions[] = "-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -UP=5655";

/// Every list of what has come is emptied by the look at it.
class MulticastTest : public DeviceTest {
 protected:
  using Lines = std::vector<std::string>;

  MulticastTest();
  ~MulticastTest() override;

  // ---- the client ----

  /// Starts a client and waits until it waits for an announcement. The lines up to there are gone
  /// unless `keep_lines` is set.
  void Start(const std::string& options = kOptions, bool keep_lines = false);
  /// Waits for the client's end. @return the start entry's result.
  std::int32_t End();
  [[nodiscard]] bool has_ended() const;

  /// Log lines that the client has handed to its owner.
  Lines Log();
  /// The lines of "\mcast.log".
  Lines McastLog();
  /// Status datagrams, in hexadecimal up to the name: "01 00 00 27 ... \Temp\a.bin".
  Lines Status();

  /// Before the client starts.
  static void SetSetting(const char* name, std::uint32_t value);

  // ---- the server ----

  /// Sends from the server and lets the client take it.
  void Send(const std::string& frame, const sim::Endpoint& to);
  void ToPublic(const std::string& frame) { Send(frame, kPublicGroup); }
  void ToPrivate(const std::string& frame) { Send(frame, kPrivateGroup); }
  void ToClient(const std::string& frame) { Send(frame, kClient); }
  [[nodiscard]] sim::VirtualPort& server() { return *server_; }
  /// The frames that the server has received, in hexadecimal.
  Lines Frames();

  /// Announces, answers the request with a passive OACK; then the client is in the file's group.
  void Establish(const Offer& offer = {});
  /// The same, and then makes it the ACKing master.
  void EstablishAsMaster(const Offer& offer = {});
  /// Forgets what was logged, sent and shown so far.
  void Forget();

  void Wait(std::chrono::milliseconds time);
  [[nodiscard]] std::chrono::milliseconds Now();

  sim::VirtualNetwork network() { return sim::VirtualNetwork(world()); }
  [[nodiscard]] mcftp::ClientOwner& owner() { return owner_; }
  [[nodiscard]] int stops() const { return stops_; }

 private:
  static void OnLine(void* context, const WCHAR* line);
  static DWORD WINAPI RunClient(void* context);

  mcftp::ClientOwner owner_;
  std::mutex mutex_;
  Lines lines_;
  std::vector<std::string> frames_;
  std::vector<std::string> status_;
  std::string options_;
  std::int32_t result_ = 99;
  int stops_ = 0;
  std::size_t mcast_log_read_ = 0;
  HANDLE thread_ = nullptr;
  std::optional<sim::VirtualPort> server_;
  std::optional<sim::VirtualPort> ui_;
};

}  // namespace test

using test::MulticastTest;  // NOLINT(google-global-names-in-headers)
