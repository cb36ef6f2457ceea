// Opening and closing files: dispositions, attributes and sharing.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "storage/storage.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr DWORD kProtected =
    FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;

bool Truncates(DWORD disposition) {
  return disposition == CREATE_ALWAYS || disposition == TRUNCATE_EXISTING;
}

/// Whether the file's attributes allow what is asked for.
DWORD CheckAttributes(DWORD attributes, DWORD access, DWORD disposition) {
  const bool writes = (access & GENERIC_WRITE) != 0;
  if (disposition == CREATE_ALWAYS) {
    // Replaces a ROM file by one of its own, but never a protected one.
    return (attributes & kProtected) != 0 ? ERROR_ACCESS_DENIED : ERROR_SUCCESS;
  }
  constexpr DWORD kFixed = FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_INROM;
  return writes && (attributes & kFixed) != 0 ? ERROR_ACCESS_DENIED : ERROR_SUCCESS;
}

/// Whether those who have the file open and the one who wants it bear each other.
DWORD CheckSharing(const FileNode& node, const OpenFile::Mode& mode, bool truncates) {
  const bool reads = (mode.access & GENERIC_READ) != 0;
  const bool writes = (mode.access & GENERIC_WRITE) != 0 || truncates;
  const bool barred = (reads && node.bar_reading != 0) || (writes && node.bar_writing != 0);
  const bool bars =
      (reads || writes) && ((node.readers != 0 && (mode.share & FILE_SHARE_READ) == 0) ||
                            (node.writers != 0 && (mode.share & FILE_SHARE_WRITE) == 0));
  return barred || bars ? ERROR_SHARING_VIOLATION : ERROR_SUCCESS;
}

/// Enters (step 1) or leaves (step -1) the file.
void CountSharing(FileNode& node, const OpenFile::Mode& mode, int step) {
  const auto count = [step](unsigned& of, bool counts) {
    if (counts) of += static_cast<unsigned>(step);
  };
  const bool uses = (mode.access & (GENERIC_READ | GENERIC_WRITE)) != 0;
  count(node.opens, true);
  count(node.readers, (mode.access & GENERIC_READ) != 0);
  count(node.writers, (mode.access & GENERIC_WRITE) != 0);
  count(node.bar_reading, uses && (mode.share & FILE_SHARE_READ) == 0);
  count(node.bar_writing, uses && (mode.share & FILE_SHARE_WRITE) == 0);
}

int HostFlags(DWORD access, bool truncates) {
  const bool reads = (access & GENERIC_READ) != 0;
  const bool writes = (access & GENERIC_WRITE) != 0 || truncates;
  const int way = writes ? (reads ? O_RDWR : O_WRONLY) : O_RDONLY;
  // Not blocking: the name may have become a pipe's since it was looked at.
  return way | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;
}

}  // namespace

DWORD Storage::CheckOpen(const OpenRequest& request, const Location& location) const {
  const DWORD disposition = request.disposition;
  if (disposition < CREATE_NEW || disposition > TRUNCATE_EXISTING) return ERROR_INVALID_PARAMETER;
  if (disposition == TRUNCATE_EXISTING && (request.mode.access & GENERIC_WRITE) == 0) {
    return ERROR_INVALID_PARAMETER;
  }
  if (location.volume_root || (location.entry && location.entry->folder)) {
    return ERROR_ACCESS_DENIED;
  }
  if (location.closed) return ERROR_PATH_NOT_FOUND;
  if (!location.entry) {
    const bool creates = disposition != OPEN_EXISTING && disposition != TRUNCATE_EXISTING;
    return creates ? ERROR_SUCCESS : ERROR_FILE_NOT_FOUND;
  }
  if (disposition == CREATE_NEW) return ERROR_FILE_EXISTS;
  const DWORD attributes = RecordOf(location).attributes;
  const DWORD error = CheckAttributes(attributes, request.mode.access, disposition);
  if (error != ERROR_SUCCESS) return error;
  const std::shared_ptr<FileNode> node = FindNode(*location.entry);
  return node == nullptr ? ERROR_SUCCESS
                         : CheckSharing(*node, request.mode, Truncates(disposition));
}

