#include "trace/trace.h"

#include <cstdio>
#include <utility>

namespace sim {
namespace {

void AppendEscaped(std::string& out, unsigned code) {
  char text[8];
  std::snprintf(text, sizeof text, "\\u%04x", code & 0xFFFFU);
  out += text;
}

/// @return the two characters that JSON has for a plain one, or null.
const char* ShortEscape(unsigned code) {
  switch (code) {
    case '"': return "\\\"";
    case '\\': return "\\\\";
    case '\n': return "\\n";
    case '\r': return "\\r";
    case '\t': return "\\t";
    default: return nullptr;
  }
}

// Everything but printable ASCII is escaped: no encoding to get wrong, and a line stays a line.
void AppendUnit(std::string& out, unsigned code) {
  if (const char* escape = ShortEscape(code)) {
    out += escape;
  } else if (code < 0x20 || code > 0x7E) {
    AppendEscaped(out, code);
  } else {
    out += static_cast<char>(code);
  }
}

}  // namespace

void Trace::SetSink(std::function<void(std::string_view)> sink) {
  const std::lock_guard<std::mutex> guard(mutex_);
  sink_ = std::move(sink);
  on_.store(static_cast<bool>(sink_), std::memory_order_relaxed);
}

void Trace::Write(std::string_view line) {
  const std::lock_guard<std::mutex> guard(mutex_);
  if (sink_) sink_(line);
}

void AppendJsonText(std::string& out, std::string_view text) {
  out += '"';
  for (const char c : text) AppendUnit(out, static_cast<unsigned char>(c));
  out += '"';
}

void AppendJsonText(std::string& out, std::u16string_view text) {
  out += '"';
  for (const char16_t c : text) AppendUnit(out, c);
  out += '"';
}

}  // namespace sim
