// What a server serves for a job, where it lies on this machine.
#pragma once

#include <filesystem>
#include <memory>

#include "server/site.h"

namespace tools {

/// The served folder of a bundle, or any other folder. Throws Failure kBadInput when there is no
/// such folder.
[[nodiscard]] std::filesystem::path ServedFolder(const std::filesystem::path& folder);

/// The folder `named`, or the bundle that the job's file lies in. @return null when nothing is
/// named and the file lies in no bundle.
[[nodiscard]] std::unique_ptr<server::Site> FindServed(const std::filesystem::path& job,
                                                       const std::filesystem::path& named);

}  // namespace tools
