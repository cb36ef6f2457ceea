// Input: how the bytes are cut (first byte), then what a stranger sends on one connection. Checks
// that every answer is well formed, that a body is exactly as long as its head says, and that
// nothing but files of the bundle is ever sent.
#include <stdlib.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>

#include "server/http_session.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

/// A bundle of two files, with a secret beside it.
class Bundle {
 public:
  Bundle() {
    std::string name = (std::filesystem::temp_directory_path() / "orvenix-fuzz-XXXXXX").string();
    Require(::mkdtemp(name.data()) != nullptr);
    folder_ = name;
    std::filesystem::create_directories(folder_ / "site/dir");
    std::ofstream(folder_ / "site/a") << "aaaa";
    std::ofstream(folder_ / "site/dir/b c") << std::string(600, 'b');
    std::ofstream(folder_ / "secret") << "SECRET";
  }
  ~Bundle() {
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
  }
  Bundle(const Bundle&) = delete;
  Bundle& operator=(const Bundle&) = delete;

  [[nodiscard]] std::filesystem::path site() const { return folder_ / "site"; }

 private:
  std::filesystem::path folder_;
};

/// Reads the answers out of everything that was sent.
void CheckAnswers(std::string_view sent) {
  while (!sent.empty()) {
    Require(sent.substr(0, 9) == "HTTP/1.1 ");
    const std::size_t end = sent.find("\r\n\r\n");
    Require(end != std::string_view::npos);
    const std::string_view head = sent.substr(0, end + 4);
    Require(head.size() < 1400);
    const std::size_t length = head.find("Content-Length: ");
    Require(length != std::string_view::npos);
    const auto body = std::strtoul(std::string(head.substr(length + 16)).c_str(), nullptr, 10);
    if (head.find("200 OK") == std::string_view::npos) Require(body == 0);
    sent.remove_prefix(head.size());
    Require(sent.size() >= body);
    const std::string_view content = sent.substr(0, body);
    Require(content.find_first_not_of("ab") == std::string_view::npos);
    sent.remove_prefix(body);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const Bundle bundle;
  if (size == 0) return 0;
  server::Site site(bundle.site());
  server::DeviceLedger ledger;
  server::SessionOptions options;
  options.max_head = 512;
  options.block_size = 256;
  server::Time now{1};
  server::HttpSession session(site, ledger, options, "10.0.0.1", now);
  std::string_view bytes(reinterpret_cast<const char*>(data) + 1, size - 1);
  const std::size_t piece = data[0] % 64U + 1;
  std::string sent;
  while (!session.closed()) {
    if (!session.output().empty()) {
      const std::size_t count = std::min<std::size_t>(session.output().size(), piece * 8);
      sent += session.output().substr(0, count);
      session.OnSent(count, now);
    } else if (session.deadline() <= now + options.body_pause) {
      now = session.deadline();
      session.OnTime(now);
    } else if (session.wants_input() && !bytes.empty()) {
      session.OnBytes(bytes.substr(0, piece), now);
      bytes.remove_prefix(std::min(piece, bytes.size()));
    } else {
      break;
    }
  }
  session.OnPeerClosed(now);
  Require(session.closed() && session.output().empty());
  CheckAnswers(sent);
  return 0;
}
