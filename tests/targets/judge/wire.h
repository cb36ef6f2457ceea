// The server of one run, and a record of what it hears.
#pragma once

#include <filesystem>
#include <memory>

#include "targets/judge/scenario.h"

namespace targets {

/// Where devices find it. The network is the run's own.
inline constexpr char kServerAddress[] = "127.0.0.2";
inline constexpr unsigned short kHttpPort = 8080;
inline constexpr unsigned short kSyslogPort = 5140;
inline constexpr unsigned short kGroupPort = 7000;

/// Serves a scenario by HTTP and to a group, and takes syslog lines, all in the thread that calls
/// Serve. Announcing begins when the device's multicast client does. What comes is kept in files of
/// the run's folder wire/:
///   requests-1, ...       what each connection has sent
///   frames-from-server    a frame a line, in hexadecimal; one that repeats the last is left out
///   frames-from-device    all of them, the same
///   syslog                a datagram a line
class WireServer {
 public:
  /// @param run  the run's folder; site/ in it gets the files of the scenario
  WireServer(const Scenario& scenario, const std::filesystem::path& run);
  ~WireServer();
  WireServer(const WireServer&) = delete;
  WireServer& operator=(const WireServer&) = delete;

  /// Serves for a moment.
  void Serve();

 private:
  class Body;
  std::unique_ptr<Body> body_;
};

}  // namespace targets
