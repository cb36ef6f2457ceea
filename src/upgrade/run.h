// One upgrade under way: what its steps share.
#pragma once

#include <cstdint>

#include "base/text.h"
#include "orvenix/upgrade_config.h"

namespace upgrade {

/// The state of one run of the upgrade thread; every step gets it and no step looks elsewhere.
/// Lives on that thread's stack and is touched by no other.
struct Run {
  explicit Run(UpgradeConfig& the_job) noexcept : job(the_job) {}

  UpgradeConfig& job;
  bool succeeded = true;              ///< the outcome
  base::FixedText<256> error_text;    ///< why it failed, empty when it did not
  std::int32_t pass = 1;              ///< of a job in several passes, from 1
  bool storage_card = false;          ///< a card that has room for the job
  bool os_image = false;              ///< an image for the flash came onto the device
  std::uint32_t fetch_attempt = 1;    ///< number of the next attempt to fetch a file
  std::uint32_t files_to_fetch = 1;   ///< shown by the server beside the attempt
  std::uint32_t validated_bytes = 0;  ///< of files that were right before anything was fetched
};

}  // namespace upgrade
