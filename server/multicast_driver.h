// A multicast run on a real socket.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "server/multicast_run.h"
#include "server/peer.h"

namespace asio {
class io_context;
}

namespace server {

struct MulticastSocketOptions {
  /// IPv4 address of the interface that everything leaves by. It must not be a client's: clients
  /// drop what comes from their own address.
  std::string address = "127.0.0.1";
  std::uint16_t port = 0;  ///< 0: any free one but the public port
  int ttl = 1;             ///< networks that datagrams to a group may cross
  bool loop_back = false;  ///< this machine hears what it sends to a group: for tests on it
  /// Sees every datagram that comes and goes, in that order; may be empty.
  std::function<void(const Peer& from, const Peer& to, std::string_view bytes)> tap;
};

struct MulticastSocketFigures {
  std::uint64_t send_errors = 0;  ///< datagrams that the system refused, beyond "wait a moment"
  std::uint64_t waits = 0;        ///< times the socket's buffer was full
};

/// Carries datagrams and deadlines between one UDP socket and its run, in the thread that runs
/// `loop`. Loop and run must outlive the driver. Nothing that arrives ends the loop.
class MulticastDriver {
 public:
  /// Opens the socket. Throws std::system_error whose text says which step failed, and
  /// std::invalid_argument for an address that is none, or a port that is the public one.
  MulticastDriver(asio::io_context& loop, MulticastRun& run, const MulticastSocketOptions& options);
  ~MulticastDriver();
  MulticastDriver(const MulticastDriver&) = delete;
  MulticastDriver& operator=(const MulticastDriver&) = delete;

  /// Begins the run. `ended` is called once, when it has finished and its last frame is out.
  void Start(std::function<void()> ended);
  /// To be called when the run has been told something beside the loop's own events (StartNow,
  /// SetRate, Stop).
  void Wake();
  /// Sends what a run that was stopped has still to say, and closes the socket, so that the loop
  /// runs out of work.
  void Close();

  [[nodiscard]] Peer local() const;
  [[nodiscard]] const MulticastSocketFigures& figures() const;

 private:
  class Socket;
  std::shared_ptr<Socket> socket_;
};

/// The time of a monotonic clock, as runs want it.
[[nodiscard]] Micros NowMicros();

}  // namespace server
