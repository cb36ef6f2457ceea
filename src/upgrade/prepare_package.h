// A package made ready for the installer.
#pragma once

#include "upgrade/package/package_result.h"

namespace upgrade {

/// Prepares a package so that the installer puts it over an earlier installation without asking
/// anybody: removes the registry key that says that it is installed, and takes the read-only,
/// hidden and system attributes from the files that it will write. Where those lie is the
/// package's choice.
///
/// Time and memory grow with the package's size, never with the counts that it claims.
/// @param cabinet  path of the package; it may hold any bytes
/// @return the result of the last step, which is that of the last file. A key that could not be
///   removed is forgotten by then.
PackageResult PreparePackage(const char* cabinet) noexcept;

}  // namespace upgrade