DWORD Storage::OpenHost(const OpenRequest& request, Location& location, UniqueFd& fd) {
  const bool creates = !location.entry.has_value();
  if (!creates) fd = parked_.Take(*location.entry, request.mode.access);
  if (fd) return ERROR_SUCCESS;  // the entry has just been looked at
  const std::string name = creates ? ToHostText(location.leaf) : location.entry->name;
  const int flags = HostFlags(request.mode.access, !creates && Truncates(request.disposition));
  fd = UniqueFd(
      ::openat(location.folder, name.c_str(), creates ? flags | O_CREAT | O_EXCL : flags, 0644));
  if (!fd) return ErrorOfErrno(errno);
  struct stat status {};
  if (::fstat(fd.get(), &status) != 0 || !S_ISREG(status.st_mode)) return ERROR_ACCESS_DENIED;
  if (creates) location.entry = EntryOf(status, name);
  location.entry->device = status.st_dev;
  location.entry->inode = status.st_ino;
  location.entry->size = static_cast<std::uint64_t>(status.st_size);
  return ERROR_SUCCESS;
}

std::shared_ptr<FileNode> Storage::EnterNode(const Location& location) {
  if (std::shared_ptr<FileNode> known = FindNode(*location.entry)) return known;
  auto node = std::make_shared<FileNode>(*location.volume, location.path());
  node->device = location.entry->device;
  node->inode = location.entry->inode;
  node->size = location.entry->size;
  node->record = RecordOf(location);
  if (shared_content_ != nullptr) {
    std::shared_ptr<SharedParts>& parts = shared_parts_[{node->device, node->inode}];
    if (parts == nullptr) parts = std::make_shared<SharedParts>(shared_content_);
    node->shared = parts;
  }
  nodes_[{node->device, node->inode}] = node;
  return node;
}

DWORD Storage::MakeFresh(FileNode& node, int fd, const OpenRequest& request) {
  const std::lock_guard<std::mutex> hold(node.mutex);
  if (node.size != 0 && ::ftruncate(fd, 0) != 0) return ErrorOfErrno(errno);
  node.volume.space().Release(node.size);
  node.size = 0;
  node.host_is_short = false;
  if (node.shared != nullptr) node.shared->Cut(0);
  const FileTicks now = SystemTicks(device_);
  if (request.disposition != TRUNCATE_EXISTING) {
    node.record.attributes = request.attributes & kSettableAttributes;
    node.record.created = now;
  }
  node.record.attributes |= FILE_ATTRIBUTE_ARCHIVE;
  node.record.accessed = now;
  node.record.written = now;
  node.changed = true;
  Keep(node);
  return ERROR_SUCCESS;
}

DWORD Storage::Open(const OpenRequest& request, std::shared_ptr<OpenFile>& file, bool& existed) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(request.name, location); error != ERROR_SUCCESS) return error;
  if (const DWORD error = CheckOpen(request, location); error != ERROR_SUCCESS) return error;
  existed = location.entry.has_value();
  UniqueFd fd;
  if (const DWORD error = OpenHost(request, location, fd); error != ERROR_SUCCESS) return error;
  const std::shared_ptr<FileNode> node = EnterNode(location);
  if (!existed || Truncates(request.disposition)) {
    const DWORD error = MakeFresh(*node, fd.get(), request);
    if (error != ERROR_SUCCESS) return error;
  }
  file = std::make_shared<OpenFile>(device_, *this, node, std::move(fd), request.mode);
  CountSharing(*node, request.mode, 1);
  open_files_.insert(file.get());
  return ERROR_SUCCESS;
}

void Storage::Close(OpenFile& file) {
  const Hold hold(mutex_);
  if (file.storage_ == nullptr) return;
  file.storage_ = nullptr;
  open_files_.erase(&file);
  CountSharing(*file.node_, file.mode_, -1);
  const std::lock_guard<std::mutex> quiet(file.node_->mutex);
  if (file.can_write()) file.SettleSize();
  Keep(*file.node_);
  const FileNode& node = *file.node_;
  // Only those opened for writing: for them the host's way of opening is the same at every open.
  if (file.can_write()) {
    parked_.Park(node.device, node.inode, file.mode_.access, std::move(file.fd_));
  }
  file.fd_.Reset();
  if (node.opens == 0) nodes_.erase({node.device, node.inode});
}

}  // namespace sim
