// A client that has opened its connection and fetches one file.
#pragma once

#include <string>
#include <string_view>

#include "http/client/http_test.h"

namespace test {

inline constexpr auto kGoOn = Step::Then::kGoOn;

inline const std::string kRequest =
    "GET a.bin:1,1 HTTP/1.1\r\n"
    "Host: 2.0.0.10\r\n"
    "User-Agent: UpgradeClient\r\n"
    "Accept: */*\r\n"
    "Connection: Keep-Alive\r\n"
    "Type: 7\r\n"
    "Family: MR7\r\n"
    "Model: MR70\r\n"
    "SerialNum: 123456\r\n"
    "Core-name: 00112233\r\n"
    "Bundle-rx: 0\r\n"
    "HTTP-fallback: 1\r\n"
    "Cache-Control: no-cache\r\n"
    "\r\n";

class GetTest : public HttpTest {
 protected:
  GetTest() {
    client_.SetIdentity({"7", "MR7", "MR70", "123456", "00112233"});
    client_.SetDestination(TEXT("\\a.bin"));
    http::HttpFallback = 1;
    Open(client_);
  }

  bool Get() { return client_.Get(TEXT("/a.bin:1,1")); }

  http::CHTTPClient client_;
};

/// A head whose CRC is not the body's.
inline std::string HeadWithCrc(std::string_view body, const std::string& crc) {
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
         "\r\nContent-CRC32: " + crc + "\r\n\r\n";
}

}  // namespace test
