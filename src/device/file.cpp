#include "device/file.h"

#include <cstring>

#include "device/memory.h"

namespace device {
namespace {

constexpr int kRebalanceRounds = 16;
constexpr DWORD kRebalancePauseMs = 10;

/// A name as the platform wants it. Names that do not fit are refused: a cut one would be another
/// file's.
class WideName {
 public:
  explicit WideName(const char* name) noexcept {
    const std::string_view text = base::View(name);
    valid_ = name != nullptr && text.size() < File::kNameSize && text_.Assign(text);
    if (!valid_) SetLastError(ERROR_INVALID_NAME);
  }
  [[nodiscard]] explicit operator bool() const noexcept { return valid_; }
  [[nodiscard]] const WCHAR* c_str() const noexcept { return text_.c_str(); }

 private:
  WideText<File::kNameSize> text_;
  bool valid_ = false;
};

/// The three pointers that the time calls take, all null but the one of `kind`.
template <typename Time>
struct TimeArguments {
  TimeArguments(TimeKind kind, Time* time) noexcept
      : creation(kind == TimeKind::kCreation ? time : nullptr),
        access(kind == TimeKind::kLastAccess ? time : nullptr),
        write(kind == TimeKind::kLastWrite ? time : nullptr) {}
  Time* creation;
  Time* access;
  Time* write;
};

}  // namespace

File::~File() = default;

bool File::Note(bool succeeded) noexcept {
  last_error_ = succeeded ? 0 : static_cast<std::uint32_t>(GetLastError());
  return succeeded;
}

bool File::Open(const char* name, DWORD access, DWORD share, DWORD disposition) noexcept {
  file_.Reset();
  const WideName wide(name);
  if (!wide) return Note(false);
  file_.Reset(CreateFileW(wide.c_str(), access, share, nullptr, disposition, FILE_ATTRIBUTE_NORMAL,
                          nullptr));
  return Note(is_open());
}

bool File::OpenFile(const char* name, bool for_writing) noexcept {
  if (for_writing) return Open(name, GENERIC_WRITE, 0, CREATE_ALWAYS);
  return Open(name, GENERIC_READ, FILE_SHARE_READ, OPEN_EXISTING);
}

bool File::OpenForWriting(const char* name, bool keep, std::uint32_t /*size*/) noexcept {
  return Open(name, GENERIC_WRITE, 0, keep ? OPEN_EXISTING : CREATE_ALWAYS);
}

bool File::CreateForWriting(const char* name, bool share, std::uint32_t* error) noexcept {
  const bool opened = Open(name, GENERIC_WRITE, share ? FILE_SHARE_READ : 0, CREATE_ALWAYS);
  if (error != nullptr) *error = last_error_;
  return opened;
}

bool File::OpenForReading(const char* name, bool share) noexcept {
  return Open(name, GENERIC_READ, share ? FILE_SHARE_READ : 0, OPEN_EXISTING);
}

bool File::Close() noexcept {
  if (!is_open()) return false;
  return Note(CloseHandle(file_.Release()) != 0);
}

bool File::Read(void* buffer, std::uint32_t length, std::uint32_t* read) noexcept {
  DWORD taken = 0;
  const bool succeeded = Note(ReadFile(file_.get(), buffer, length, &taken, nullptr) != 0);
  if (read != nullptr) *read = succeeded ? static_cast<std::uint32_t>(taken) : 0;
  return succeeded;
}

bool File::Write(const void* data, std::uint32_t length) noexcept {
  return WriteWithRebalance(data, length);
}

bool File::WriteWithRebalance(const void* data, std::uint32_t length) noexcept {
  DWORD written = 0;
  const bool first = Note(WriteFile(file_.get(), data, length, &written, nullptr) != 0);
  if (first || last_error_ != ERROR_DISK_FULL) return first;
  bool last = false;
  for (int round = 0; round < kRebalanceRounds; ++round) {
    RebalanceMemory();
    last = Note(WriteFile(file_.get(), data, length, &written, nullptr) != 0);
    Sleep(kRebalancePauseMs);
  }
  return last;
}

bool File::Seek(std::uint32_t offset) noexcept {
  // Alone the distance is signed; the upper half makes it a number of 64 bits.
  LONG upper = 0;
  const bool needs_upper = offset > INT32_MAX;
  SetLastError(0);  // the failure value is also a position: only the error tells them apart
  const DWORD position = SetFilePointer(file_.get(), static_cast<LONG>(offset),
                                        needs_upper ? &upper : nullptr, FILE_BEGIN);
  return Note(position != INVALID_SET_FILE_POINTER || GetLastError() == 0);
}

bool File::Flush() noexcept {
  return Note(FlushFileBuffers(file_.get()) != 0);
}

bool File::GetSize(std::uint32_t* size) noexcept {
  SetLastError(0);
  const DWORD length = GetFileSize(file_.get(), nullptr);
  const bool succeeded = Note(length != INVALID_FILE_SIZE || GetLastError() == 0);
  *size = succeeded ? static_cast<std::uint32_t>(length) : 0;
  return succeeded;
}

bool File::GetTime(TimeKind kind, FILETIME* time) noexcept {
  const TimeArguments<FILETIME> out(kind, time);
  return Note(GetFileTime(file_.get(), out.creation, out.access, out.write) != 0);
}

bool File::GetTime(TimeKind kind, SYSTEMTIME* time) noexcept {
  FILETIME file_time = {};
  return GetTime(kind, &file_time) && Note(FileTimeToSystemTime(&file_time, time) != 0);
}

bool File::SetTime(TimeKind kind, const FILETIME& time) noexcept {
  const TimeArguments<const FILETIME> in(kind, &time);
  return Note(SetFileTime(file_.get(), in.creation, in.access, in.write) != 0);
}

bool File::SetTime(TimeKind kind, const SYSTEMTIME& time) noexcept {
  FILETIME file_time = {};
  if (!Note(SystemTimeToFileTime(&time, &file_time) != 0)) return false;
  return SetTime(kind, file_time);
}

bool File::FormatFileTime(const FILETIME& time, char* text, std::size_t capacity) noexcept {
  base::CopyText<char>(text, capacity, {});
  FILETIME local = {};
  SYSTEMTIME parts = {};
  WCHAR date[64];
  WCHAR clock[64];
  const bool formatted = FileTimeToLocalFileTime(&time, &local) != 0 &&
                         FileTimeToSystemTime(&local, &parts) != 0 &&
                         GetDateFormatW(LOCALE_USER_DEFAULT, 0, &parts, nullptr, date, 64) != 0 &&
                         GetTimeFormatW(LOCALE_USER_DEFAULT, 0, &parts, nullptr, clock, 64) != 0;
  if (!Note(formatted)) return false;
  NarrowText<160> both(date);
  both.Append(TEXT(" "));
  both.Append(clock);
  base::CopyText<char>(text, capacity, both.view());
  return true;
}

int File::CompareFileTimes(const char* name) noexcept {
  FILETIME own = found_.ftLastWriteTime;
  if (is_open() && !GetTime(TimeKind::kLastWrite, &own)) return -1;
  File other;
  FILETIME others = {};
  if (!Note(other.OpenForReading(name, true) && other.GetTime(TimeKind::kLastWrite, &others))) {
    return -1;
  }
  return static_cast<int>(CompareFileTime(&own, &others));
}

bool File::DeleteFile(const char* name, std::uint32_t* error) noexcept {
  const WideName wide(name);
  if (wide) SetFileAttributesW(wide.c_str(), FILE_ATTRIBUTE_NORMAL);
  const bool deleted = Note(wide && DeleteFileW(wide.c_str()) != 0);
  if (error != nullptr) *error = last_error_;
  return deleted;
}

std::uint32_t File::GetAttributes(const char* name) noexcept {
  const WideName wide(name);
  const DWORD mask = wide ? GetFileAttributesW(wide.c_str()) : INVALID_FILE_ATTRIBUTES;
  Note(mask != INVALID_FILE_ATTRIBUTES);
  return static_cast<std::uint32_t>(mask);
}

bool File::SetAttributes(const char* name, std::uint32_t mask) noexcept {
  const WideName wide(name);
  return Note(wide && SetFileAttributesW(wide.c_str(), mask) != 0);
}

bool File::Exists(const char* name) noexcept {
  const WideName wide(name);
  WIN32_FIND_DATAW found;
  const SearchHandle search(wide ? FindFirstFileW(wide.c_str(), &found) : INVALID_HANDLE_VALUE);
  return Note(static_cast<bool>(search));
}

bool File::IsDirectory(const WIN32_FIND_DATAW& found) const noexcept {
  return (found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

bool File::FindFirst(const char* pattern) noexcept {
  search_.Reset();
  const WideName wide(pattern);
  if (!wide) return Note(false);
  search_.Reset(FindFirstFileW(wide.c_str(), &found_));
  if (!Note(static_cast<bool>(search_))) return false;
  found_name_.Assign(found_.cFileName);
  return true;
}

bool File::FindNext() noexcept {
  if (!Note(FindNextFileW(search_.get(), &found_) != 0)) return false;
  found_name_.Assign(found_.cFileName);
  return true;
}

bool File::FindClose() noexcept {
  if (!search_) return false;
  return Note(::FindClose(search_.Release()) != 0);
}

bool File::CreateDirectory(const char* name) noexcept {
  const WideName wide(name);
  return Note(wide && CreateDirectoryW(wide.c_str(), nullptr) != 0);
}

bool File::GetFreeSpace(const char* root, std::uint64_t* bytes) noexcept {
  *bytes = 0;
  const WideName wide(root);
  ULARGE_INTEGER available = {};
  const bool asked = wide && GetDiskFreeSpaceExW(wide.c_str(), &available, nullptr, nullptr) != 0;
  if (!Note(asked)) return false;
  *bytes = available.QuadPart;
  return true;
}

bool File::CopyFile(const char* from, const char* to, bool fail_if_exists) noexcept {
  const WideName wide_from(from);
  const WideName wide_to(to);
  return Note(wide_from && wide_to &&
              CopyFileW(wide_from.c_str(), wide_to.c_str(), fail_if_exists ? TRUE : FALSE) != 0);
}

bool File::MoveFile(const char* from, const char* to) noexcept {
  const WideName wide_from(from);
  const WideName wide_to(to);
  return Note(wide_from && wide_to && MoveFileW(wide_from.c_str(), wide_to.c_str()) != 0);
}

}  // namespace device
