// What a multicast run has done, in numbers: for reports and for whoever watches.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "server/moment.h"
#include "server/peer.h"

namespace server {

enum class DeviceState : std::uint8_t {
  kJoined,    ///< asked for the file; not known to have it
  kProven,    ///< has said that it has every block
  kDead,      ///< does not answer any more, or gave the file up
  kReleased,  ///< too slow or too lossy: left to HTTP
};
/// "joined", "proven", "dead", "released"
[[nodiscard]] std::string_view StateName(DeviceState state);

/// One device and one file.
struct DeviceFigures {
  Peer peer;
  DeviceState state = DeviceState::kJoined;
  std::uint8_t role = 0;  ///< given last: 0 passive, 1 acknowledges, 2 names what it lacks
  bool late = false;      ///< asked when blocks were already flowing
  std::string last_heard = "nothing";  ///< "NAK 812", "ACK 7490", "ERROR 64 Overrun:6750:120", ...
  Micros last_heard_at{0};
  std::string reason;           ///< why it is dead or released, for people
  std::uint32_t first_gap = 0;  ///< every block below this one is known to have arrived; 0: unknown
  std::uint64_t requests = 0;
  std::uint64_t acks = 0;
  std::uint64_t naks = 0;
  std::uint64_t overruns = 0;
  Micros round_trip{0};  ///< smoothed; 0: not measured
  double loss = 0;       ///< share of blocks that did not reach it, as far as known
};

enum class FilePhase : std::uint8_t {
  kWaiting,    ///< its turn has not come
  kAnnounced,  ///< devices may ask for it
  kStreaming,  ///< first pass
  kRepairing,  ///< devices are asked what they lack, and get it
  kClosing,    ///< the last blocks, which complete the file on a device
  kLingering,
  kFinished,
};
/// "waiting", "announced", "streaming", "repairing", "closing", "lingering", "finished"
[[nodiscard]] std::string_view PhaseName(FilePhase phase);

/// What went out for one file.
struct SentFrames {
  std::uint64_t first_pass_frames = 0;  ///< blocks sent for the first time
  std::uint64_t repair_frames = 0;      ///< blocks sent again
  std::uint64_t farewell_frames = 0;    ///< a last block once more, which ends the devices' dallies
  std::uint64_t control_frames = 0;     ///< OACK and ERROR
  std::uint64_t frames = 0;             ///< all that was sent for this file
  std::uint64_t wire_bytes = 0;         ///< of all these, Ethernet, IP and UDP headers included
};

/// One file of one round. A server that was started again counts on from what it knows of the one
/// before; announcements and answers are its own.
struct FileFigures : SentFrames {
  std::size_t index = 0;  ///< in the run's list of files
  std::string device_path;
  std::string masks;
  std::uint32_t size = 0;
  std::uint16_t block_size = 0;
  std::uint32_t block_count = 0;
  std::uint32_t transfer_id = 0;
  bool last_file = false;
  std::uint32_t expected = 0;  ///< devices that its start waits for; 0: not known
  FilePhase phase = FilePhase::kWaiting;
  Micros began{0};       ///< first announcement
  Micros data_began{0};  ///< first block; 0: none yet
  Micros ended{0};       ///< last device settled; 0: not yet

  std::uint64_t announcements = 0;
  std::uint64_t acks = 0;
  std::uint64_t naks = 0;
  std::uint64_t errors = 0;

  std::uint32_t window = 0;           ///< blocks that may be in flight now
  Micros round_trip{0};               ///< of the device that sets the pace
  std::deque<DeviceFigures> devices;  ///< in the order in which they asked

  [[nodiscard]] double WirePerByte() const {
    return size == 0 ? 0 : static_cast<double>(wire_bytes) / size;
  }
  [[nodiscard]] std::size_t Count(DeviceState state) const;
};

struct MulticastFigures {
  std::uint32_t round = 1;
  std::size_t current = 0;        ///< index in `files` of the one under way
  std::deque<FileFigures> files;  ///< of all rounds, in the order of their sessions
  std::uint64_t frames_sent = 0;
  std::uint64_t frames_received = 0;
  std::uint64_t wire_bytes = 0;
  std::uint64_t garbage = 0;      ///< received datagrams that are no frame for a server
  std::uint64_t strangers = 0;    ///< frames of nobody who has asked for the file
  std::uint64_t turned_away = 0;  ///< requests beyond the limit of devices
  std::uint64_t not_stored = 0;   ///< times the session file could not be written
  std::uint64_t refused = 0;      ///< datagrams that counted as sent and that the system refused
  std::uint64_t rate = 0;         ///< bits per second allowed; 0: no limit
  /// Other servers that announce on the same group, in the order in which they were heard, so many
  /// at most. What a device says names no file: while there is another server, it may mean that
  /// one's, and "proven" is worth less.
  std::vector<Peer> rivals;
  static constexpr std::size_t kMostRivals = 16;
};

/// Bytes that a datagram of `payload` bytes takes on an Ethernet, in fragments when need be.
[[nodiscard]] constexpr std::uint64_t WireBytes(std::size_t payload) {
  const std::uint64_t ip = payload + 8;
  return ip + (ip + 1479) / 1480 * 34;
}

enum class MulticastEventKind : std::uint8_t {
  kAnnounced,  ///< a file's first announcement has gone out
  kJoined,
  kStarted,  ///< the first block is about to go out
  kMaster,   ///< the device sets the pace now
  kOverrun,
  kRepairing,
  kProven,
  kDead,
  kReleased,
  kFileEnded,
  kRunEnded,
  kRefused,    ///< the system would not send a datagram, for the first time
  kNotStored,  ///< the session file could not be written, for the first time
  kRival,      ///< another server announces on the same group, heard for the first time
};
/// "announced", "joined", "started", "master", "overrun", ...
[[nodiscard]] std::string_view EventName(MulticastEventKind kind);

struct MulticastEvent {
  MulticastEventKind kind{};
  Micros when{};
  const FileFigures* file = nullptr;      ///< null where no file is meant
  const DeviceFigures* device = nullptr;  ///< null where no device is meant
  std::string detail;                     ///< one line more, for people
  int error = 0;                          ///< of kRefused: the system's number for it
};

using MulticastListener = std::function<void(const MulticastEvent&)>;

}  // namespace server
