// `orvenix run`: one job on one simulated device, as a management host starts it.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>

#include "tools/exit_codes.h"

namespace tools {

/// How a job comes into the library.
enum class RunMode : std::uint8_t {
  kConfiglet,  ///< a job file, walked through the configlet by a management host
  kClient,     ///< a configuration file, loaded by a program that starts the upgrade itself
};

struct RunOptions {
  RunMode mode = RunMode::kConfiglet;
  std::filesystem::path job;
  std::filesystem::path device;
  std::filesystem::path served;   ///< bundle or folder to compare files with; empty: the job's own
  std::filesystem::path library;  ///< the configlet; empty: the one that belongs to this program
  std::filesystem::path screens;  ///< folder for a picture of every paint; empty: none
  std::filesystem::path events;   ///< file that gets every event; empty: none
  std::filesystem::path pcap;     ///< capture of the device's datagrams; empty: none
  std::uint32_t timeout_s = 1800;
  bool force = false;     ///< also a job that has errors
  bool callbacks = true;  ///< the host takes statuses itself; false: they go to the message queue
  bool json = false;
  std::uint32_t hurry = 1;  ///< the device's pauses take this part of their time

  // Which start of the device this is; Run counts them itself.
  int pass = 1;
  int passes = 1;
  bool again = false;  ///< not the first one
};

/// Hands the job to the library on the host's clock and sockets, shows what the device shows, waits
/// until the upgrade's threads have ended or the device wants to restart, and looks at the files.
/// A job of several passes is sent once for each: between two of them the device starts anew, in a
/// process of its own, because the library keeps what it knows for as long as its process. Throws
/// Failure for everything that keeps the upgrade from starting.
ExitCode Run(const RunOptions& options);

}  // namespace tools
