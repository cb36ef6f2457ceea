// The one way in which the upgrade reaches files, folders and processes of the device.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

#include "device/handle.h"
#include "device/local_memory.h"
#include "device/wide_text.h"

namespace device {

/// Which of a file's three times.
enum class TimeKind : std::uint8_t { kCreation, kLastAccess, kLastWrite };

/// One open file, one search in a folder, and the file system around them.
///
/// Names are 8-bit texts of at most 259 characters; a longer one is refused, never cut. Nothing
/// here logs: callers do. An object belongs to one thread at a time. It is about 1.5 KiB large,
/// comes from the local heap when made with `new`, and closes what it holds when it is destroyed.
/// Files are at most 4 GiB - 1 long.
///
/// A file of another kind (one kept in memory by a driver) derives from this class and replaces the
/// operations on data.
class File : public OnLocalHeap {
 public:
  static constexpr std::size_t kNameSize = 260;

  File() noexcept = default;
  virtual ~File();
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  // ---- the open file; opening closes the one that was open ----

  /// For writing: made new and empty, shared with nobody. For reading: must exist, may be read by
  /// others meanwhile.
  virtual bool OpenFile(const char* name, bool for_writing) noexcept;
  /// @param keep  the file must exist and keeps its content; else it is made new and empty
  /// @param size  bytes that will be written; kinds of files that reserve their room use it, files
  ///   on a volume do not
  virtual bool OpenForWriting(const char* name, bool keep, std::uint32_t size) noexcept;
  /// Makes the file new and empty.
  /// @param share  others may read it meanwhile
  /// @param error  receives 0 or the platform's error; may be null
  virtual bool CreateForWriting(const char* name, bool share, std::uint32_t* error) noexcept;
  virtual bool OpenForReading(const char* name, bool share) noexcept;
  /// @return false when no file is open.
  virtual bool Close() noexcept;
  /// @param read  receives the bytes read, 0 at the end of the file
  virtual bool Read(void* buffer, std::uint32_t length, std::uint32_t* read) noexcept;
  /// Writes all of `data`, making room in a full object store (see WriteWithRebalance).
  virtual bool Write(const void* data, std::uint32_t length) noexcept;
  /// @param offset  from the beginning; may lie behind the end
  virtual bool Seek(std::uint32_t offset) noexcept;
  virtual bool Flush() noexcept;
  /// @param size  receives the open file's length in bytes
  virtual bool GetSize(std::uint32_t* size) noexcept;

  [[nodiscard]] bool is_open() const noexcept { return static_cast<bool>(file_); }
  /// The error of the operation that failed last, 0 when the last one succeeded.
  [[nodiscard]] std::uint32_t last_error() const noexcept { return last_error_; }

  // ---- times of the open file ----

  virtual bool GetTime(TimeKind kind, FILETIME* time) noexcept;
  virtual bool GetTime(TimeKind kind, SYSTEMTIME* time) noexcept;
  virtual bool SetTime(TimeKind kind, const FILETIME& time) noexcept;
  virtual bool SetTime(TimeKind kind, const SYSTEMTIME& time) noexcept;
  /// Local date and time of `time` in the device's own style, a blank between them.
  /// @param capacity  of `text`; a longer text is cut
  virtual bool FormatFileTime(const FILETIME& time, char* text, std::size_t capacity) noexcept;
  /// Compares the last-write time of the open file or, when none is open, of the entry found last
  /// with that of the file `name`.
  /// @return -1, 0 or 1; also -1 when that file cannot be opened.
  virtual int CompareFileTimes(const char* name) noexcept;

  // ---- the file system around it ----

  /// Deletes a file, a read-only one too.
  /// @param error  receives 0 or the platform's error; may be null
  virtual bool DeleteFile(const char* name, std::uint32_t* error) noexcept;
  /// @return the attribute mask, INVALID_FILE_ATTRIBUTES when there is no such file.
  virtual std::uint32_t GetAttributes(const char* name) noexcept;
  virtual bool SetAttributes(const char* name, std::uint32_t mask) noexcept;
  /// Whether there is a file or folder of that name. Leaves an open search alone.
  virtual bool Exists(const char* name) noexcept;
  [[nodiscard]] virtual bool IsDirectory(const WIN32_FIND_DATAW& found) const noexcept;
  /// Begins a search, ending an earlier one; the entry is found() and found_name().
  virtual bool FindFirst(const char* pattern) noexcept;
  virtual bool FindNext() noexcept;
  /// @return false when no search is open.
  virtual bool FindClose() noexcept;
  virtual bool CreateDirectory(const char* name) noexcept;
  /// Deletes a folder and all it holds, as far as that is possible, whatever the names in it are.
  /// @param pattern  the folder, a backslash and "*.*"; without a '*' nothing is done
  /// @return whether the folder itself is gone.
  virtual bool RemoveDirectoryTree(const char* pattern) noexcept;
  /// @param bytes  receives what the caller may still write in the volume of `root`
  virtual bool GetFreeSpace(const char* root, std::uint64_t* bytes) noexcept;
  virtual bool CopyFile(const char* from, const char* to, bool fail_if_exists) noexcept;
  /// Never replaces an existing file.
  virtual bool MoveFile(const char* from, const char* to) noexcept;

  /// The entry that a search found last.
  [[nodiscard]] const WIN32_FIND_DATAW& found() const noexcept { return found_; }
  [[nodiscard]] const char* found_name() const noexcept { return found_name_.c_str(); }

  // ---- processes ----

  // Names and parameters that are too long are refused.

  /// @param program  executable name; letter case counts
  /// @return the id of the first process of that name, 0 when there is none.
  virtual std::uint32_t FindProcess(const char* program) noexcept;
  /// Starts a program and waits for its end.
  /// @param wait_ms  how long to wait, INFINITE for as long as it takes
  /// @return the result of the wait; 0xFFFFFFFF when there is no name or the start failed.
  virtual std::uint32_t RunProcess(const char* program, const char* parameters,
                                   std::uint32_t wait_ms) noexcept;
  /// Ends the first process of that name. @return whether one was ended.
  virtual bool StopProcess(const char* program) noexcept;

 protected:
  /// Writes and, when the object store is full, moves memory to it and writes again.
  // KEPT ODDITY: a full store gives exactly 16 rounds of rebalancing and writing, also after one
  // has succeeded; the result is the last one's.
  bool WriteWithRebalance(const void* data, std::uint32_t length) noexcept;

 private:
  bool Open(const char* name, DWORD access, DWORD share, DWORD disposition) noexcept;
  /// Notes the platform's error of a failed call, or its absence, and passes the result on.
  bool Note(bool succeeded) noexcept;

  FileHandle file_;
  SearchHandle search_;
  WIN32_FIND_DATAW found_ = {};
  NarrowText<kNameSize> found_name_;
  std::uint32_t last_error_ = 0;
};

}  // namespace device
