// The bundle as devices see it: a folder of files with their attributes, time stamps and CRC-32.
#pragma once

#include <cstdint>
#include <ctime>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <tuple>

namespace server {

/// A file's attribute bits as devices know them.
inline constexpr std::uint32_t kAttributeReadOnly = 0x01;
inline constexpr std::uint32_t kAttributeHidden = 0x02;
inline constexpr std::uint32_t kAttributeSystem = 0x04;
inline constexpr std::uint32_t kAttributeArchive = 0x20;

/// Whether `path` may name something in a bundle: segments divided by "/", none of them empty, "."
/// or ".."; no leading slash, no drive colon, no backslash, no control character, at most 1,024
/// characters. Blanks are welcome.
[[nodiscard]] bool IsSafePath(std::string_view path);

/// One file of the bundle, open for reading. What it says about the file was true when it was
/// opened; if the file shrinks later, ReadAt finds its end early.
class SiteFile {
 public:
  SiteFile(int descriptor, std::uint64_t size, std::time_t modified, std::uint32_t attributes,
           std::uint32_t crc32)
      : descriptor_(descriptor),
        size_(size),
        modified_(modified),
        attributes_(attributes),
        crc32_(crc32) {}
  ~SiteFile();
  SiteFile(const SiteFile&) = delete;
  SiteFile& operator=(const SiteFile&) = delete;

  [[nodiscard]] std::uint64_t size() const { return size_; }        ///< bytes, below 2^32
  [[nodiscard]] std::time_t modified() const { return modified_; }  ///< seconds since 1970, UTC
  [[nodiscard]] std::uint32_t attributes() const { return attributes_; }
  [[nodiscard]] std::uint32_t crc32() const { return crc32_; }

  /// Reads up to `size` bytes at `offset`. @return the bytes read, 0 at the end or on an error.
  std::size_t ReadAt(std::uint64_t offset, char* buffer, std::size_t size) const;

 private:
  const int descriptor_;
  const std::uint64_t size_;
  const std::time_t modified_;
  const std::uint32_t attributes_;
  const std::uint32_t crc32_;
};

/// The folder that is served. Nothing outside it is ever opened: unsafe paths are refused, and no
/// symbolic link is followed, wherever in the path it stands. Letter case counts. Only regular
/// files below 4 GiB are served, because a device counts a file's bytes in 32 bits.
///
/// The CRC-32 of a file is computed when it is first opened, in the calling thread, and kept until
/// the file's identity, size or time changes. Warm() does that for all files beforehand, so that no
/// device waits for another one's file. Not for several threads at once.
class Site {
 public:
  explicit Site(std::filesystem::path root) : root_(std::move(root)) {}

  /// Attributes of one file, or, with an empty path, of all files that have none of their own.
  void SetAttributes(const std::string& path, std::uint32_t attributes);

  /// @return the open file, or null: no such file, or not one that may be served.
  [[nodiscard]] std::unique_ptr<SiteFile> Open(std::string_view path);

  struct Inventory {
    std::size_t files = 0;
    std::uint64_t bytes = 0;
  };
  /// Opens every file once. @return what there is to serve.
  Inventory Warm();

  [[nodiscard]] const std::filesystem::path& root() const { return root_; }

 private:
  /// Device, inode, size, seconds and nanoseconds of the last change: another content shows here.
  using FileKey =
      std::tuple<std::uint64_t, std::uint64_t, std::uint64_t, std::int64_t, std::int64_t>;

  std::filesystem::path root_;
  std::uint32_t default_attributes_ = kAttributeArchive;
  std::map<std::string, std::uint32_t, std::less<>> attributes_;
  std::map<std::string, std::pair<FileKey, std::uint32_t>, std::less<>> checksums_;
};

}  // namespace server
