// What a multicast run sends.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>

namespace server {

/// The bytes of a file, read block by block. Used by the thread of its run only.
class FileContent {
 public:
  FileContent() = default;
  virtual ~FileContent() = default;
  FileContent(const FileContent&) = delete;
  FileContent& operator=(const FileContent&) = delete;

  [[nodiscard]] virtual std::uint32_t size() const = 0;  ///< bytes
  /// Reads `size` bytes from `offset`. @return false when they cannot be had (any more).
  [[nodiscard]] virtual bool Read(std::uint32_t offset, std::size_t size, std::uint8_t* out) = 0;
};

/// A file on disk, opened once. Throws std::system_error when it cannot be opened or has 4 GiB or
/// more. One that becomes shorter later fails the reads behind its end.
[[nodiscard]] std::unique_ptr<FileContent> OpenContent(const std::filesystem::path& path);
[[nodiscard]] std::unique_ptr<FileContent> MemoryContent(std::string bytes);

/// One file of a run.
struct MulticastFile {
  std::string device_path;  ///< its destination on the device, at most 259 characters
  std::string masks;        ///< of the device types it is meant for, as "TQ5* MV41"; empty: for all
  std::uint32_t attributes = 0x20;  ///< FILE_ATTRIBUTE_* bits
  std::string time_stamp;           ///< "2006-03-01 14:05:09", at most 20 characters, or empty
  std::shared_ptr<FileContent> content;
};

/// Why this file cannot be sent, for people; empty when it can.
[[nodiscard]] std::string Objection(const MulticastFile& file);

/// Blocks of a file, and their size: `wished`, or more when there would be too many blocks.
struct Blocking {
  std::uint16_t block_size = 0;
  std::uint32_t block_count = 0;  ///< 0 for an empty file
};
[[nodiscard]] Blocking ChooseBlocks(std::uint32_t size, std::uint16_t wished);

}  // namespace server
