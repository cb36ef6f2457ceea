#include "tools/client/upgrade_client.h"

#include <coredll.h>

#include "orvenix/upgrade_config.h"
#include "orvenix/upgrade_thread.h"

namespace {

/// Everything by HTTP, with the job's tests and cleanup: nobody has prepared the device.
constexpr std::int32_t kUpgradeClientMode = 1;

}  // namespace

extern "C" __attribute__((visibility("default"))) bool StartUpgradeClient(const char16_t* name,
                                                                          UpgradeClientJob* told) {
  auto* const job = new UpgradeConfig;
  if (job == nullptr) return false;
  told->loaded = job->LoadFromFile(name);
  told->packages_seen = job->GetFirmwarePackageCount();
  told->packages = static_cast<std::int32_t>(job->FirmwarePackages().size());
  told->downloads = static_cast<std::int32_t>(job->DownloadFiles().size());
  told->multi_pass = job->IsMultiPass();
  HANDLE const thread = told->loaded == 0 ? nullptr : StartUpgradeThread(job, kUpgradeClientMode);
  if (thread == nullptr) {
    delete job;
    return false;
  }
  CloseHandle(thread);
  return true;
}
