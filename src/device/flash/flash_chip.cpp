#include "device/flash/flash_chip.h"

#include <coredll.h>

#include "device/handle.h"

namespace device {
namespace {

constexpr DWORD kTellChip = 3000;
/// What the driver answers. Beside the generation it tells the capacity and much of its own.
constexpr DWORD kAnswerSize = 64;
constexpr std::size_t kGenerationAt = 24;

}  // namespace

bool GetFlashChipGeneration(std::uint8_t* generation) noexcept {
  // Shared: the disk's files are in use meanwhile.
  const FileHandle disk(CreateFileW(TEXT("DSK0:"), GENERIC_READ | GENERIC_WRITE,
                                    FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING,
                                    FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!disk) return false;
  std::uint8_t answer[kAnswerSize] = {};
  DWORD returned = 0;
  const BOOL answered =
      DeviceIoControl(disk.get(), kTellChip, nullptr, 0, answer, kAnswerSize, &returned, nullptr);
  if (answered == FALSE || returned <= kGenerationAt) return false;
  *generation = answer[kGenerationAt];
  return true;
}

}  // namespace device
