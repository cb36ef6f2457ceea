#include "http/request.h"

#include "base/format.h"
#include "base/text.h"
#include "http/texts.h"

namespace http {

std::size_t FormatRequest(char* out, std::size_t capacity, const char* path, const char* host,
                          const Identity& identity, const Counters& counters) noexcept {
  return base::Format(out, capacity, texts::kRequest, path, host, identity.type, identity.family,
                      identity.model, identity.serial_number, identity.core_name,
                      static_cast<std::int32_t>(counters.bundle_rx),
                      static_cast<std::int32_t>(counters.http_fallback));
}

std::size_t FormatReport(char* out, std::size_t capacity, const char* core_name,
                         const Counters& counters, const char* error_text) noexcept {
  const bool failed = !base::View(error_text).empty();
  return base::Format(
      out, capacity, texts::kReport, core_name, static_cast<std::int32_t>(counters.bundle_rx),
      static_cast<std::int32_t>(counters.http_fallback), failed ? texts::kReportError : "",
      failed ? error_text : "", failed ? texts::kLineEnd : "");
}

}  // namespace http
