// `orvenix serve`: the upgrade server in the foreground, by multicast and HTTP from one bundle.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>

#include "tools/exit_codes.h"

namespace tools {

/// The multicast half. What a bundle says is the default of much of it.
struct ServeMulticast {
  bool off = false;
  std::uint32_t expected = 0;  ///< devices; 0: not known
  std::uint32_t minimum = 0;
  std::uint32_t wait_s = 0;  ///< for `minimum`, from a file's first announcement
  bool start_now = false;    ///< as soon as `minimum` devices, or one, have asked
  std::uint32_t rounds = 1;
  std::string rate = "0";  ///< see ParseRate
  std::string network;     ///< an address or interface of this machine; empty: the HTTP one
  int ttl = 1;             ///< networks that a datagram may cross
  bool loop = false;       ///< devices on this machine hear it too
  std::uint32_t window = 64;
  std::optional<std::uint32_t> block_size;  ///< none: the bundle's
  bool encrypt = false;                     ///< whatever the bundle says
  std::filesystem::path session;            ///< where the run is kept; empty: nowhere
  std::filesystem::path pcap;               ///< every datagram, for a packet viewer; empty: none
};

struct ServeOptions {
  std::filesystem::path bundle;        ///< a bundle, its job file, or any folder of files
  std::optional<std::string> address;  ///< none: the bundle's, else 127.0.0.1
  std::optional<std::uint16_t> port;   ///< none: the bundle's, else 8080; 0: any free one
  std::uint32_t pause_ms = 50;         ///< between the head and the body of an answer
  std::optional<std::uint32_t> checkpoint_block_size;
  std::size_t max_connections = 4096;
  std::filesystem::path report;     ///< JSON of all devices at the end; empty: none
  std::uint64_t until_reports = 0;  ///< end after so many job reports; 0: serve on
  bool force = false;               ///< also a bundle whose job has errors
  ServeMulticast multicast;
  bool json = false;
};

/// Serves until it is interrupted (SIGINT, SIGTERM) or the wanted job reports have come, and writes
/// what happens to the standard output: a table of the devices on a terminal, else a line an event,
/// with `json` one JSON object a line. Throws Failure.
ExitCode Serve(const ServeOptions& options);

}  // namespace tools
