// An open file: what the handles of CreateFileW and the streams of fopen stand for.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "ce/files.h"
#include "kernel/handle_table.h"
#include "storage/file_records.h"
#include "storage/shared_parts.h"
#include "storage/unique_fd.h"

namespace sim {

class Device;
class Storage;
class Volume;

/// Files end below 4 GiB: their sizes have 32 bits.
inline constexpr std::uint64_t kMaxFileSize = 0xFFFFFFFFU;

/// What all open handles of one file share.
struct FileNode {
  FileNode(Volume& on, std::string below_storage) : volume(on), path(std::move(below_storage)) {}

  Volume& volume;
  const std::string path;    ///< an open file and its folders keep their names
  std::uint64_t device = 0;  ///< of the host, as in HostEntry
  std::uint64_t inode = 0;

  std::mutex mutex;  ///< of the size, the record and the content
  std::uint64_t size = 0;
  FileRecord record;
  bool changed = false;                 ///< the record differs from the one kept on the host
  std::uint64_t version = 0;            ///< goes up with each change of the content
  std::shared_ptr<SharedParts> shared;  ///< of the content; null where nothing is shared
  bool host_is_short = false;           ///< shared parts lie behind the host file's end

  // How it is shared; guarded by the storage's lock.
  unsigned opens = 0;
  unsigned readers = 0;
  unsigned writers = 0;
  unsigned bar_reading = 0;  ///< opens that let nobody else read
  unsigned bar_writing = 0;
};

/// All operations give an error number of the device, 0 for success. Any thread; the file's
/// position is the handle's own.
class OpenFile final : public KernelObject {
 public:
  struct Mode {
    DWORD access = 0;       ///< GENERIC_READ and GENERIC_WRITE
    DWORD share = 0;        ///< FILE_SHARE_READ and FILE_SHARE_WRITE
    bool append = false;    ///< every write goes to the end
    bool mappable = false;  ///< opened by CreateFileForMappingW
  };
  OpenFile(Device& device, Storage& storage, std::shared_ptr<FileNode> node, UniqueFd fd,
           Mode mode);
  ~OpenFile() override;

  /// At the end of the file it reads 0 bytes and succeeds.
  DWORD Read(void* bytes, DWORD size, DWORD& read);
  /// All or nothing: what does not fit on the volume is refused with ERROR_DISK_FULL, and neither
  /// the file nor the position changes, so that the same write can be tried again.
  DWORD Write(const void* bytes, DWORD size, DWORD& written);
  /// @param method  FILE_BEGIN, FILE_CURRENT or FILE_END
  /// @param most    a position beyond it is refused
  DWORD Seek(std::int64_t distance, DWORD method, std::uint64_t most, std::uint64_t& position);
  /// Cuts or lengthens the file to the position; what is new reads as zeros.
  DWORD SetEnd();
  /// Keeps attributes and times on the host now instead of at the closing.
  DWORD Flush();
  [[nodiscard]] std::uint64_t size() const;
  [[nodiscard]] FileRecord record() const;
  /// The whole content, and writing it back within the file's size: what a mapping needs.
  DWORD Load(char* bytes, std::size_t size);
  DWORD Store(const char* bytes, std::size_t size);
  /// Makes the file at least `size` bytes long.
  DWORD Lengthen(std::uint64_t size);
  /// Null pointers leave their time as it is.
  DWORD SetTimes(const FILETIME* created, const FILETIME* accessed, const FILETIME* written);

  [[nodiscard]] bool can_read() const { return (mode_.access & GENERIC_READ) != 0; }
  [[nodiscard]] bool can_write() const { return (mode_.access & GENERIC_WRITE) != 0; }
  [[nodiscard]] const Mode& mode() const { return mode_; }

 private:
  friend class Storage;
  /// Bytes behind the last one asked for, as a file system's cache holds them: whoever reads a file
  /// from end to end in small pieces does not pay the host for each.
  struct ReadAhead {
    std::unique_ptr<char[]> bytes;
    std::uint64_t at = 0;
    std::size_t size = 0;
    std::uint64_t version = 0;  ///< of the content
    bool ends = false;          ///< the file ended behind them, and nobody has been told
  };

  void NoteChange();
  DWORD Resize(std::uint64_t size);
  /// From the position on. @return how many, 0 at the end of the file, -1 with errno set.
  ssize_t ReadHere(char* bytes, std::size_t size);
  /// Writes to the host what must be there. @return false with errno set.
  bool WriteContent(const char* bytes, std::size_t size, std::uint64_t at);
  /// Gives the host's file its length, with a hole for what is shared.
  void SettleSize();

  Device& device_;
  Storage* storage_;  ///< null once the file is closed
  std::shared_ptr<FileNode> node_;
  UniqueFd fd_;
  const Mode mode_;
  // guarded by the node's mutex
  std::uint64_t position_ = 0;
  std::uint64_t read_to_ = 0;  ///< where the last read ended
  ReadAhead ahead_;
};

}  // namespace sim
