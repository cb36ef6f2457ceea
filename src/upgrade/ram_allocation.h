// How much memory the flash driver needs for the images of this pass.
#pragma once

#include "upgrade/run.h"

namespace upgrade {

/// Has the flash driver make its store for what the first "RAM:" storage requirement of the job
/// asks for, if there is one. A failure is logged; the first file that goes into the store tries
/// again.
void InitRam(const UpgradeConfig& job) noexcept;

/// Takes the first "RAMAllocSize=" other than 0 among the packages of this pass: shows it, sets the
/// size of the store that the first file makes, and notes that an image for the flash comes.
void ReadRamAllocation(Run& run) noexcept;

}  // namespace upgrade
