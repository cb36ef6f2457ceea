#include "upgrade/storage_check.h"

#include <coredll.h>

#include "base/number.h"
#include "device/wide_text.h"
#include "orvenix/upgrade_config.h"
#include "report/log/log.h"
#include "upgrade/paths.h"

namespace upgrade {
namespace {

/// What the root folder can take in bytes: it grows into the memory of programs.
std::uint64_t RootFreeBytes() noexcept {
  MEMORYSTATUS memory = {};
  memory.dwLength = sizeof memory;
  GlobalMemoryStatus(&memory);
  STORE_INFORMATION store = {};
  if (GetStoreInformation(&store) == 0) store.dwFreeSize = 0;
  return static_cast<std::uint64_t>(memory.dwAvailPhys) + store.dwFreeSize;
}

bool IsMet(const tagStorageReq& requirement, std::uint64_t root_free,
           std::uint32_t* total) noexcept {
  const PathText name(base::FieldView(requirement.name));
  const std::int32_t size = base::LeadingInt(base::FieldView(requirement.required_space));
  if (IsRamName(name.view())) {
    *total += static_cast<std::uint32_t>(size);
    return true;
  }
  report::Log("Orvenix - CheckSpace, %s\r\n", name.c_str());
  const device::WideText<kPathSize> folder(name.view());
  ULARGE_INTEGER free_bytes = {};
  if (GetDiskFreeSpaceExW(folder.c_str(), nullptr, nullptr, &free_bytes) == 0) return false;
  *total += static_cast<std::uint32_t>(size);
  const std::uint64_t available = name.view() == "\\" ? root_free : free_bytes.QuadPart;
  // A size with its top bit set counts as far too large, not as negative.
  return available > static_cast<std::uint64_t>(static_cast<std::int64_t>(size));
}

}  // namespace

bool CheckSpace(const UpgradeConfig& job, std::uint32_t* total) noexcept {
  const std::uint64_t root_free = RootFreeBytes();
  *total = 0;
  bool met = false;
  for (const tagStorageReq* requirement : job.StorageRequirements()) {
    if (requirement != nullptr) met = IsMet(*requirement, root_free, total);
  }
  return met;
}

}  // namespace upgrade
