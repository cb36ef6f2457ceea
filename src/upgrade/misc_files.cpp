#include <coredll.h>

#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/fetch.h"
#include "upgrade/pass_state.h"
#include "upgrade/paths.h"
#include "upgrade/phases.h"

namespace upgrade {

bool FetchMiscFiles(Run& run) noexcept {
  bool result = true;
  for (const tagDownloadFile* file : run.job.DownloadFiles()) {
    if (file == nullptr) continue;
    const PathText source(base::FieldView(file->source));
    const PathText destination(base::FieldView(file->destination));
    report::ShowStatus("%s", destination.c_str());
    result = FetchFile(run, source.c_str(), destination.c_str(), OnFailedGet::kTryAgain);
    if (!result) report::Log("Error getting some file %s\r\n", source.c_str());
  }
  return result;
}

void CountFiles(Run& run) noexcept {
  run.files_to_fetch = 0;
  for (const FirmwarePackage* package : run.job.FirmwarePackages()) {
    if (package == nullptr || !IsInPass(run.job, *package, run.pass)) continue;
    // A negative count brings no part. The sum of huge ones wraps: it is for display only.
    if (package->count < 0) continue;
    run.files_to_fetch += package->count == 0 ? 1U : static_cast<std::uint32_t>(package->count);
  }
  run.files_to_fetch += FetchInfFiles(run, InfMode::kCountOnly);
  run.files_to_fetch += static_cast<std::uint32_t>(run.job.DownloadFiles().size());
}

}  // namespace upgrade
