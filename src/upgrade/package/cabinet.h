// Cabinets: where the data of their files begin, and how they are read.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "upgrade/package/package_result.h"

namespace upgrade {

/// Copies `size` bytes of `bytes`, from `offset` on; nothing when they are not all there.
[[nodiscard]] PackageResult ReadAt(std::string_view bytes, std::uint64_t offset, void* out,
                                   std::size_t size) noexcept;

/// A file of a cabinet that is stored as it is. Data come in blocks of 32 KiB, each behind a head
/// of its own, which is left out here. The cabinet's bytes must outlive it.
class StoredFile {
 public:
  StoredFile() noexcept = default;
  /// @param start       of the file's first byte within the cabinet
  /// @param block_size  bytes in the first block
  /// @param head_size   bytes of a block's head
  StoredFile(std::string_view cabinet, std::uint64_t start, std::uint32_t block_size,
             std::uint32_t head_size) noexcept
      : cabinet_(cabinet), start_(start), whole_(block_size != kBlockSize), head_size_(head_size) {}

  /// Copies bytes of the file. Nobody says where it ends: behind it stands what the cabinet has.
  [[nodiscard]] PackageResult Read(std::uint64_t offset, void* out,
                                   std::size_t size) const noexcept;

 private:
  static constexpr std::uint32_t kBlockSize = 32768;  ///< of every block but the last

  std::string_view cabinet_;
  std::uint64_t start_ = 0;
  bool whole_ = true;  ///< the first block is the only one
  std::uint32_t head_size_ = 0;
};

/// Looks for the setup file of a package: the first file whose folder's first bytes say so. Only
/// data that are stored uncompressed can say it. Goes once over the cabinet's files, whatever their
/// number.
/// @param cabinet  any bytes
[[nodiscard]] PackageResult FindSetupFile(std::string_view cabinet, StoredFile* found) noexcept;

}  // namespace upgrade
