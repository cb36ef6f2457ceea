// Writing the firmware that came into the flash driver's store.
#pragma once

namespace upgrade {

/// Gives programs their share of the memory and starts the flash, if there is a store for it, an
/// earlier job's too. Whether it works is the driver's business: it may restart the device before
/// this returns, and a failure does not change the job's outcome.
void FlashOsImage() noexcept;

}  // namespace upgrade
