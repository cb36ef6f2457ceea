#include "server/site.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstddef>
#include <optional>
#include <system_error>
#include <utility>
#include <vector>

#include "base/crc32.h"

namespace server {
namespace {

constexpr std::size_t kMaxPath = 1024;
constexpr std::size_t kReadBlock = 65536;

class Descriptor {
 public:
  explicit Descriptor(int value) : value_(value) {}
  ~Descriptor() { Replace(-1); }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  [[nodiscard]] int get() const { return value_; }
  void Replace(int value) {
    if (value_ >= 0) ::close(value_);
    value_ = value;
  }
  int Release() { return std::exchange(value_, -1); }

 private:
  int value_;
};

/// Opens `path` below `root`, folder by folder, so that no link can lead out on the way.
int OpenBeneath(const std::filesystem::path& root, std::string_view path) {
  // Non-blocking: a pipe somebody left in the folder must not stop the server.
  constexpr int kFileFlags = O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
  Descriptor folder(::open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  while (folder.get() >= 0) {
    const std::size_t slash = path.find('/');
    const std::string name(path.substr(0, slash));
    if (slash == std::string_view::npos) return ::openat(folder.get(), name.c_str(), kFileFlags);
    folder.Replace(
        ::openat(folder.get(), name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW));
    path.remove_prefix(slash + 1);
  }
  return -1;
}

std::size_t ReadSome(int descriptor, std::uint64_t offset, char* buffer, std::size_t size) {
  for (;;) {
    const ssize_t got = ::pread(descriptor, buffer, size, static_cast<off_t>(offset));
    if (got >= 0) return static_cast<std::size_t>(got);
    if (errno != EINTR) return 0;
  }
}

/// CRC-32 of the first `size` bytes; nothing when the file ends before.
std::optional<std::uint32_t> Checksum(int descriptor, std::uint64_t size) {
  std::vector<char> block(kReadBlock);
  base::Crc32 crc;
  for (std::uint64_t offset = 0; offset < size;) {
    const std::size_t got = ReadSome(descriptor, offset, block.data(), block.size());
    if (got == 0) return std::nullopt;
    crc.Update(block.data(), got);
    offset += got;
  }
  return crc.value();
}

}  // namespace

bool IsSafePath(std::string_view path) {
  if (path.empty() || path.size() > kMaxPath) return false;
  for (const char letter : path) {
    const auto code = static_cast<unsigned char>(letter);
    if (code < ' ' || code == 0x7F || letter == ':' || letter == '\\') return false;
  }
  for (std::size_t start = 0; start <= path.size();) {
    const std::size_t slash = path.find('/', start);
    const std::size_t end = slash == std::string_view::npos ? path.size() : slash;
    const std::string_view segment = path.substr(start, end - start);
    if (segment.empty() || segment == "." || segment == "..") return false;
    start = end + 1;
  }
  return true;
}

SiteFile::~SiteFile() {
  ::close(descriptor_);
}

std::size_t SiteFile::ReadAt(std::uint64_t offset, char* buffer, std::size_t size) const {
  return ReadSome(descriptor_, offset, buffer, size);
}

void Site::SetAttributes(const std::string& path, std::uint32_t attributes) {
  if (path.empty()) {
    default_attributes_ = attributes;
  } else {
    attributes_[path] = attributes;
  }
}

std::unique_ptr<SiteFile> Site::Open(std::string_view path) {
  if (!IsSafePath(path)) return nullptr;
  Descriptor file(OpenBeneath(root_, path));
  struct stat status {};
  if (file.get() < 0 || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
    return nullptr;
  }
  const auto size = static_cast<std::uint64_t>(status.st_size);
  if (size > UINT32_MAX) return nullptr;
  const FileKey key{status.st_dev, status.st_ino, size, status.st_mtim.tv_sec,
                    status.st_mtim.tv_nsec};
  auto known = checksums_.find(path);
  if (known == checksums_.end() || known->second.first != key) {
    const auto crc = Checksum(file.get(), size);
    if (!crc) return nullptr;  // it is being cut at this moment
    known = checksums_.insert_or_assign(std::string(path), std::pair{key, *crc}).first;
  }
  const auto own = attributes_.find(path);
  const std::uint32_t attributes = own == attributes_.end() ? default_attributes_ : own->second;
  return std::make_unique<SiteFile>(file.Release(), size, status.st_mtim.tv_sec, attributes,
                                    known->second.second);
}

Site::Inventory Site::Warm() {
  Inventory inventory;
  std::error_code error;
  const auto options = std::filesystem::directory_options::skip_permission_denied;
  for (std::filesystem::recursive_directory_iterator at(root_, options, error), end;
       !error && at != end; at.increment(error)) {
    const auto file = Open(at->path().lexically_relative(root_).generic_string());
    if (file == nullptr) continue;
    ++inventory.files;
    inventory.bytes += file->size();
  }
  return inventory;
}

}  // namespace server
