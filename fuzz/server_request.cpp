// Input: what a stranger sends as a request head. Checks what the server's records and its site
// rely on.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "server/request.h"
#include "server/site.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckShown(const std::string& text, std::size_t limit) {
  Require(text.size() <= limit);
  Require(std::all_of(text.begin(), text.end(),
                      [](char letter) { return letter >= ' ' && letter <= '~'; }));
}

/// A path that passes stays below the folder it begins in.
void CheckPath(std::string_view path) {
  Require(path.find('\\') == std::string_view::npos);
  if (!server::IsSafePath(path)) return;
  Require(path.front() != '/' && path.back() != '/');
  Require(path.find("//") == std::string_view::npos);
  Require(path.find(':') == std::string_view::npos);
  Require(path.find('\0') == std::string_view::npos);
  Require(path != ".." && path.substr(0, 3) != "../");
  Require(path.find("/../") == std::string_view::npos);
  Require(path.size() < 3 || path.substr(path.size() - 3) != "/..");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  const server::Request request = server::ParseRequest(bytes);
  constexpr std::size_t kMax = server::Request::kMaxIdentityText;
  CheckShown(request.identity.type, kMax);
  CheckShown(request.identity.family, kMax);
  CheckShown(request.identity.model, kMax);
  CheckShown(request.identity.serial, kMax);
  CheckShown(request.identity.core_name, kMax);
  CheckShown(request.error, server::Request::kMaxErrorText);
  if (request.kind != server::RequestKind::kReport) Require(request.error.empty());
  if (request.kind != server::RequestKind::kFile) Require(request.path.empty());
  CheckPath(request.path);
  return 0;
}
