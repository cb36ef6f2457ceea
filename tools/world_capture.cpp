#include "tools/world_capture.h"

#include <algorithm>
#include <stdexcept>

#include "server/capture.h"

namespace tools {
namespace {

struct Heard {
  sim::Micros when{};
  const sim::Frame* frame = nullptr;
};

/// The datagrams with the times that count, in order of these.
std::vector<Heard> Datagrams(const std::vector<sim::Frame>& frames,
                             std::optional<sim::Address> ear) {
  std::vector<Heard> datagrams;
  for (const sim::Frame& frame : frames) {
    if (frame.kind != sim::FrameKind::kDatagram) continue;
    if (!ear) datagrams.push_back({frame.when, &frame});
    for (const sim::Arrival& arrival : frame.arrivals) {
      if (ear == arrival.receiver) datagrams.push_back({arrival.when, &frame});
    }
  }
  std::stable_sort(datagrams.begin(), datagrams.end(),
                   [](const Heard& a, const Heard& b) { return a.when < b.when; });
  return datagrams;
}

server::Peer ToPeer(const sim::Endpoint& endpoint) {
  return {endpoint.address, endpoint.port};
}

}  // namespace

void WriteCapture(const std::filesystem::path& file, const std::vector<sim::Frame>& frames,
                  std::optional<sim::Address> ear) {
  server::CaptureFile capture(file);
  for (const Heard& heard : Datagrams(frames, ear)) {
    const sim::Frame& frame = *heard.frame;
    capture.Add(heard.when, ToPeer(frame.from), ToPeer(frame.to), frame.bytes);
  }
  capture.Flush();
  if (!capture.good()) throw std::runtime_error("cannot write the capture " + file.string());
}

}  // namespace tools
