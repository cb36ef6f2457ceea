// A whole file seen as memory.
#pragma once

#include <coredll.h>

#include <string_view>

#include "device/handle.h"

namespace device {

/// Maps a file for reading while it exists. The bytes have no terminator behind them.
class MappedFile {
 public:
  /// @param path  at most 259 characters; no file has a longer one
  explicit MappedFile(const char* path) noexcept;
  ~MappedFile();
  MappedFile(const MappedFile&) = delete;
  MappedFile& operator=(const MappedFile&) = delete;

  /// Whether the file could be opened, mapped or not.
  [[nodiscard]] bool is_open() const noexcept { return static_cast<bool>(file_); }
  /// Empty when the file is, or could not be mapped.
  [[nodiscard]] std::string_view bytes() const noexcept { return bytes_; }

 private:
  FileHandle file_;
  MappingHandle mapping_;
  std::string_view bytes_;
};

}  // namespace device
