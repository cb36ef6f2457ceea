#include "tools/served_files.h"

#include "tools/bundle.h"
#include "tools/failure.h"

namespace tools {

namespace fs = std::filesystem;

fs::path ServedFolder(const fs::path& folder) {
  if (!fs::is_directory(folder)) {
    throw Failure(ExitCode::kBadInput, folder.string(), "there is no such bundle or folder",
                  "name a bundle, or the folder that is served");
  }
  return fs::exists(folder / kBundleManifest) ? folder / kBundleTree : folder;
}

std::unique_ptr<server::Site> FindServed(const fs::path& job, const fs::path& named) {
  if (!named.empty()) return std::make_unique<server::Site>(ServedFolder(named));
  const fs::path beside = job.parent_path().empty() ? fs::path(".") : job.parent_path();
  if (!fs::exists(beside / kBundleManifest)) return nullptr;
  return std::make_unique<server::Site>(beside / kBundleTree);
}

}  // namespace tools
