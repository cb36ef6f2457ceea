#include "tools/fleet/fleet_folder.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <string>
#include <system_error>
#include <utility>

namespace fleet {
namespace {

namespace fs = std::filesystem;

constexpr char kPrefix[] = "orvenix-fleet-";
constexpr int kAttempts = 16;

fs::path DefaultParent() {
  // A device's files are small but for what is shared.
  std::error_code none;
  return fs::is_directory("/dev/shm", none) ? fs::path("/dev/shm") : fs::temp_directory_path();
}

/// The folder, locked; -1 when it is somebody's, or no folder of this user.
int Lock(const fs::path& folder) {
  const int file = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (file < 0) return -1;
  struct stat status {};
  const bool own = ::fstat(file, &status) == 0 && status.st_uid == ::geteuid();
  // It may have been removed between its opening and its locking.
  if (own && ::flock(file, LOCK_EX | LOCK_NB) == 0 && ::fstat(file, &status) == 0 &&
      status.st_nlink > 0) {
    return file;
  }
  ::close(file);
  return -1;
}

void RemoveAbandoned(const fs::path& parent) {
  std::error_code error;
  for (fs::directory_iterator at(parent, error), end; !error && at != end; at.increment(error)) {
    if (at->path().filename().string().rfind(kPrefix, 0) != 0) continue;
    const int file = Lock(at->path());
    if (file < 0) continue;
    std::error_code ignored;
    fs::remove_all(at->path(), ignored);
    ::close(file);
  }
}

}  // namespace

FleetFolder::FleetFolder(fs::path parent) {
  if (parent.empty()) parent = DefaultParent();
  RemoveAbandoned(parent);
  for (int attempt = 0; lock_ < 0 && attempt < kAttempts; ++attempt) {
    std::string pattern = (parent / kPrefix).string() + "XXXXXX";
    if (::mkdtemp(pattern.data()) == nullptr) {
      throw std::system_error(errno, std::generic_category(), "no temporary folder");
    }
    // Another fleet may take the new folder for one left behind, as long as it is not locked.
    path_ = pattern;
    lock_ = Lock(path_);
    if (lock_ < 0) ::rmdir(path_.c_str());
  }
  if (lock_ < 0) throw std::system_error(errno, std::generic_category(), "no temporary folder");
}

FleetFolder::~FleetFolder() {
  std::error_code ignored;
  fs::remove_all(path_, ignored);
  ::close(lock_);
}

}  // namespace fleet
