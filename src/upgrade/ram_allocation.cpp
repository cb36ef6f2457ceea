#include "upgrade/ram_allocation.h"

#include "base/number.h"
#include "base/text.h"
#include "device/flash/ram_file.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/list_file/package_options.h"
#include "upgrade/pass_state.h"
#include "upgrade/paths.h"

namespace upgrade {
namespace {

/// What the driver needs beside the image itself, in bytes.
constexpr std::uint32_t kDriverRoom = 40960;

const tagStorageReq* FirstRamRequirement(const UpgradeConfig& job) noexcept {
  for (const tagStorageReq* requirement : job.StorageRequirements()) {
    if (requirement != nullptr && IsRamName(base::FieldView(requirement->name))) return requirement;
  }
  return nullptr;
}

}  // namespace

void InitRam(const UpgradeConfig& job) noexcept {
  const tagStorageReq* const requirement = FirstRamRequirement(job);
  if (requirement == nullptr) return;
  const base::FixedText<sizeof requirement->required_space> size(
      base::FieldView(requirement->required_space));
  report::Log("Orvenix - InitRAM - RAM needed = %s\r\n", size.c_str());
  const std::uint32_t bytes = base::LeadingNumber(size.view()) + kDriverRoom;
  report::ShowStatus("InitRAM = %d", static_cast<int>(bytes));
  device::SetRAMSize(bytes);
  // KEPT ODDITY: a store that an earlier job has made goes on with its size and with what is in it.
  // An image that does not fit is tried for ever, and what an earlier job flashed is flashed again.
  if (device::HasRAMStore() || device::InitRAMStore()) return;
  report::Log("Orvenix - InitRAM - RAM init error = %s\r\n", size.c_str());
}

void ReadRamAllocation(Run& run) noexcept {
  for (const FirmwarePackage* package : run.job.FirmwarePackages()) {
    if (package == nullptr || !IsInPass(run.job, *package, run.pass)) continue;
    const std::int32_t size = PackageRamSize(base::FieldView(package->additional_parameters));
    // Any number but 0 says that there is an image; a negative or huge one, which only a damaged or
    // hostile file holds, is the driver's to refuse.
    if (size == 0) continue;
    report::ShowStatus("RAMSIZE From parms = %d", size);
    device::SetRAMSize(static_cast<std::uint32_t>(size) + kDriverRoom);
    run.os_image = true;
    return;
  }
}

}  // namespace upgrade
