#include "http/url.h"

#include "base/number.h"
#include "base/text.h"

namespace http {
namespace {

constexpr std::size_t kSchemeLength = 7;

bool IsSlash(base::WideChar c) noexcept {
  return c == '/' || c == '\\';
}

bool IsLetter(base::WideChar c) noexcept {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
}

bool BeginsWithScheme(base::WideView url) noexcept {
  constexpr std::string_view kHttp = "http:";
  if (url.size() < kSchemeLength) return false;
  for (std::size_t i = 0; i < kHttp.size(); ++i) {
    const base::WideChar c = url[i];
    if (c > 0x7F || base::LowerAscii(static_cast<char>(c)) != kHttp[i]) return false;
  }
  return IsSlash(url[5]) && url[6] == url[5];
}

}  // namespace

std::optional<UrlParts> ParseUrl(base::WideView url) noexcept {
  if (!BeginsWithScheme(url)) return std::nullopt;
  const base::WideView rest = base::Part(url, kSchemeLength);
  std::size_t end = 0;  // the separator's place
  std::size_t colon = base::WideView::npos;
  for (; end < rest.size() && !IsSlash(rest[end]); ++end) {
    if (rest[end] == ':') colon = end;
  }
  UrlParts parts;
  parts.path = base::Part(rest, end + 1);
  if (colon != base::WideView::npos) {
    parts.host = base::Part(rest, 0, colon);
    parts.port = static_cast<std::int32_t>(
        base::LeadingNumber<base::WideChar>(base::Part(rest, colon + 1, end - colon - 1)));
  } else {
    // KEPT ODDITY: without a port the host keeps the separator, so it does not resolve, and the
    // port is 0. Jobs always name a port.
    parts.host = base::Part(rest, 0, end + 1);
  }
  return parts;
}

base::WideView FromFirstLetter(base::WideView path) noexcept {
  std::size_t at = 0;
  while (at < path.size() && !IsLetter(path[at])) ++at;
  return base::Part(path, at);
}

}  // namespace http
