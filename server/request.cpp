#include "server/request.h"

#include <algorithm>

#include "base/number.h"
#include "base/text.h"

namespace server {
namespace {

constexpr std::string_view kGet = "GET ";
constexpr std::string_view kVersion = " HTTP/1.1";
constexpr std::string_view kReportLine = "GET HTTP/1.1";

bool IsDigits(std::string_view text) {
  return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
}

std::string_view Trimmed(std::string_view text) {
  const std::size_t first = text.find_first_not_of(" \t");
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

/// Takes the next line off the front of `text`, without its line end.
std::string_view TakeLine(std::string_view& text) {
  const std::size_t end = text.find('\n');
  std::string_view line = text.substr(0, end);
  text = end == std::string_view::npos ? std::string_view{} : text.substr(end + 1);
  if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
  return line;
}

/// Cuts the tail ":attempt,total" off `path`, when it has one.
void TakeSuffix(std::string_view& path, Request& request) {
  const std::size_t colon = path.rfind(':');
  if (colon == std::string_view::npos) return;
  const std::string_view tail = path.substr(colon + 1);
  const std::size_t comma = tail.find(',');
  if (comma == std::string_view::npos) return;
  if (!IsDigits(tail.substr(0, comma)) || !IsDigits(tail.substr(comma + 1))) return;
  request.attempt = base::LeadingNumber(tail.substr(0, comma));
  request.total = base::LeadingNumber(tail.substr(comma + 1));
  path = path.substr(0, colon);
}

/// "POST x HTTP/1.1": a method of capital letters that is not ours.
bool IsOtherMethod(std::string_view line) {
  const std::size_t blank = line.find(' ');
  if (blank == 0 || blank == std::string_view::npos || blank > 16) return false;
  return std::all_of(line.begin(), line.begin() + static_cast<std::ptrdiff_t>(blank),
                     [](char letter) { return letter >= 'A' && letter <= 'Z'; }) &&
         line.rfind(" HTTP/1.") != std::string_view::npos && line.substr(0, blank) != "GET";
}

void ReadRequestLine(std::string_view line, Request& request) {
  if (line == kReportLine) {
    request.kind = RequestKind::kReport;
    return;
  }
  if (IsOtherMethod(line)) {
    request.kind = RequestKind::kBadMethod;
    return;
  }
  const std::size_t end = line.rfind(kVersion);
  if (!base::StartsWith(line, kGet) || end == std::string_view::npos || end < kGet.size()) return;
  std::string_view path = line.substr(kGet.size(), end - kGet.size());
  request.kind = RequestKind::kFile;
  TakeSuffix(path, request);
  request.path = path;
  std::replace(request.path.begin(), request.path.end(), '\\', '/');
}

/// Takes the value when the text is still empty: of several lines of one name the first counts.
void Keep(std::string& field, std::string_view value, std::size_t limit) {
  if (field.empty()) field = Printable(value, limit);
}

void ReadHeader(std::string_view name, std::string_view value, Request& request) {
  const auto is = [name](std::string_view known) { return base::EqualIgnoringCase(name, known); };
  constexpr std::size_t kMax = Request::kMaxIdentityText;
  if (is("Type")) Keep(request.identity.type, value, kMax);
  if (is("Family")) Keep(request.identity.family, value, kMax);
  if (is("Model")) Keep(request.identity.model, value, kMax);
  if (is("SerialNum")) Keep(request.identity.serial, value, kMax);
  if (is("Core-name")) Keep(request.identity.core_name, value, kMax);
  if (is("Bundle-rx") && !request.bundle_rx) request.bundle_rx = base::LeadingNumber(value);
  if (is("HTTP-fallback") && !request.http_fallback) {
    request.http_fallback = base::LeadingNumber(value) != 0;
  }
  if (is("Error")) Keep(request.error, value, Request::kMaxErrorText);
  if (is("Bundle-transfer") && base::EqualIgnoringCase(value, "COMPLETE") &&
      request.kind != RequestKind::kBadMethod) {
    request.kind = RequestKind::kReport;
  }
}

}  // namespace

std::string Printable(std::string_view text, std::size_t limit) {
  std::string shown(text.substr(0, limit));
  std::replace_if(
      shown.begin(), shown.end(), [](char letter) { return letter < ' ' || letter > '~'; }, '?');
  return shown;
}

Request ParseRequest(std::string_view head) {
  Request request;
  ReadRequestLine(TakeLine(head), request);
  while (!head.empty()) {
    const std::string_view line = TakeLine(head);
    const std::size_t colon = line.find(':');
    if (colon == std::string_view::npos) continue;  // a stray line of an error text, or garbage
    ReadHeader(Trimmed(line.substr(0, colon)), Trimmed(line.substr(colon + 1)), request);
  }
  if (request.kind != RequestKind::kReport) request.error.clear();
  if (request.kind != RequestKind::kFile) request.path.clear();
  return request;
}

}  // namespace server
