// What the host's file system cannot hold of a device's files: attributes and three times.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>

#include "locale/clock.h"
#include "storage/unique_fd.h"

namespace sim {

struct FileRecord {
  std::uint32_t attributes = 0;  ///< FILE_ATTRIBUTE_* bits without the directory and normal bits
  FileTicks created = 0;
  FileTicks accessed = 0;
  FileTicks written = 0;
};

/// The records of all files and folders of a device, by path below `storage/`, in one text file
/// beside that folder, so that they survive a copy of the device by any means and never show in a
/// listing. Every change is one appended line: a program that dies loses the last line at most, and
/// the times of the files it wrote last, which are gathered, because a log that is opened for each
/// of its lines would otherwise cost more here than in the log. The file is rewritten, beside
/// itself and then renamed, when it has grown to a multiple of what it says. Any thread.
///
/// Lines: "S attributes created accessed written path" sets a record (numbers in hexadecimal),
/// "E path" erases one and those below it, "R from<tab>to" moves them. A path holds no character
/// below a blank, so neither line end nor tab.
class FileRecords {
 public:
  /// Reads `file`; a missing one is empty. Lines that are no such lines are passed over.
  /// @throws std::runtime_error when the file cannot be read or written.
  explicit FileRecords(std::filesystem::path file);
  ~FileRecords();
  FileRecords(const FileRecords&) = delete;
  FileRecords& operator=(const FileRecords&) = delete;

  [[nodiscard]] std::optional<FileRecord> Find(const std::string& path) const;
  void Set(const std::string& path, const FileRecord& record);
  /// Forgets `path` and everything below it.
  void Erase(const std::string& path);
  void Rename(const std::string& from, const std::string& to);
  /// Writes what is gathered.
  void Flush();
  /// Forgets every path for which `exists` does not hold, and rewrites the file.
  void Prune(const std::function<bool(const std::string&)>& exists);

 private:
  using Map = std::map<std::string, FileRecord>;

  void ReadLine(std::string_view line);
  void ApplyErase(const std::string& path);
  void ApplyRename(const std::string& from, const std::string& to);
  void Append(const std::string& line);
  void WriteGathered();
  /// @return false, with errno set, when the host refuses; the old file then stays.
  bool Rewrite();
  void RewriteOrThrow();

  const std::filesystem::path file_;
  mutable std::mutex mutex_;
  Map records_;
  std::set<std::string> gathered_;  ///< paths whose times are newer than the file says
  UniqueFd journal_;
  std::size_t lines_ = 0;
};

}  // namespace sim
