#include "upgrade/package/cabinet.h"

#include <cstring>

#include "base/little_endian.h"
#include "base/text.h"
#include "upgrade/package/setup_file.h"

namespace upgrade {
namespace {

// The format's records. Names of fields and sizes are those of its description.
constexpr std::size_t kHeaderSize = 36;
constexpr std::size_t kReserveSizesSize = 4;
constexpr std::size_t kFolderSize = 8;
constexpr std::size_t kFileSize = 16;
constexpr std::size_t kDataSize = 8;
constexpr std::size_t kLongestFileName = 256;  ///< with its end
constexpr std::uint16_t kReservePresent = 0x0004;
/// Folder numbers from here on stand for a file that begins or goes on in another cabinet.
constexpr std::uint16_t kFirstOfOtherCabinet = 0xFFFD;

/// Where the tables of a cabinet stand.
struct Layout {
  std::uint32_t files = 0;
  std::uint32_t file_count = 0;
  std::uint32_t folders = kHeaderSize;
  std::uint32_t folder_size = kFolderSize;
  std::uint32_t data_head_size = kDataSize;
};

PackageResult ReadReserves(std::string_view cabinet, Layout* layout) noexcept {
  std::uint8_t sizes[kReserveSizesSize];
  const PackageResult result = ReadAt(cabinet, kHeaderSize, sizes, sizeof sizes);
  if (result != PackageResult::kDone) return result;
  layout->folders += static_cast<std::uint32_t>(kReserveSizesSize + base::Little16(sizes));
  layout->folder_size += sizes[2];
  layout->data_head_size += sizes[3];
  return PackageResult::kDone;
}

PackageResult ReadLayout(std::string_view cabinet, Layout* layout) noexcept {
  std::uint8_t header[kHeaderSize];
  const PackageResult result = ReadAt(cabinet, 0, header, sizeof header);
  if (result != PackageResult::kDone) return result;
  if (!base::StartsWith(cabinet, "MSCF")) return PackageResult::kNoCabinet;
  layout->files = base::Little32(header + 16);       // coffFiles
  layout->file_count = base::Little16(header + 28);  // cFiles
  const std::uint16_t flags = base::Little16(header + 30);
  return (flags & kReservePresent) == 0 ? PackageResult::kDone : ReadReserves(cabinet, layout);
}

/// Reads the folder number of the file record at `*at` and moves on to the next record.
PackageResult TakeFile(std::string_view cabinet, std::uint64_t* at,
                       std::uint16_t* folder) noexcept {
  std::uint8_t record[kFileSize];
  const PackageResult result = ReadAt(cabinet, *at, record, sizeof record);
  if (result != PackageResult::kDone) return result;
  *folder = base::Little16(record + 8);  // iFolder
  const std::string_view name =
      base::Part(cabinet, static_cast<std::size_t>(*at) + kFileSize, kLongestFileName);
  const std::size_t end = name.find('\0');
  if (end == std::string_view::npos) return PackageResult::kCannotRead;
  *at += kFileSize + end + 1;
  return PackageResult::kDone;
}

/// Whether the folder begins with a setup file.
bool FolderHasSetupFile(std::string_view cabinet, const Layout& layout, std::uint16_t folder,
                        StoredFile* found) noexcept {
  std::uint8_t record[kFolderSize];
  const std::uint64_t at = layout.folders + std::uint64_t{folder} * layout.folder_size;
  if (ReadAt(cabinet, at, record, sizeof record) != PackageResult::kDone) return false;
  const std::uint32_t block = base::Little32(record);  // coffCabStart
  std::uint8_t data[kDataSize];
  if (ReadAt(cabinet, block, data, sizeof data) != PackageResult::kDone) return false;
  *found = StoredFile(cabinet, std::uint64_t{block} + layout.data_head_size,
                      base::Little16(data + 4) /* cbData */, layout.data_head_size);
  return SetupFile::IsOne(*found);
}

}  // namespace

PackageResult ReadAt(std::string_view bytes, std::uint64_t offset, void* out,
                     std::size_t size) noexcept {
  if (offset > bytes.size()) return PackageResult::kCannotSeek;
  if (size > bytes.size() - offset) return PackageResult::kCannotRead;
  if (size > 0) std::memcpy(out, bytes.data() + offset, size);
  return PackageResult::kDone;
}

PackageResult StoredFile::Read(std::uint64_t offset, void* out, std::size_t size) const noexcept {
  if (whole_) return ReadAt(cabinet_, start_ + offset, out, size);
  auto* to = static_cast<std::uint8_t*>(out);
  PackageResult result = PackageResult::kDone;
  while (result == PackageResult::kDone && size > 0) {
    const auto room = static_cast<std::size_t>(kBlockSize - offset % kBlockSize);
    const std::size_t part = size < room ? size : room;
    result = ReadAt(cabinet_, start_ + offset + offset / kBlockSize * head_size_, to, part);
    to += part;
    offset += part;
    size -= part;
  }
  return result;
}

PackageResult FindSetupFile(std::string_view cabinet, StoredFile* found) noexcept {
  Layout layout;
  PackageResult result = ReadLayout(cabinet, &layout);
  std::uint64_t at = layout.files;
  std::uint16_t looked_at = kFirstOfOtherCabinet;  // the files of a folder stand together
  for (std::uint32_t i = 0; result == PackageResult::kDone && i < layout.file_count; ++i) {
    std::uint16_t folder = 0;
    result = TakeFile(cabinet, &at, &folder);
    if (result != PackageResult::kDone || folder == looked_at) continue;
    looked_at = folder;
    if (folder < kFirstOfOtherCabinet && FolderHasSetupFile(cabinet, layout, folder, found)) {
      return PackageResult::kDone;
    }
  }
  return result == PackageResult::kDone ? PackageResult::kNoSetupFile : result;
}

}  // namespace upgrade
