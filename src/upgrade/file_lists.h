// The files that a multicast transfer should have brought: which they are, whether they are right,
// and how the wrong ones come by HTTP.
#pragma once

#include "upgrade/run.h"

namespace upgrade {

/// Adds the files of the multicast list file, if the job has one, to the job's download files. A
/// list file that is not on the device, or not the expected one, is fetched; three failures leave
/// the job's files as they were.
void LoadFileList(Run& run) noexcept;

/// Loads the file list, compares every download file that is for this device with its CRC-32, and
/// fetches those that differ or are missing. A file whose expected CRC is 0 is neither checked nor
/// fetched; a fetched one is not checked again here, because the transfer itself checks. A device
/// without a manufacturer string validates nothing.
void ValidateFiles(Run& run) noexcept;

/// Moves every download file whose name ends in ".rename" to the name without it, unless a file of
/// that name exists.
void ApplyRenames(const UpgradeConfig& job) noexcept;

}  // namespace upgrade
