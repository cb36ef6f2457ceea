#include "upgrade/start_upgrade.h"

#include <coredll.h>

#include <string_view>

#include "base/text.h"
#include "device/file.h"
#include "report/log/log.h"
#include "report/messages/message_link.h"
#include "report/window/progress_window.h"
#include "upgrade/prepare_package.h"

namespace upgrade {
namespace {

using report::Log;

/// KEPT ODDITY: a path with a blank in it, or in quotes, is not found, and one that has nothing
/// before it neither. The installer is started all the same and may then have to ask somebody.
const char* PackageOf(const char* parameters) noexcept {
  const std::size_t blank = base::View(parameters).rfind(' ');
  return blank == std::string_view::npos ? "" : parameters + blank + 1;
}

/// KEPT ODDITY: the program's name counts in small letters only, and anywhere in its path.
bool IsInstaller(const char* program) noexcept {
  return base::View(program).find("wceload.exe") != std::string_view::npos;
}

/// KEPT ODDITY: says that the program has started before it does, and also when it then cannot.
void Announce(const UpgradeConfig& job) noexcept {
  constexpr DWORD kPauseMs = 2000;
  report::ShowStatus("%s", job.GetProcessName());
  report::SetRWIStatus(report::kStateUpgrading, "Remote Executable Started");
  if (job.GetShowGUI() == 1) Sleep(kPauseMs);
}

void Start(const UpgradeConfig& job) noexcept {
  const char* const program = job.GetProcessName();
  const char* const parameters = job.GetProcessParms();
  Log("%s\r\n", program);
  if (parameters[0] != '\0') Log("%s\r\n", parameters);
  if (IsInstaller(program)) PreparePackage(PackageOf(parameters));
  Announce(job);
  device::File().RunProcess(program, parameters, job.GetProcessWait() != 0 ? INFINITE : 0);
}

}  // namespace

void StartUpgrade(const UpgradeConfig& job) noexcept {
  Log("Orvenix - StartUpgrade - Entering\r\n");
  if (job.GetProcessName()[0] != '\0') Start(job);
  Log("Orvenix - StartUpgrade - Exiting\r\n");
}

}  // namespace upgrade
