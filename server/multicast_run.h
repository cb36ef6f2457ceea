// The multicast server without sockets and without a clock.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "server/moment.h"
#include "server/multicast_figures.h"
#include "server/multicast_file.h"
#include "server/multicast_options.h"
#include "server/peer.h"

namespace server {

/// A datagram that wants to go out.
struct Outgoing {
  Peer to;  ///< a group or a device
  std::string_view bytes;
};

/// Sends a list of files to all devices that listen, one after the other, until each device has
/// proved that it has each file it asked for, or is known to be dead or hopeless.
///
/// The driver has ONE socket for everything, bound to one address of the machine: clients believe
/// the sender of the last frame. Its loop:
///
///   Start with the socket's own address and port; then for every event OnDatagram or OnTime, then
///   while (const Outgoing* next = run.Next(now)) send it; set a timer for deadline(now);
///   until finished().
///
/// Whatever arrives is survived. Memory is bounded: by `max_devices` for each file of each round,
/// whose figures are kept for the report, and a few bytes a block of the file under way. One
/// thread.
class MulticastRun {
 public:
  /// Throws std::invalid_argument when Objection() has something against a file, or the options
  /// contradict each other. Takes up the session file when there is one for these files.
  MulticastRun(MulticastOptions options, std::vector<MulticastFile> files);
  ~MulticastRun();
  MulticastRun(const MulticastRun&) = delete;
  MulticastRun& operator=(const MulticastRun&) = delete;

  /// Told of everything that happens, with the figures up to date. Must not call the run.
  void SetListener(MulticastListener listener);

  /// The port of the server whose session file this run has found, before Start; else 0. Devices
  /// that have asked that one ask it again: a driver that can have its port is heard by them.
  [[nodiscard]] std::uint16_t former_port() const;

  /// @param own  where the driver's socket is bound: written into announcements
  void Start(const Peer& own, Micros now);
  void OnDatagram(const Peer& from, std::string_view bytes, Micros now);
  /// A datagram that came to the public group: a driver that listens there lets the run find out
  /// that it is not the only server. Its own are ignored.
  void OnOverheard(const Peer& from, std::string_view bytes, Micros now);
  /// To be called when deadline() is reached; calls before it change nothing.
  void OnTime(Micros now);

  /// The next datagram, which counts as sent; null when there is none now. Valid until the next
  /// call of Next: a driver whose socket is full keeps what it was given and asks for no more.
  [[nodiscard]] const Outgoing* Next(Micros now);
  /// The system has refused a datagram that Next has given; the listener is told of the first.
  void OnRefused(int error, Micros now);
  /// When OnTime, and then Next, want to be called; nothing when only a datagram can change
  /// something.
  [[nodiscard]] std::optional<Micros> deadline(Micros now) const;
  [[nodiscard]] bool finished() const;
  /// Nothing new is said any more; a few datagrams may still be due.
  [[nodiscard]] bool ended() const;

  // While it runs:

  /// Begins the file that is announced with whoever has asked.
  void StartNow(Micros now);
  /// @param bits_per_second  on the wire; 0: no limit
  void SetRate(std::uint64_t bits_per_second, Micros now);
  /// Ends after the datagrams that are due; devices that are not done are reported as they are.
  void Stop(Micros now);

  [[nodiscard]] const MulticastFigures& figures() const;
  [[nodiscard]] const MulticastOptions& options() const;

 private:
  class Body;
  std::unique_ptr<Body> body_;
};

}  // namespace server
