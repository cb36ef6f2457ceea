#include "net/virtual/frame.h"

#include <cstdio>

namespace sim {
namespace {

const char* KindName(FrameKind kind) {
  switch (kind) {
    case FrameKind::kDatagram: return "udp";
    case FrameKind::kConnect: return "connect";
    case FrameKind::kAccept: return "accept";
    case FrameKind::kSegment: return "tcp";
    case FrameKind::kEnd: return "end";
    case FrameKind::kReset: return "reset";
  }
  return "";
}

std::string Seconds(Micros time) {
  char text[32];
  const auto micros = static_cast<long long>(time.count());
  std::snprintf(text, sizeof text, "%lld.%06lld", micros / 1000000, micros % 1000000);
  return text;
}

}  // namespace

std::string ToText(const Frame& frame) {
  std::string text = Seconds(frame.when) + ' ' + KindName(frame.kind) + ' ' + ToText(frame.from) +
                     " > " + ToText(frame.to);
  if (frame.kind == FrameKind::kDatagram || frame.kind == FrameKind::kSegment) {
    text += ' ' + std::to_string(frame.bytes.size()) + " bytes";
  }
  if (frame.arrivals.empty()) return text + " lost";
  text += " at";
  for (const Arrival& arrival : frame.arrivals) {
    text += ' ' + ToText(arrival.receiver) + ' ' + Seconds(arrival.when);
  }
  return text;
}

}  // namespace sim
