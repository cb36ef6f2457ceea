#include "configlet/groups.h"

#include <cstddef>
#include <string_view>

#include "base/text.h"
#include "configlet/start_up.h"
#include "configlet/walk.h"
#include "report/log/log.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {
namespace {

// ---- the whole job ----

/// A job left from an earlier walk is not freed: its upgrade thread may own it.
IcfgResult BeginTop(Walk& walk, std::uint32_t mode) noexcept {
  if (mode != 0) return IcfgResult::kOk;
  report::Log("Allocating gpUpgCfg\r\n");
  auto* const job = new UpgradeConfig;
  const WalkLock lock;
  walk.job = job;
  ++walk.jobs;
  walk.job_started = false;
  walk.download_file.Forget();
  walk.storage.Forget();
  walk.registry_test.Forget();
  return IcfgResult::kOk;
}

IcfgResult BeginUpgrade(Walk& /*walk*/, std::uint32_t /*mode*/) noexcept {
  if (upgrade::TryBeginUpgrade()) return IcfgResult::kOk;
  report::Log("Upgrade already in progress\r\n");
  return IcfgResult::kUpgradeRunning;
}

// ---- groups that only say where the host is ----

template <bool Walk::*in_group>
IcfgResult Enter(Walk& walk, std::uint32_t /*mode*/) noexcept {
  walk.*in_group = true;
  return IcfgResult::kOk;
}

template <bool Walk::*in_group>
IcfgResult Leave(Walk& walk) noexcept {
  walk.*in_group = false;
  return IcfgResult::kOk;
}

// ---- groups that fill a record ----

/// Hands the current record to the job's list. It stays current, so that fields which the host
/// sends late still reach it, unless the job had no memory to list it.
template <typename Record>
void HandOver(Walk& walk, CurrentRecord<Record>& current,
              void (UpgradeConfig::*add)(Record*) noexcept,
              const orvenix::PointerList<Record>& (UpgradeConfig::*list)()
                  const noexcept) noexcept {
  const std::size_t before = (walk.open_job()->*list)().size();
  (walk.open_job()->*add)(current.get());
  current.HandedOver();
  if ((walk.open_job()->*list)().size() == before) current.Forget();
}

IcfgResult BeginDownloadFile(Walk& walk) noexcept {
  const WalkLock lock;
  walk.download_file.Begin();
  return IcfgResult::kOk;
}

IcfgResult BeginFileList(Walk& walk, std::uint32_t /*mode*/) noexcept {
  walk.in_file_list = true;
  return BeginDownloadFile(walk);
}

IcfgResult EndFileList(Walk& walk) noexcept {
  walk.in_file_list = false;
  const WalkLock lock;
  if (walk.open_job() == nullptr || walk.download_file.get() == nullptr) return IcfgResult::kOk;
  walk.open_job()->AddMCFileList(walk.download_file.get());
  walk.download_file.HandedOver();
  return IcfgResult::kOk;
}

void ResetCleanup(Walk& walk) noexcept {
  walk.cleanup_action = Walk::kNoAction;
  walk.cleanup_name.Clear();
}

/// Inside "FileList" but outside "Download" nothing begins: the fields go to the list's record.
IcfgResult BeginFile(Walk& walk, std::uint32_t /*mode*/) noexcept {
  if (walk.in_download) return BeginDownloadFile(walk);
  ResetCleanup(walk);
  return IcfgResult::kOk;
}

void EndCleanupFile(Walk& walk) noexcept {
  if (walk.open_job() != nullptr && !walk.cleanup_name.empty()) {
    if (walk.cleanup_action == Walk::kSave) walk.open_job()->AddFileSave(walk.cleanup_name.c_str());
    if (walk.cleanup_action == Walk::kDelete)
      walk.open_job()->AddFileDelete(walk.cleanup_name.c_str());
  }
  ResetCleanup(walk);
}

IcfgResult EndFile(Walk& walk) noexcept {
  const WalkLock lock;
  if (walk.in_disk_cleanup) {
    EndCleanupFile(walk);
  } else if (walk.in_download && walk.open_job() != nullptr &&
             walk.download_file.get() != nullptr) {
    HandOver(walk, walk.download_file, &UpgradeConfig::AddDownloadFile,
             &UpgradeConfig::DownloadFiles);
  }
  return IcfgResult::kOk;
}

IcfgResult BeginStore(Walk& walk, std::uint32_t /*mode*/) noexcept {
  const WalkLock lock;
  walk.storage.Begin();
  return IcfgResult::kOk;
}

IcfgResult EndStore(Walk& walk) noexcept {
  const WalkLock lock;
  if (walk.open_job() != nullptr && walk.storage.get() != nullptr) {
    HandOver(walk, walk.storage, &UpgradeConfig::AddStorageReqEntry,
             &UpgradeConfig::StorageRequirements);
  }
  return IcfgResult::kOk;
}

IcfgResult BeginRegistry(Walk& walk, std::uint32_t /*mode*/) noexcept {
  const WalkLock lock;
  tagRegistryTest* const test = walk.registry_test.Begin();
  if (test == nullptr) return IcfgResult::kOk;
  base::CopyText(test->root, "HKEY_LOCAL_MACHINE");
  // KEPT ODDITY: no test has a type of this name, so a host that leaves the type out gets a test
  // that always fails.
  base::CopyText(test->type, "String");
  return IcfgResult::kOk;
}

/// A test that could not be made is listed all the same, as null: the log then says that it is
/// passed over.
IcfgResult EndRegistry(Walk& walk) noexcept {
  const WalkLock lock;
  if (walk.open_job() != nullptr) {
    HandOver(walk, walk.registry_test, &UpgradeConfig::AddRegistryTest,
             &UpgradeConfig::RegistryTests);
  }
  return IcfgResult::kOk;
}

/// KEPT ODDITY: runs also when the beginning of "Upgrade" was refused or never came. A second end
/// of the same group tests and cleans once more, beside the upgrade that runs: files that this has
/// fetched into a folder of the delete list are gone then.
IcfgResult EndUpgradeGroup(Walk& walk) noexcept {
  return StartJob(walk);
}

constexpr GroupRow kGroups[] = {
    {"Orvenix", BeginTop, nullptr},
    {"Syslog", nullptr, nullptr},
    {"Upgrade", BeginUpgrade, EndUpgradeGroup},
    {"MultiCast", nullptr, nullptr},
    {"MulticastClient", nullptr, nullptr},
    {"HTTPServer", nullptr, nullptr},
    {"Download", Enter<&Walk::in_download>, Leave<&Walk::in_download>},
    {"StorageRequirements", nullptr, nullptr},
    {"Store", BeginStore, EndStore},
    {"DiskCleanup", Enter<&Walk::in_disk_cleanup>, Leave<&Walk::in_disk_cleanup>},
    {"File", BeginFile, EndFile},
    {"FileList", BeginFileList, EndFileList},
    {"AlternateRTWReason", nullptr, nullptr},
    {"StartProcess", Enter<&Walk::in_start_process>, Leave<&Walk::in_start_process>},
    {"StopProcess", nullptr, nullptr},
    {"Process", nullptr, nullptr},
    {"Tests", nullptr, nullptr},
    {"Test", nullptr, nullptr},
    {"Registry", BeginRegistry, EndRegistry},
};

}  // namespace

const GroupRow* FindGroup(std::string_view name) noexcept {
  for (const GroupRow& row : kGroups) {
    if (base::EqualIgnoringCase(row.name, name)) return &row;
  }
  return nullptr;
}

}  // namespace configlet
