// What went over the virtual network.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "net/endpoint.h"
#include "world/world.h"

namespace sim {

enum class FrameKind : std::uint8_t {
  kDatagram,
  kConnect,  ///< a TCP connection is asked for
  kAccept,   ///< ... and granted
  kSegment,  ///< bytes of a TCP connection
  kEnd,      ///< the sender has no more of them
  kReset,    ///< the connection is refused or torn down
};

struct Arrival {
  Address receiver = kAnyAddress;
  Micros when{};
};

/// One frame as it was sent, and where it arrives. A datagram to a group can have many arrivals, a
/// lost one has none.
struct Frame {
  FrameKind kind{};
  Micros when{};
  Endpoint from;
  Endpoint to;
  std::string bytes;
  std::vector<Arrival> arrivals;
};

/// One line: "0.001250 udp 10.0.0.1:1025 > 239.0.0.1:4000 512 bytes at 10.0.0.2 0.002250".
[[nodiscard]] std::string ToText(const Frame& frame);

}  // namespace sim
