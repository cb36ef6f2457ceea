// Making a device ready for new files: ending programs and deleting files.
#pragma once

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// Ends the programs of the job's stop list, the first of each name, and then deletes what its
/// delete list names, each in order. What cannot be ended or deleted is passed over without a word.
///
/// Deletes what the job says, the whole device if it says "\". Waits for nothing and calls nobody
/// back. Host's thread before an upgrade, or the upgrade thread.
///
// KEPT ODDITY: in the names of programs letter case counts, unlike anywhere else on the device, and
// of several programs of one name only the first is ended.
void CleanUpDevice(const UpgradeConfig& job) noexcept;

/// Deletes a file, or all files of a folder and of the folders below it; folders stay.
///
/// What is met in a folder stays when it is a file in ROM, a file of the job's save list (in
/// whatever letter case) or a volume other than the flash file store. The folder that is named may
/// be any volume. Without memory for the save list, or when an entry of it has been lost for want
/// of memory, all files of folders stay.
/// @param path  on the device; null, empty or longer than 259 characters: nothing is done
///
// KEPT ODDITY: a path with a dot anywhere is a file's. A folder "\My.App" is never emptied, whether
// it is named or met below another one.
// KEPT ODDITY: a file that is named is deleted, also when it is on the save list.
void DeletePath(const char* path, const UpgradeConfig& job) noexcept;

}  // namespace upgrade
