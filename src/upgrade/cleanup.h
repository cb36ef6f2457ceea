// Making a device ready for new files: ending programs and deleting files.
#pragma once

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Ends the programs of the job's stop list, the first of each name, and then deletes what its
/// delete list names, each in order. What cannot be ended or deleted is passed over without a word.
///
/// Deletes what the job says, the whole device if it says "\". Waits for nothing and calls nobody
/// back. Host's thread before an upgrade, or the upgrade thread.
void CleanUpDevice(const UpgradeConfig& job) noexcept;

/// Deletes a file, or all files of a folder and of the folders below it; folders stay.
///
/// In a folder the files in ROM stay, those of the job's save list (in whatever letter case), and
/// the volumes mounted there, except the flash file store; of the folder itself nothing of that is
/// asked. When an entry of the save list has been lost for want of memory, all files of
/// folders stay.
/// @param path  on the device; null, empty or longer than 259 characters: nothing is done
///
// KEPT ODDITY: a path with a dot anywhere is a file's. A folder "\My.App" is never emptied, whether
// it is named or met below another one.
void DeletePath(const char* path, const UpgradeConfig& job) noexcept;

}  // namespace upgrade
