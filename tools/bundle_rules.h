// What devices can take: the limits of the list file, the request and the device's file system.
#pragma once

#include "tools/bundle.h"

namespace tools {

/// Checks what the options say about the whole bundle. Throws Failure kUsage.
void CheckBundleOptions(const BundleOptions& options);

/// Checks one file's record. `from` is the file it is made from, for the message. Throws Failure
/// kBadInput.
void CheckBundleFile(const BundleFile& file, const std::string& from);

/// Checks all records together: no two destinations that a device takes for one, and a total that
/// it can count. Throws Failure kBadInput.
void CheckBundleAsAWhole(const Bundle& bundle);

}  // namespace tools
