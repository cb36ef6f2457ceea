// `orvenix serve`: the upgrade server in the foreground.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>

#include "tools/exit_codes.h"

namespace tools {

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
  bool json = false;
};

/// Serves until it is interrupted (SIGINT, SIGTERM) or the wanted job reports have come, and writes
/// what happens to the standard output: a table of the devices on a terminal, else a line an event,
/// with `json` one JSON object a line. Throws Failure.
ExitCode Serve(const ServeOptions& options);

}  // namespace tools
