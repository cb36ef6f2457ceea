// The fixture of the HTTP client's tests: a device at 10.0.0.1 with Windows Sockets started, and a
// scripted server at 10.0.0.2:8080.
#pragma once

#include <gmock/gmock.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "http/client/scripted_server.h"
#include "http/http_client.h"
#include "http/job_client.h"
#include "support/device_test.h"

namespace test {

class HttpTest : public DeviceTest {
 protected:
  static constexpr sim::Address kServerAddress = 0x0A000002;  // 10.0.0.2
  static constexpr std::uint32_t kServerInNetworkOrder = 0x0200000A;
  static constexpr std::uint16_t kPort = 8080;

  explicit HttpTest(const char* device_address = "10.0.0.1");
  ~HttpTest() override;

  /// Connects `client` to the server and forgets the log lines of that.
  void Open(http::CHTTPClient& client, const WCHAR* url = TEXT("http://10.0.0.2:8080/x"));

  /// The lines that the transfer log gained since the last call. A whole request that the server
  /// received, with the line ends around it, shows as "<request>".
  std::vector<std::string> LogLines();
  /// The same as it stands in the file.
  std::string LogText();
  /// What the progress window would show.
  static std::vector<std::string> StatusLines();
  /// What went to the debugger.
  std::string DebugText();

  /// The content of a file on the device, nothing when there is none.
  std::optional<std::string> File(const std::string& name);

  /// Milliseconds that every Sleep since the start asked for.
  std::vector<std::uint32_t> Sleeps();
  std::chrono::milliseconds Now();

  ScriptedServer& server() { return server_; }

 private:
  ScriptedServer server_;
  std::size_t log_read_ = 0;
};

}  // namespace test
