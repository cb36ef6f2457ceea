// The files of a folder that is to be published.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace tools {

struct InputFile {
  std::filesystem::path path;
  std::string relative;  ///< below the folder, with "/" between folders
};

/// All files below `folder`, in the order of their names: the same on every machine. Throws Failure
/// kBadInput when it is no folder, or holds what is neither folder nor regular file.
[[nodiscard]] std::vector<InputFile> FindInputFiles(const std::filesystem::path& folder);

}  // namespace tools
