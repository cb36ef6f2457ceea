#include "device/file_crc.h"

#include "base/crc32.h"
#include "device/file.h"

namespace device {
namespace {

constexpr std::uint32_t kBlockSize = 4096;

std::uint32_t ErrorOf(const File& file) noexcept {
  return file.last_error() != 0 ? file.last_error() : ERROR_GEN_FAILURE;
}

}  // namespace

std::uint32_t FILECRC32(const char* path, std::uint32_t* crc) noexcept {
  *crc = 0;
  const LocalObject<File> file(new File);
  const LocalBlock<std::uint8_t> block = LocalBlock<std::uint8_t>::Allocate(kBlockSize);
  if (!file || !block) return ERROR_NOT_ENOUGH_MEMORY;
  if (!file->OpenForReading(path, true)) return ErrorOf(*file);
  base::Crc32 sum;
  std::uint32_t taken = 0;
  do {
    if (!file->Read(block.get(), kBlockSize, &taken)) return ErrorOf(*file);
    sum.Update(block.get(), taken);
  } while (taken > 0);
  *crc = sum.value();
  return 0;
}

}  // namespace device
