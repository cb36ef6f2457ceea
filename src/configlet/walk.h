// Where the host stands in its settings tree, and what it is filling there.
#pragma once

#include <coredll.h>

#include <cstdint>

#include "base/text.h"
#include "device/lock.h"
#include "orvenix/upgrade_config.h"

namespace configlet {

/// A record that the host fills before and, because it may go on, after the job has taken it over.
/// Until then it is freed here.
template <typename Record>
class CurrentRecord {
 public:
  [[nodiscard]] Record* get() const noexcept { return record_; }

  /// Makes a new record, all zero. @return null, with nothing current, when there is no memory.
  Record* Begin() noexcept {
    Forget();
    record_ = static_cast<Record*>(LocalAlloc(LPTR, sizeof(Record)));
    is_ours_ = record_ != nullptr;
    return record_;
  }

  /// Notes that the job owns the record now. It stays current.
  void HandedOver() noexcept { is_ours_ = false; }

  void Forget() noexcept {
    if (is_ours_) LocalFree(record_);
    record_ = nullptr;
    is_ours_ = false;
  }

  /// To be called before the job's records are freed.
  void ForgetJobs() noexcept {
    if (!is_ours_) record_ = nullptr;
  }

 private:
  Record* record_ = nullptr;
  bool is_ours_ = false;
};

/// The module's state between the host's calls. Touched by the host's thread only, except that an
/// upgrade thread takes away what it frees; hold a WalkLock for `job` and the current records.
struct Walk {
  base::FixedText<128> group;    ///< begun most recently; its end does not bring the parent back
  UpgradeConfig* job = nullptr;  ///< being filled, and still after it was started
  std::uint32_t jobs = 0;        ///< begun so far: tells one job from a later one in its place
  bool job_started = false;      ///< an upgrade thread reads `job`: nothing more goes into it
  bool in_file_list = false;
  bool in_disk_cleanup = false;
  bool in_download = false;
  bool in_start_process = false;
  CurrentRecord<tagDownloadFile> download_file;
  CurrentRecord<tagStorageReq> storage;
  CurrentRecord<tagRegistryTest> registry_test;
  base::FixedText<260> cleanup_name;
  char cleanup_action = kNoAction;

  /// The job as long as it may be filled. Hold a WalkLock.
  [[nodiscard]] UpgradeConfig* open_job() const noexcept { return job_started ? nullptr : job; }

  /// The job that was the `number`-th to begin, null when it is not this walk's any more. Hold a
  /// WalkLock.
  [[nodiscard]] UpgradeConfig* numbered_job(std::uint32_t number) const noexcept {
    return jobs == number ? job : nullptr;
  }

  static constexpr char kNoAction = ' ';
  static constexpr char kDelete = 'D';
  static constexpr char kSave = 'S';
};

/// The one walk of this module.
Walk& TheWalk() noexcept;

/// Keeps the upgrade thread from freeing the job for the length of a scope, which may be as long as
/// it takes to test, clean and measure a device: an upgrade thread at its end, and a host that
/// calls on another thread, then wait. No call that could come back to the host or wait for another
/// thread's end is made under it.
class [[nodiscard]] WalkLock {
 public:
  WalkLock() noexcept;

 private:
  device::LockGuard guard_;
};

/// Forgets a job that its upgrade thread is about to free, and its records.
void ForgetJob(const UpgradeConfig* job) noexcept;

}  // namespace configlet
