#include "storage/host_folder.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <utility>

#include "ce/errors.h"
#include "storage/device_path.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr FileTicks kTicksTo1970 = 116'444'736'000'000'000ULL;

struct CloseDir {
  void operator()(DIR* folder) const { ::closedir(folder); }
};

FileTicks TicksOf(const timespec& time) {
  return kTicksTo1970 + static_cast<FileTicks>(time.tv_sec) * kTicksPerSecond +
         static_cast<FileTicks>(time.tv_nsec / 100);
}

}  // namespace

UniqueFd OpenFolder(int parent, const std::string& name) {
  return UniqueFd(::openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

std::optional<HostEntry> StatEntry(int folder, const std::string& name) {
  struct stat status {};
  if (::fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return std::nullopt;
  if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return std::nullopt;
  return EntryOf(status, name);
}

HostEntry EntryOf(const struct stat& status, const std::string& name) {
  HostEntry entry;
  entry.name = name;
  entry.folder = S_ISDIR(status.st_mode);
  entry.size = entry.folder ? 0 : static_cast<std::uint64_t>(status.st_size);
  entry.device = status.st_dev;
  entry.inode = status.st_ino;
  entry.modified = TicksOf(status.st_mtim);
  return entry;
}

std::vector<std::u16string> ReadNames(int folder) {
  std::vector<std::u16string> names;
  const int fd = ::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return names;
  const std::unique_ptr<DIR, CloseDir> stream(::fdopendir(fd));
  if (stream == nullptr) {
    ::close(fd);
    return names;
  }
  std::u16string name;
  while (const dirent* entry = ::readdir(stream.get())) {
    if (FromHostText(entry->d_name, name) && ValidName(name)) names.push_back(name);
  }
  return names;
}

std::vector<std::u16string> ListNames(int folder) {
  std::vector<std::pair<std::u16string, std::u16string>> keyed;
  for (std::u16string& name : ReadNames(folder)) {
    std::u16string key = FoldCase(name);
    keyed.emplace_back(std::move(key), std::move(name));
  }
  std::sort(keyed.begin(), keyed.end());
  std::vector<std::u16string> names;
  names.reserve(keyed.size());
  for (auto& entry : keyed) names.push_back(std::move(entry.second));
  return names;
}

DWORD ErrorOfErrno(int error) {
  switch (error) {
    case ENOENT: return ERROR_FILE_NOT_FOUND;
    case ENOTDIR: return ERROR_PATH_NOT_FOUND;
    case EACCES:
    case EPERM:
    case EROFS:
    case EISDIR:
    case ELOOP:
    case EINVAL:
    case EEXIST: return ERROR_ACCESS_DENIED;
    case EMFILE:
    case ENFILE: return ERROR_TOO_MANY_OPEN_FILES;
    case ENOSPC:
    case EDQUOT:
    case EFBIG: return ERROR_DISK_FULL;
    case ENOTEMPTY: return ERROR_DIR_NOT_EMPTY;
    case ENAMETOOLONG: return ERROR_FILENAME_EXCED_RANGE;
    case ENOMEM: return ERROR_NOT_ENOUGH_MEMORY;
    case EFAULT: return ERROR_INVALID_PARAMETER;
    default: return ERROR_GEN_FAILURE;
  }
}

}  // namespace sim
