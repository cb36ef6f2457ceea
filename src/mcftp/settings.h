// The client's tuning values, which it keeps in the registry.
#pragma once

#include <cstdint>

namespace mcftp {

/// What the client reads before it runs. The defaults are those of a new device.
struct Settings {
  std::uint32_t load_client = 1;  ///< 0: do not run
  // Read, and no behaviour depends on them.
  std::uint32_t authentication_enabled = 0;
  std::uint32_t authentication_algorithm = 0;
  std::uint32_t compression_enabled = 0;
  std::uint32_t compression_algorithm = 0;

  std::uint32_t encryption_enabled = 0;      ///< until the first frame comes; then it decides
  std::uint32_t encryption_algorithm = 0;    ///< read only; there is one cipher
  std::uint32_t max_session_retries = 8;     ///< read requests for one announcement; 0 sends none
  std::uint32_t receive_timeout_ms = 32000;  ///< for each frame of a file; 0 waits without limit
  std::uint32_t dally_timeout_ms = 5000;     ///< for each frame after the last block; the same
  std::uint32_t overrun_error_messages = 1;  ///< times that each overrun report is sent
  std::uint32_t rx_blocks_before_overrun = 100;  ///< before the check starts, and between reports
  std::uint32_t overrun_percent_threshold = 85;  ///< of the blocks sent so far
  std::uint32_t max_random_backoff = 0;          ///< read only
};

/// Reads the settings from "HKEY_LOCAL_MACHINE\Software\Corvanta\Device Management\MCFTP Client".
/// A device without that key gets it, with every value; one that asks for it there
/// (RestoreFactoryDefaults) gets the defaults back.
///
/// @param settings  receives what could be read; the defaults stand for the rest
/// @return false when something could not be read or written. The first value that is missing, or
///   of another type, ends the reading.
bool LoadSettings(Settings& settings) noexcept;

}  // namespace mcftp
