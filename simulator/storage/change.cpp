// Deleting, moving and copying files; making and removing folders.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "storage/host_text.h"
#include "storage/storage.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr DWORD kFixed = FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_INROM;
constexpr DWORD kProtected =
    FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;

/// Renames without ever replacing, also when another program of the host makes the name meanwhile.
bool RenameOnHost(const Location& from, const std::string& name, const Location& to,
                  const std::string& new_name) {
  if (::renameat2(from.folder, name.c_str(), to.folder, new_name.c_str(), RENAME_NOREPLACE) == 0) {
    return true;
  }
  // Some file systems do not know the flag; the caller has looked whether the name is free.
  if (errno != EINVAL && errno != ENOSYS) return false;
  return ::renameat(from.folder, name.c_str(), to.folder, new_name.c_str()) == 0;
}

bool CopyBytes(int from, int to) {
  std::array<char, 65536> part;
  for (;;) {
    const ssize_t got = ::read(from, part.data(), part.size());
    if (got == 0) return true;
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 || !WriteAll(to, {part.data(), static_cast<std::size_t>(got)})) return false;
  }
}

/// The error of naming something that has to be a file. @return 0 for a file.
DWORD CheckFile(const Location& location) {
  if (location.volume_root) return ERROR_ACCESS_DENIED;
  if (!location.entry) return ERROR_FILE_NOT_FOUND;
  return location.entry->folder ? ERROR_ACCESS_DENIED : ERROR_SUCCESS;
}

}  // namespace

DWORD Storage::Delete(const WCHAR* name) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(name, location); error != ERROR_SUCCESS) return error;
  if (const DWORD error = CheckFile(location); error != ERROR_SUCCESS) return error;
  if ((RecordOf(location).attributes & kFixed) != 0) return ERROR_ACCESS_DENIED;
  return Unlink(location);
}

DWORD Storage::Unlink(const Location& location) {
  if (FindNode(*location.entry) != nullptr) return ERROR_SHARING_VIOLATION;
  if (::unlinkat(location.folder, location.entry->name.c_str(), 0) != 0) {
    return ErrorOfErrno(errno);
  }
  parked_.Forget(location.entry->device, location.entry->inode);
  shared_parts_.erase({location.entry->device, location.entry->inode});
  location.volume->space().Release(location.entry->size);
  records_->Erase(location.path());
  return ERROR_SUCCESS;
}

// ---- folders ----

DWORD Storage::CreateFolder(const WCHAR* name) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(name, location); error != ERROR_SUCCESS) return error;
  // The name of a card that is not in the device stays the card's.
  if (!location.volume->present()) return ERROR_ACCESS_DENIED;
  if (location.volume_root || location.entry) return ERROR_ALREADY_EXISTS;
  if (::mkdirat(location.folder, ToHostText(location.leaf).c_str(), 0755) != 0) {
    return ErrorOfErrno(errno);
  }
  const FileTicks now = SystemTicks(device_);
  records_->Set(location.path(), {0, now, now, now});
  return ERROR_SUCCESS;
}

DWORD Storage::RemoveFolder(const WCHAR* name) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(name, location); error != ERROR_SUCCESS) return error;
  if (location.volume_root) return ERROR_ACCESS_DENIED;
  if (!location.entry) return ERROR_FILE_NOT_FOUND;
  if (!location.entry->folder) return ERROR_PATH_NOT_FOUND;
  if ((RecordOf(location).attributes & kFixed) != 0) return ERROR_ACCESS_DENIED;
  if (::unlinkat(location.folder, location.entry->name.c_str(), AT_REMOVEDIR) != 0) {
    return errno == EEXIST ? ERROR_DIR_NOT_EMPTY : ErrorOfErrno(errno);
  }
  records_->Erase(location.path());
  return ERROR_SUCCESS;
}

// ---- moving ----

DWORD Storage::CheckMove(const Location& from, const Location& to) const {
  if (from.volume_root) return ERROR_ACCESS_DENIED;
  if (!from.entry) return ERROR_FILE_NOT_FOUND;
  if (to.volume_root) return to.volume->present() ? ERROR_ALREADY_EXISTS : ERROR_ACCESS_DENIED;
  if (to.entry) {
    // A change of letter case is the one case in which the new name may be taken.
    const bool itself = to.entry->device == from.entry->device &&
                        to.entry->inode == from.entry->inode &&
                        to.entry->name != ToHostText(to.leaf);
    if (!itself) return ERROR_ALREADY_EXISTS;
  }
  if (to.closed && !from.entry->folder) return ERROR_PATH_NOT_FOUND;
  if ((RecordOf(from).attributes & FILE_ATTRIBUTE_INROM) != 0) return ERROR_ACCESS_DENIED;
  const bool open = from.entry->folder ? OpenBelow(from.path()) : FindNode(*from.entry) != nullptr;
  if (open) return ERROR_SHARING_VIOLATION;
  if (from.volume != to.volume && from.entry->folder) return ERROR_NOT_SAME_DEVICE;
  return ERROR_SUCCESS;
}

