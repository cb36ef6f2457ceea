#include "tools/input_files.h"

#include <algorithm>

#include "tools/failure.h"

namespace tools {

namespace fs = std::filesystem;

std::vector<InputFile> FindInputFiles(const fs::path& folder) {
  if (!fs::is_directory(folder)) {
    throw Failure(ExitCode::kBadInput, folder.string(), "is not a folder",
                  "name the folder that holds the files");
  }
  std::vector<InputFile> found;
  for (const fs::directory_entry& entry : fs::recursive_directory_iterator(folder)) {
    if (entry.is_directory() && !entry.is_symlink()) continue;
    if (!entry.is_regular_file() || entry.is_symlink()) {
      throw Failure(ExitCode::kBadInput, entry.path().string(), "is not a regular file",
                    "put a copy of what it stands for in its place");
    }
    found.push_back({entry.path(), entry.path().lexically_relative(folder).generic_string()});
  }
  std::sort(found.begin(), found.end(),
            [](const InputFile& a, const InputFile& b) { return a.relative < b.relative; });
  return found;
}

}  // namespace tools
