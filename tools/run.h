// `orvenix run`: one job on one simulated device, as a management host starts it.
#pragma once

#include <cstdint>
#include <filesystem>

#include "tools/exit_codes.h"

namespace tools {

struct RunOptions {
  std::filesystem::path job;
  std::filesystem::path device;
  std::filesystem::path library;  ///< the configlet; empty: the one that belongs to this program
  std::filesystem::path screens;  ///< folder for a picture of every paint; empty: none
  std::filesystem::path events;   ///< file that gets every event; empty: none
  std::filesystem::path pcap;     ///< capture of the device's datagrams; empty: none
  std::uint32_t timeout_s = 1800;
  bool force = false;     ///< also a job that has errors
  bool callbacks = true;  ///< the host takes statuses itself; false: they go to the message queue
  bool json = false;
};

/// Loads the configlet, walks the job through it on the host's clock and sockets, shows what the
/// device shows, waits until the upgrade's threads have ended, and looks at the files. Throws
/// Failure for everything that keeps the upgrade from starting.
ExitCode Run(const RunOptions& options);

}  // namespace tools
