// Captures in the format of pcap, which Wireshark and tcpdump read: datagrams as they went over a
// network, real or simulated.
#pragma once

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>

#include "server/moment.h"
#include "server/peer.h"

namespace server {

/// Payload of the largest UDP datagram over IPv4; a longer one is captured up to here.
inline constexpr std::size_t kMaxCapturedPayload = 65507;

/// What a capture of IPv4 packets begins with.
[[nodiscard]] std::string CaptureHeader();

/// One datagram of a capture: its time, an IPv4 header, a UDP header, both with right checksums,
/// and the payload.
/// @param when  since the beginning of 1970, or since whatever moment a virtual world began
[[nodiscard]] std::string CaptureRecord(Micros when, const Peer& from, const Peer& to,
                                        std::string_view payload);

/// Writes a capture file. Not for several threads at once.
class CaptureFile {
 public:
  /// Makes the file, or empties it.
  /// @throws std::runtime_error when it cannot be written
  explicit CaptureFile(const std::filesystem::path& file);

  /// Adds one datagram; see CaptureRecord. Records should come in the order of their times.
  void Add(Micros when, const Peer& from, const Peer& to, std::string_view payload);

  /// Puts everything added so far into the file, for a reader who looks on.
  void Flush() { out_.flush(); }

  /// Whether everything could be written so far.
  [[nodiscard]] bool good() const { return out_.good(); }

 private:
  std::ofstream out_;
};

}  // namespace server
