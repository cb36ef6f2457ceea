#include "client.h"

#include <coredll.h>
#include <orvenix/upgrade_config.h>
#include <orvenix/upgrade_thread.h>

#include <cstdlib>
#include <cstring>
#include <string>

namespace {

constexpr std::int32_t kUpgradeClientMode = 1;

/// Room for the terminating zero is left: the records come zeroed.
template <std::size_t kSize>
void Put(char (&field)[kSize], const char* text) {
  std::strncpy(field, text, kSize - 1);
}

/// The job frees its records itself, so they come from the device's heap.
template <typename Record>
Record* NewRecord() {
  return static_cast<Record*>(LocalAlloc(LPTR, sizeof(Record)));
}

UpgradeConfig* MakeJob(const Wanted& wanted) {
  auto* const job = new UpgradeConfig;
  auto* const store = NewRecord<tagStorageReq>();
  auto* const file = NewRecord<tagDownloadFile>();
  if (job == nullptr || store == nullptr || file == nullptr) {
    delete job;
    LocalFree(store);
    LocalFree(file);
    return nullptr;
  }
  Put(store->name, "\\");
  Put(store->required_space, "1");
  Put(file->source, wanted.source);
  Put(file->destination, wanted.destination);
  Put(file->crc, wanted.crc);
  Put(file->masks, "*");
  job->AddStorageReqEntry(store);
  job->AddDownloadFile(file);
  job->SetBaseURL((std::string("http://") + wanted.server).c_str());
  job->SetHTTPIPAddress(wanted.server);
  job->SetHTTPPort(std::atoi(wanted.port));
  job->SetShowGUI(0);
  return job;
}

}  // namespace

bool Fetch(const Wanted& wanted) {
  UpgradeConfig* const job = MakeJob(wanted);
  if (job == nullptr) return false;
  // From here on the upgrade owns the job.
  HANDLE const thread = StartUpgradeThread(job, kUpgradeClientMode);
  if (thread == nullptr) {
    delete job;
    return false;
  }
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  return true;
}
