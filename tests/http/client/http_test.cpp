#include "http/client/http_test.h"

#include <coredll.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "kernel/debug.h"
#include "kernel/kernel.h"
#include "report/window/window_state.h"

namespace test {
namespace {

sim::Profile At(const char* address) {
  sim::Profile profile;
  profile.address = address;
  return profile;
}

std::optional<std::string> Read(const std::filesystem::path& file) {
  std::ifstream stream(file, std::ios::binary);
  if (!stream) return std::nullopt;
  return std::string{std::istreambuf_iterator<char>(stream), {}};
}

}  // namespace

HttpTest::HttpTest(const char* device_address)
    : DeviceTest(At(device_address)), server_(world(), {kServerAddress, kPort}) {
  WSADATA data = {};
  EXPECT_EQ(WSAStartup(MAKEWORD(1, 1), &data), 0);
  http::BundleRx = 0;
  http::HttpFallback = 0;
}

HttpTest::~HttpTest() {
  report::window_state.lines.Clear();  // several tests may run in one process
  WSACleanup();
}

void HttpTest::Open(http::CHTTPClient& client, const WCHAR* url) {
  http::UrlText path;
  ASSERT_TRUE(client.OpenURL(url, path));
  LogText();
}

std::string HttpTest::LogText() {
  const std::string whole = File("FileXfer.log").value_or("");
  const std::string text = whole.substr(std::min(log_read_, whole.size()));
  log_read_ = whole.size();
  return text;
}

std::vector<std::string> HttpTest::LogLines() {
  std::string text = LogText();
  for (const std::string& request : server_.requests()) {
    const std::string logged = "\r\n" + request + "\r\n\r\n";
    const std::size_t at = text.find(logged);
    if (at != std::string::npos) text.replace(at, logged.size(), "<request>\r\n");
  }
  std::vector<std::string> lines;
  for (std::size_t end = 0; (end = text.find("\r\n")) != std::string::npos;) {
    lines.push_back(text.substr(0, end));
    text.erase(0, end + 2);
  }
  if (!text.empty()) lines.push_back(text + "<no line end>");
  return lines;
}

std::vector<std::string> HttpTest::StatusLines() {
  std::vector<std::string> lines;
  report::LineList::Line line;
  for (int i = 0; report::window_state.lines.Copy(i, line); ++i) {
    lines.emplace_back(line.view().begin(), line.view().end());
  }
  return lines;
}

std::string HttpTest::DebugText() {
  return device().debug().OutputText();
}

std::optional<std::string> HttpTest::File(const std::string& name) {
  return Read(device().folder() / "storage" / name);
}

std::vector<std::uint32_t> HttpTest::Sleeps() {
  std::vector<std::uint32_t> lengths;
  for (const sim::SleepRecord& record : device().kernel().Sleeps()) {
    lengths.push_back(record.length_ms);
  }
  return lengths;
}

std::chrono::milliseconds HttpTest::Now() {
  return std::chrono::duration_cast<std::chrono::milliseconds>(world().now());
}

}  // namespace test
