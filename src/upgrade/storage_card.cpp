#include "upgrade/storage_card.h"

#include "base/text.h"
#include "device/file.h"
#include "upgrade/list_file/package_options.h"
#include "upgrade/pass_state.h"

namespace upgrade {
namespace {

bool CardFreeBytes(std::uint64_t* bytes) noexcept {
  device::File card;
  return card.GetFreeSpace("\\SDMMC Disk\\SubFolder", bytes) ||
         card.GetFreeSpace("\\Storage Card\\SubFolder", bytes);
}

}  // namespace

bool IsOnCard(std::string_view path) noexcept {
  for (const std::string_view folder : kCardFolders) {
    if (base::StartsWith(path, folder)) return true;
  }
  return false;
}

bool FindStorageCard(const UpgradeConfig& job, std::int32_t pass,
                     std::string_view prefix) noexcept {
  for (const FirmwarePackage* package : job.FirmwarePackages()) {
    if (package == nullptr || !IsInPass(job, *package, pass)) continue;
    const DiskNeed need = PackageDiskNeed(base::FieldView(package->additional_parameters));
    if (need.bytes == 0 || !base::StartsWith(need.folder.view(), prefix)) continue;
    std::uint64_t free_bytes = 0;
    const auto needed = static_cast<std::uint64_t>(static_cast<std::int64_t>(need.bytes));
    if (CardFreeBytes(&free_bytes) && free_bytes > needed) return true;
  }
  return false;
}

bool ProbeStorageCards(const UpgradeConfig& job, std::int32_t pass) noexcept {
  for (const std::string_view folder : kCardFolders) {
    if (FindStorageCard(job, pass, folder)) return true;
  }
  return false;
}

}  // namespace upgrade
