// A program of the device that carries out an upgrade configuration file: a caller of the library
// from outside the management host. `orvenix run --mode client` loads it and plays its user.
#pragma once

#include <cstdint>

extern "C" {

/// What the program has to say about the job that it has loaded.
struct UpgradeClientJob {
  std::int32_t loaded = 0;         ///< what LoadFromFile answered
  std::int32_t packages_seen = 0;  ///< firmware packages in the file
  std::int32_t packages = 0;       ///< those for this device
  std::int32_t downloads = 0;
  std::int32_t multi_pass = 0;
};

/// Loads the configuration file `name` ("\windows\<name>", else "\Flash File Store\<name>") into a
/// job and starts it in upgrade-client mode. Called by a thread of a device.
/// @return whether an upgrade was started.
using StartUpgradeClientFunction = bool(const char16_t* name, UpgradeClientJob* told);
inline constexpr const char* kStartUpgradeClient = "StartUpgradeClient";

}  // extern "C"
