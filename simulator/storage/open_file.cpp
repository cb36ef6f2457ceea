#include "storage/open_file.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "locale/clock.h"
#include "storage/host_folder.h"
#include "storage/storage.h"
#include "storage/volume.h"

namespace sim {
namespace {

constexpr std::size_t kReadAhead = 65536;

/// @return false with errno set; a part may have been written.
bool WriteAt(int fd, const char* bytes, std::size_t size, std::uint64_t at) {
  while (size > 0) {
    const ssize_t done = ::pwrite(fd, bytes, size, static_cast<off_t>(at));
    if (done < 0 && errno == EINTR) continue;
    if (done < 0) return false;
    bytes += done;
    size -= static_cast<std::size_t>(done);
    at += static_cast<std::uint64_t>(done);
  }
  return true;
}

}  // namespace

OpenFile::OpenFile(Device& device, Storage& storage, std::shared_ptr<FileNode> node, UniqueFd fd,
                   Mode mode)
    : device_(device),
      storage_(&storage),
      node_(std::move(node)),
      fd_(std::move(fd)),
      mode_(mode) {}

OpenFile::~OpenFile() {
  if (storage_ != nullptr) storage_->Close(*this);
}

DWORD OpenFile::Read(void* bytes, DWORD size, DWORD& read) {
  read = 0;
  if (!can_read()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  if (!node_->volume.present()) return ERROR_NOT_READY;
  while (read < size) {
    ssize_t got = ReadHere(static_cast<char*>(bytes) + read, size - read);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return ErrorOfErrno(errno);
    if (got == 0 && node_->host_is_short && position_ < node_->size) {
      got = static_cast<ssize_t>(std::min<std::uint64_t>(size - read, node_->size - position_));
      std::memset(static_cast<char*>(bytes) + read, 0, static_cast<std::size_t>(got));
    }
    if (got == 0) break;
    if (node_->shared != nullptr) {
      node_->shared->Fill(position_, static_cast<char*>(bytes) + read,
                          static_cast<std::size_t>(got));
    }
    read += static_cast<DWORD>(got);
    position_ += static_cast<std::uint64_t>(got);
    read_to_ = position_;
  }
  return ERROR_SUCCESS;
}

ssize_t OpenFile::ReadHere(char* bytes, std::size_t size) {
  const auto host_read = [this](char* to, std::size_t most) {
    return ::pread(fd_.get(), to, most, static_cast<off_t>(position_));
  };
  const bool ahead = ahead_.version == node_->version && position_ >= ahead_.at &&
                     position_ < ahead_.at + ahead_.size;
  if (!ahead) {
    const bool same = ahead_.version == node_->version;
    // The host has already said that there is no more: it counts once, the next read asks again.
    if (same && std::exchange(ahead_.ends, false) && position_ == ahead_.at + ahead_.size) return 0;
    // The first piece of a large file comes alone: many a program looks at a file's head only.
    const bool follows = position_ == read_to_ && (position_ != 0 || node_->size <= kReadAhead);
    if (size > kReadAhead / 4 || !follows) return host_read(bytes, size);
    if (!ahead_.bytes) ahead_.bytes = std::make_unique<char[]>(kReadAhead);
    const ssize_t got = host_read(ahead_.bytes.get(), kReadAhead);
    ahead_.size = got > 0 ? static_cast<std::size_t>(got) : 0;
    ahead_.at = position_;
    ahead_.version = node_->version;
    ahead_.ends = got > 0 && ahead_.size < kReadAhead;
    if (got <= 0) return got;
  }
  const auto from = static_cast<std::size_t>(position_ - ahead_.at);
  const std::size_t taken = std::min(size, ahead_.size - from);
  std::memcpy(bytes, ahead_.bytes.get() + from, taken);
  return static_cast<ssize_t>(taken);
}

bool OpenFile::WriteContent(const char* bytes, std::size_t size, std::uint64_t at) {
  if (node_->shared == nullptr || !node_->shared->Take(at, bytes, size)) {
    return WriteAt(fd_.get(), bytes, size, at);
  }
  if (at + size > node_->size) node_->host_is_short = true;
  return true;
}

void OpenFile::SettleSize() {
  if (!std::exchange(node_->host_is_short, false)) return;
  static_cast<void>(::ftruncate(fd_.get(), static_cast<off_t>(node_->size)));
}

DWORD OpenFile::Write(const void* bytes, DWORD size, DWORD& written) {
  written = 0;
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  if (!node_->volume.present()) return ERROR_NOT_READY;
  if (size == 0) return ERROR_SUCCESS;
  const std::uint64_t start = mode_.append ? node_->size : position_;
  const std::uint64_t end = start + size;
  if (end > kMaxFileSize) return ERROR_DISK_FULL;
  const std::uint64_t growth = end > node_->size ? end - node_->size : 0;
  Space& space = node_->volume.space();
  if (growth != 0 && !space.Reserve(growth)) return ERROR_DISK_FULL;
  ++node_->version;  // also for a write that fails half-way
  if (!WriteContent(static_cast<const char*>(bytes), size, start)) {
    const DWORD error = ErrorOfErrno(errno);
    if (growth != 0) {
      static_cast<void>(::ftruncate(fd_.get(), static_cast<off_t>(node_->size)));
      if (node_->shared != nullptr) node_->shared->Cut(node_->size);
      space.Release(growth);
    }
    return error;
  }
  node_->size += growth;
  position_ = end;
  written = size;
  NoteChange();
  return ERROR_SUCCESS;
}

DWORD OpenFile::Seek(std::int64_t distance, DWORD method, std::uint64_t most,
                     std::uint64_t& position) {
  const std::lock_guard<std::mutex> hold(node_->mutex);
  std::int64_t from = 0;
  if (method == FILE_CURRENT) {
    from = static_cast<std::int64_t>(position_);
  } else if (method == FILE_END) {
    from = static_cast<std::int64_t>(node_->size);
  } else if (method != FILE_BEGIN) {
    return ERROR_INVALID_PARAMETER;
  }
  std::int64_t to = 0;
  if (__builtin_add_overflow(from, distance, &to)) return ERROR_INVALID_PARAMETER;
  if (to < 0) return ERROR_NEGATIVE_SEEK;
  if (static_cast<std::uint64_t>(to) > most) return ERROR_INVALID_PARAMETER;
  position_ = static_cast<std::uint64_t>(to);
  position = position_;
  return ERROR_SUCCESS;
}

DWORD OpenFile::SetEnd() {
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  if (!node_->volume.present()) return ERROR_NOT_READY;
  return Resize(position_);
}

DWORD OpenFile::Resize(std::uint64_t size) {
  if (size > kMaxFileSize) return ERROR_DISK_FULL;
  Space& space = node_->volume.space();
  if (!space.Exchange(node_->size, size)) return ERROR_DISK_FULL;
  if (::ftruncate(fd_.get(), static_cast<off_t>(size)) != 0) {
    const DWORD error = ErrorOfErrno(errno);
    static_cast<void>(space.Exchange(size, node_->size));
    return error;
  }
  node_->size = size;
  node_->host_is_short = false;
  if (node_->shared != nullptr) node_->shared->Cut(size);
  NoteChange();
  return ERROR_SUCCESS;
}

DWORD OpenFile::Lengthen(std::uint64_t size) {
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  return size > node_->size ? Resize(size) : ERROR_SUCCESS;
}

DWORD OpenFile::Load(char* bytes, std::size_t size) {
  if (!can_read()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  std::size_t have = 0;
  while (have < size) {
    const ssize_t got = ::pread(fd_.get(), bytes + have, size - have, static_cast<off_t>(have));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return ErrorOfErrno(errno);
    if (got == 0) break;  // somebody on the host has cut it; the rest reads as zeros
    have += static_cast<std::size_t>(got);
  }
  std::memset(bytes + have, 0, size - have);
  if (node_->shared != nullptr) node_->shared->Fill(0, bytes, size);
  return ERROR_SUCCESS;
}

DWORD OpenFile::Store(const char* bytes, std::size_t size) {
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  const auto kept = static_cast<std::size_t>(std::min<std::uint64_t>(size, node_->size));
  if (!WriteContent(bytes, kept, 0)) return ErrorOfErrno(errno);
  NoteChange();
  return ERROR_SUCCESS;
}

DWORD OpenFile::Flush() {
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  storage_->Flush(*node_);
  return ERROR_SUCCESS;
}

std::uint64_t OpenFile::size() const {
  const std::lock_guard<std::mutex> hold(node_->mutex);
  return node_->size;
}

FileRecord OpenFile::record() const {
  const std::lock_guard<std::mutex> hold(node_->mutex);
  return node_->record;
}

DWORD OpenFile::SetTimes(const FILETIME* created, const FILETIME* accessed,
                         const FILETIME* written) {
  if (!can_write()) return ERROR_ACCESS_DENIED;
  const std::lock_guard<std::mutex> hold(node_->mutex);
  if (created != nullptr) node_->record.created = ToTicks(*created);
  if (accessed != nullptr) node_->record.accessed = ToTicks(*accessed);
  if (written != nullptr) node_->record.written = ToTicks(*written);
  node_->changed = true;
  return ERROR_SUCCESS;
}

void OpenFile::NoteChange() {
  node_->record.attributes |= FILE_ATTRIBUTE_ARCHIVE;
  node_->record.written = SystemTicks(device_);
  node_->record.accessed = node_->record.written;
  node_->changed = true;
  ++node_->version;
}

}  // namespace sim