DWORD Storage::Move(const WCHAR* from_name, const WCHAR* to_name) {
  const Hold hold(mutex_);
  Location from;
  Location to;
  if (const DWORD error = Locate(from_name, from); error != ERROR_SUCCESS) return error;
  if (const DWORD error = Locate(to_name, to); error != ERROR_SUCCESS) return error;
  if (const DWORD error = CheckMove(from, to); error != ERROR_SUCCESS) return error;
  if (from.volume != to.volume) {
    if ((RecordOf(from).attributes & kFixed) != 0) return ERROR_ACCESS_DENIED;
    const DWORD error = CopyTo(from, to);
    return error == ERROR_SUCCESS ? Unlink(from) : error;
  }
  const std::string old_path = from.path();
  to.entry.reset();
  if (!RenameOnHost(from, from.entry->name, to, ToHostText(to.leaf))) return ErrorOfErrno(errno);
  records_->Rename(old_path, to.path());
  return ERROR_SUCCESS;
}

// ---- copying ----

DWORD Storage::CheckCopy(const Location& from, const Location& to, bool fail_if_exists) const {
  if (const DWORD error = CheckFile(from); error != ERROR_SUCCESS) return error;
  const std::shared_ptr<FileNode> source = FindNode(*from.entry);
  if (source != nullptr && (source->bar_reading != 0 || source->writers != 0)) {
    return ERROR_SHARING_VIOLATION;
  }
  if (to.volume_root) return ERROR_ACCESS_DENIED;
  if (to.closed) return ERROR_PATH_NOT_FOUND;
  if (!to.entry) return ERROR_SUCCESS;
  if (to.entry->folder) return ERROR_ACCESS_DENIED;
  if (fail_if_exists) return ERROR_FILE_EXISTS;
  if ((RecordOf(to).attributes & kProtected) != 0) return ERROR_ACCESS_DENIED;
  const bool itself =
      to.entry->device == from.entry->device && to.entry->inode == from.entry->inode;
  return itself || FindNode(*to.entry) != nullptr ? ERROR_SHARING_VIOLATION : ERROR_SUCCESS;
}

DWORD Storage::Copy(const WCHAR* from_name, const WCHAR* to_name, bool fail_if_exists) {
  const Hold hold(mutex_);
  Location from;
  Location to;
  if (const DWORD error = Locate(from_name, from); error != ERROR_SUCCESS) return error;
  if (const DWORD error = Locate(to_name, to); error != ERROR_SUCCESS) return error;
  const DWORD error = CheckCopy(from, to, fail_if_exists);
  return error == ERROR_SUCCESS ? CopyTo(from, to) : error;
}

DWORD Storage::CopyTo(const Location& from, Location& to) {
  const FileRecord source = RecordOf(from);
  const std::uint64_t replaced = to.entry ? to.entry->size : 0;
  Space& space = to.volume->space();
  if (!space.Exchange(replaced, from.entry->size)) return ERROR_DISK_FULL;
  const std::string name = to.entry ? to.entry->name : ToHostText(to.leaf);
  constexpr int kSafe = O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;
  PutSharedParts(from);
  if (to.entry) shared_parts_.erase({to.entry->device, to.entry->inode});
  const UniqueFd in(::openat(from.folder, from.entry->name.c_str(), O_RDONLY | kSafe));
  const int how = to.entry ? O_WRONLY | O_TRUNC | kSafe : O_WRONLY | O_CREAT | O_EXCL | kSafe;
  const UniqueFd out(in ? ::openat(to.folder, name.c_str(), how, 0644) : -1);
  if (!out) {
    const DWORD error = ErrorOfErrno(errno);
    static_cast<void>(space.Exchange(from.entry->size, replaced));
    return error;
  }
  const std::string path = to.folder_path + name;
  if (!CopyBytes(in.get(), out.get())) {
    // Half a copy is worse than none.
    const DWORD error = ErrorOfErrno(errno);
    static_cast<void>(::unlinkat(to.folder, name.c_str(), 0));
    space.Release(from.entry->size);
    records_->Erase(path);
    return error;
  }
  const FileTicks now = SystemTicks(device_);
  records_->Set(path, {source.attributes & kSettableAttributes, now, now, source.written});
  return ERROR_SUCCESS;
}

}  // namespace sim
