// How much memory the flash driver needs for the images of this pass.
#pragma once

#include "upgrade/run.h"

namespace upgrade {

/// Shows what the first "RAM:" storage requirement of the job asks for, if there is one.
void InitRam(const UpgradeConfig& job) noexcept;

/// Takes the first "RAMAllocSize=" other than 0 among the packages of this pass: shows it, and
/// notes that an image for the flash comes.
void ReadRamAllocation(Run& run) noexcept;

}  // namespace upgrade
