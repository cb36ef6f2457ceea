#include "upgrade/upgrade_thread.h"

#include <coredll.h>

#include <atomic>

#include "base/format.h"
#include "configlet/version/version.h"
#include "device/handle.h"
#include "http/job_client.h"
#include "orvenix/upgrade_thread.h"
#include "report/log/log.h"
#include "report/messages/message_link.h"
#include "report/window/progress_window.h"
#include "upgrade/cleanup.h"
#include "upgrade/file_lists.h"
#include "upgrade/flash_step.h"
#include "upgrade/keep_awake.h"
#include "upgrade/loader_images.h"
#include "upgrade/memory_division.h"
#include "upgrade/multicast_launch.h"
#include "upgrade/pass_state.h"
#include "upgrade/phases.h"
#include "upgrade/progress.h"
#include "upgrade/ram_allocation.h"
#include "upgrade/registry_tests.h"
#include "upgrade/run.h"
#include "upgrade/run_state/run_state.h"
#include "upgrade/start_upgrade.h"
#include "upgrade/storage_card.h"
#include "upgrade/turn.h"

namespace upgrade {
namespace {

using report::Log;
using report::SetOverallProgress;
using report::ShowStatus;

/// How long a host waits, at most, for the end of an earlier job.
constexpr std::uint32_t kHostWaitMs = 10000;
constexpr DWORD kPauseMs = 2000;

std::atomic<void (*)(const UpgradeConfig*)> job_freed_listener{nullptr};

/// The event that other programs of the device look for while an upgrade runs.
class InProgressEvent {
 public:
  InProgressEvent() noexcept
      : event_(CreateEventW(nullptr, FALSE, FALSE, TEXT("TW_UPGRADE_IN_PROGRESS"))) {
    if (event_) {
      Log("Orvenix - CretaeUpgradeInProgressEvent - Success\r\n");
    } else {
      Log("Orvenix - CretaeUpgradeInProgressEvent - error, %d\r\n",
          static_cast<int>(GetLastError()));
    }
  }

  void Delete() noexcept {
    event_.Reset();
    Log("Orvenix - DeleteUpgradeInProgressEvent\r\n");
  }

