#include "server/multicast_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <system_error>
#include <vector>

#include "mcftp/wire/frames.h"

namespace server {
namespace {

/// Reads in larger pieces than a block: blocks are mostly asked for in order.
class DiskContent final : public FileContent {
 public:
  explicit DiskContent(const std::filesystem::path& path)
      : file_(::open(path.c_str(), O_RDONLY | O_CLOEXEC)) {
    if (file_ < 0) throw std::system_error(errno, std::generic_category(), path.string());
    struct stat about {};
    if (::fstat(file_, &about) != 0 || !S_ISREG(about.st_mode) || about.st_size > UINT32_MAX) {
      ::close(file_);
      throw std::system_error(EFBIG, std::generic_category(),
                              path.string() + ": not a file of less than 4 GiB");
    }
    size_ = static_cast<std::uint32_t>(about.st_size);
  }
  ~DiskContent() override { ::close(file_); }

  [[nodiscard]] std::uint32_t size() const override { return size_; }

  [[nodiscard]] bool Read(std::uint32_t offset, std::size_t size, std::uint8_t* out) override {
    if (offset > size_ || size > size_ - offset) return false;
    while (size > 0) {
      if (!Fill(offset)) return false;
      const std::size_t at = offset - held_from_;
      const std::size_t some = std::min(size, held_ - at);
      std::memcpy(out, piece_.data() + at, some);
      out += some;
      offset += static_cast<std::uint32_t>(some);
      size -= some;
    }
    return true;
  }

 private:
  static constexpr std::size_t kPiece = 65536;

  /// Makes the piece hold the byte at `offset`.
  bool Fill(std::uint32_t offset) {
    if (offset >= held_from_ && offset - held_from_ < held_) return true;
    piece_.resize(kPiece);
    held_from_ = offset;
    const ssize_t got = ::pread(file_, piece_.data(), piece_.size(), offset);
    held_ = got > 0 ? static_cast<std::size_t>(got) : 0;
    return held_ > 0;
  }

  const int file_;
  std::uint32_t size_ = 0;
  std::vector<std::uint8_t> piece_;
  std::uint32_t held_from_ = 0;  ///< offset of the piece in the file
  std::size_t held_ = 0;         ///< bytes in it
};

class BytesContent final : public FileContent {
 public:
  explicit BytesContent(std::string bytes) : bytes_(std::move(bytes)) {}

  [[nodiscard]] std::uint32_t size() const override {
    return static_cast<std::uint32_t>(bytes_.size());
  }
  [[nodiscard]] bool Read(std::uint32_t offset, std::size_t size, std::uint8_t* out) override {
    if (offset > bytes_.size() || size > bytes_.size() - offset) return false;
    if (size > 0) std::memcpy(out, bytes_.data() + offset, size);
    return true;
  }

 private:
  const std::string bytes_;
};

/// The longest list of masks whose announcement fits one Ethernet frame with any name.
constexpr std::size_t kMaxMasks = 1000;
/// Bytes of the largest block: its frame has to fit a datagram, enciphered too.
constexpr std::uint32_t kMaxBlockSize = 65000;

}  // namespace

std::unique_ptr<FileContent> OpenContent(const std::filesystem::path& path) {
  return std::make_unique<DiskContent>(path);
}

std::unique_ptr<FileContent> MemoryContent(std::string bytes) {
  return std::make_unique<BytesContent>(std::move(bytes));
}

std::string Objection(const MulticastFile& file) {
  if (file.content == nullptr) return "has no content";
  if (file.device_path.empty()) return "has no path on the device";
  if (file.device_path.size() > mcftp::kMaxFileName) {
    return "has a path of more than " + std::to_string(mcftp::kMaxFileName) + " characters";
  }
  if (file.masks.size() > kMaxMasks) {
    return "has masks of more than " + std::to_string(kMaxMasks) + " characters";
  }
  if (file.time_stamp.size() > mcftp::kTimeStampWidth) {
    return "has a time stamp of more than 20 characters";
  }
  if (file.device_path.find('\0') != std::string::npos ||
      file.masks.find('\0') != std::string::npos) {
    return "has a text with a zero inside";
  }
  if (file.content->size() > kMaxBlockSize * mcftp::kMaxBlocks) {
    return "is larger than " + std::to_string(kMaxBlockSize * mcftp::kMaxBlocks) + " bytes";
  }
  return "";
}

Blocking ChooseBlocks(std::uint32_t size, std::uint16_t wished) {
  const std::uint32_t least = size / mcftp::kMaxBlocks + (size % mcftp::kMaxBlocks != 0 ? 1 : 0);
  const std::uint32_t block_size =
      std::min(std::max<std::uint32_t>({wished, least, 1}), kMaxBlockSize);
  Blocking blocks;
  blocks.block_size = static_cast<std::uint16_t>(block_size);
  blocks.block_count = size / block_size + (size % block_size != 0 ? 1 : 0);
  return blocks;
}

}  // namespace server