 private:
  device::EventHandle event_;
};

/// Forgets what an earlier job counted.
void ResetCounters(const Handover& handed) noexcept {
  http::BundleRx.store(0, std::memory_order_relaxed);
  http::HttpFallback.store(handed.mode == 0 ? 1 : 0, std::memory_order_relaxed);
  BeginReceiving(handed.expected_bytes);
}

void PauseForTheEye(const UpgradeConfig& job) noexcept {
  if (job.GetShowGUI() == 1) Sleep(kPauseMs);
}

/// First what a server sends to many devices at once. What does not arrive, or not whole, is left
/// to the phases that follow.
void ReceiveByMulticast(const UpgradeConfig& job) noexcept {
  if (job.GetMCProcessParms()[0] == '\0') return;
  ShowStatus("Starting FileXfer");
  Log("Orvenix - UpgradeThread - StartMulticastClient\r\n");
  RunMulticastTransfer(job);
  Log("Multicast complete - main logic...");
  report::SetFileProgress(0);
}

/// Everything by HTTP, for a caller from outside the configlet: nobody has looked at the device
/// before. Files are counted before it is cleaned, for which the INF file is fetched once more.
///
/// KEPT ODDITY: some lines have no end: the next one stands right behind "UpgradeClient Mode..."
/// and "Processing OS files...", here as behind "Multicast complete - main logic..." and "Multicast
/// Fallback Mode...".
void RunAsUpgradeClient(Run& run) noexcept {
  Log("UpgradeClient Mode...");
  run.succeeded = PerformTests(run.job, run.error_text.data(), run.error_text.capacity());
  if (!run.succeeded) return;
  CountFiles(run);
  ShowStatus("Cleaning device...");
  CleanUpDevice(run.job);
  SetMemoryDivision(0.9);
  ReadRamAllocation(run);
  Log("Processing OS files...");
  ShowStatus("Processing OS files");
  FetchOsFiles(run);
  Log("Processing INF files\r\n");
  ShowStatus("Processing INF files...");
  FetchInfFiles(run, InfMode::kFetch);
  PauseForTheEye(run.job);
  Log("Processing misc files\r\n");
  ShowStatus("Processing misc files...");
  FetchMiscFiles(run);
  PauseForTheEye(run.job);
}

/// Only what the multicast transfer did not bring.
void RunAsMulticastFallback(Run& run) noexcept {
  Log("Multicast Fallback Mode...");
  run.files_to_fetch = 1;
  Log("Orvenix - UpgradeThread - Validate Files\r\n");
  ShowStatus("Validating files");
  ValidateFiles(run);
  Log("Orvenix - Rename settings file\r\n");
  ApplyRenames(run.job);
}

/// A job that is through, or has failed, begins at its first pass the next time.
void KeepOrDeletePassState(const Run& run) noexcept {
  if (run.job.IsMultiPass() == 0 || !run.succeeded) {
    DeletePassState(run.job);
  } else if (run.job.GetFamily()[0] == '7' && run.pass == 1) {
    ShowStatus("Saving Network Parms...");
  }
}

/// What came onto the device is put to use, or it is said why nothing came.
void StartProgramOrShowError(const Run& run) noexcept {
  if (run.succeeded) {
    Log("Local Upgrade Executing\r\n");
    Sleep(kPauseMs);
    StartUpgrade(run.job);
    return;
  }
  ShowStatus("%s", run.error_text.c_str());
  Log("%s\r\n", run.error_text.c_str());
}

/// Tells the management system: first the status, then the event.
void ReportBegin(const UpgradeConfig& job) noexcept {
  const char* const own = job.GetUpgBeginMsg();
  report::SetRWIStatus(report::kStateUpgrading, own[0] != '\0' ? own : "Device Upgrading");
  report::SendDeviceEvent(job.GetUniqueId(), report::kEventUpgradeStarted, nullptr);
}

/// KEPT ODDITY: the begin message decides whether the end message counts. A job that has only an
/// end message ends with "Upgrade Complete", and one that has only a begin message with nothing.
const char* EndMessage(const UpgradeConfig& job) noexcept {
  return job.GetUpgBeginMsg()[0] != '\0' ? job.GetUpgEndMsg() : "Upgrade Complete";
}

/// Tells the management system: first the event, then, after a pause, the status.
void ReportEnd(const Run& run) noexcept {
  base::FixedText<256> reason;
  const char* const id = run.job.GetUniqueId();
  if (run.succeeded) {
    reason.Assign(EndMessage(run.job));
    report::SendDeviceEvent(id, report::kEventUpgradeComplete, nullptr);
  } else {
    base::Format(reason.data(), reason.capacity(), "Upgrade Failed: %s", run.error_text.c_str());
    report::SendDeviceEvent(id, report::kEventUpgradeFailed, run.error_text.c_str());
  }
  Sleep(kPauseMs);
  report::SetRWIStatus(report::kStateIdle, reason.c_str());
  Sleep(2 * kPauseMs);
}

/// From the job's first step to its report.
void CarryOut(Run& run, std::int32_t mode) noexcept {
  SetOverallProgress(2);
  ReportBegin(run.job);
  run.pass = BeginPass(run.job);
  Log("Orvenix - UpgradeThread - InitRAM\r\n");
  InitRam(run.job);
  ReceiveByMulticast(run.job);
  run.storage_card = ProbeStorageCards(run.job, run.pass);
  if (mode != 0) {
    RunAsUpgradeClient(run);
  } else {
    RunAsMulticastFallback(run);
  }
  KeepOrDeletePassState(run);
  Log("Orvenix - SendUpgradeComplete\r\n");
  http::SendUpgradeComplete(run.job, run.error_text.c_str());
  if (run.os_image && run.succeeded) {
    KeepMatchingLoaderImage(run.job);
    FlashOsImage();
  }
  StartProgramOrShowError(run);
}

void ShowEnd() noexcept {
  Log("Orvenix - UpgradeThread - Exiting\r\n");
  ShowStatus("Upgrade Complete");
  SetOverallProgress(100);
  report::RepaintWindow();
  report::CloseLogFile();
}

void FreeJob(UpgradeConfig* job) noexcept {
  // The host's side first: then nobody can take another number for the job.
  const auto listener = job_freed_listener.load(std::memory_order_relaxed);
  if (listener != nullptr) listener(job);
  ForgetJob(job);
  delete job;
}

/// One job, from beginning to end.
void RunJob(const Handover& handed) noexcept {
  UpgradeConfig* const job = handed.job;
  Run run(*job);
  ResetCounters(handed);
  configlet::WriteVersionFiles();
  report::SetSyslogTarget(job->GetSysLogPort(), job->GetSysLogIP());
  Log("Orvenix thread - Started\r\n");
  ShowStatus("Upgrade Initialization...");
  InProgressEvent in_progress;
  LightRequirement light;
  KeepAwake keep_awake;
  CarryOut(run, handed.mode);
  ShowEnd();
  ReportEnd(run);
  EndUpgrade();  // from here on the host may hand over the next job; it begins when this thread
                 // ends
  light.Release();
  keep_awake.Stop();
  in_progress.Delete();
  http::ReleaseJobClient();
  report::CloseTransferHandle();
  Sleep(kPauseMs);
  FreeJob(job);
  report::CloseProgressWindow();
}

/// Opens the progress window for the job that runs next.
void Present(const UpgradeConfig& job, std::int32_t mode) noexcept {
  if (mode != 0) {
    report::ShowCaption(job.GetMfgString(), job.GetSerialNumber());
    report::RepaintWindow();
  }
  const bool shown = job.GetShowGUI() == 1;
  const report::GuiStart start = {nullptr, shown ? SW_SHOWNORMAL : SW_HIDE};
  report::StartGUI(&start);
  if (shown) report::ShowProgressWindow();
}

DWORD WINAPI UpgradeThread(void* argument) {
  const auto number = static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(argument));
  AwaitTurn(number, INFINITE);
  const Handover handed = HandoverOf(number);
  if (handed.job != nullptr) {
    if (!handed.presented) Present(*handed.job, handed.mode);
    RunJob(handed);
  } else {
    EndUpgrade();
  }
  EndTurn(number);
  return 0;
}

/// @return the thread's handle, null when it could not be made.
HANDLE StartThread(std::uint32_t number) noexcept {
  HANDLE const thread =
      CreateThread(nullptr, 0, UpgradeThread,
                   reinterpret_cast<void*>(static_cast<std::uintptr_t>(number)), 0, nullptr);
  if (thread != nullptr) return thread;
  if (HandoverOf(number).presented) report::CloseProgressWindow();
  GiveNumberBack(number);
  return nullptr;
}

}  // namespace

void SetJobFreedListener(void (*listener)(const UpgradeConfig* job)) noexcept {
  job_freed_listener.store(listener, std::memory_order_relaxed);
}

void* StartNumber(std::uint32_t number) noexcept {
  if (number == 0) return nullptr;
  // While an earlier job runs on, its window stays; the thread then opens one when its turn comes.
  if (AwaitTurn(number, kHostWaitMs)) {
    const Handover handed = HandoverOf(number);
    if (handed.job == nullptr) {
      GiveNumberBack(number);
      return nullptr;
    }
    Present(*handed.job, handed.mode);
    NotePresented(number);
  }
  return StartThread(number);
}

}  // namespace upgrade

extern "C" void* StartUpgradeThread(UpgradeConfig* config, std::int32_t mode) noexcept {
  return config == nullptr ? nullptr : upgrade::StartNumber(upgrade::TakeNumber(config, mode));
}
