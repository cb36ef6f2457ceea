#include <coredll.h>

#include "device/file.h"
#include "device/mapped_file.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/fetch.h"
#include "upgrade/list_file/inf_file.h"
#include "upgrade/list_file/patterns.h"
#include "upgrade/paths.h"
#include "upgrade/phases.h"

namespace upgrade {
namespace {

PathText WithBackslashes(const char* text) noexcept {
  PathText path(base::View(text));
  for (std::size_t i = 0; i < path.size(); ++i) {
    if (path.c_str()[i] == '/') path.data()[i] = '\\';
  }
  return path;
}

/// Fetches the file of an entry. A folder that is missing is made, and the fetch tried once more.
void FetchEntry(Run& run, std::string_view server_folder, const InfEntry& entry) noexcept {
  PathText source(server_folder);
  if (!source.Append("\\") || !source.Append(FileName(entry.source))) return;
  const PathText destination(entry.destination);
  report::ShowStatus("%s", destination.c_str());
  if (FetchFile(run, source.c_str(), destination.c_str(), OnFailedGet::kTakeAsDone)) return;
  const DWORD error = GetLastError();
  if (error != ERROR_PATH_NOT_FOUND && error != ERROR_BAD_PATHNAME) return;
  CreateFolderOf(destination.view());
  FetchFile(run, source.c_str(), destination.c_str(), OnFailedGet::kTakeAsDone);
}

}  // namespace

std::uint32_t FetchInfFiles(Run& run, InfMode mode) noexcept {
  if (run.job.GetINFFileSrc()[0] == '\0') return 0;
  const PathText inf_source = WithBackslashes(run.job.GetINFFileSrc());
  const PathText inf_path = WithBackslashes(run.job.GetINFFile());
  PathText destination("\\");
  destination.Append(FileName(inf_path.view()));
  report::ShowStatus("%s", destination.c_str());
  if (!FetchFile(run, inf_source.c_str(), destination.c_str(), OnFailedGet::kTryAgain)) {
    report::Log("Error getting inf file %s\r\n", destination.c_str());
    return 1;
  }
  const device::MappedFile inf(destination.c_str());
  InfFileReader reader(inf.bytes());
  InfEntry entry;
  std::uint32_t count = 1;
  while (reader.Next(&entry)) {
    if (!InfPatternMatches(entry.pattern, run.job.GetMfgString())) continue;
    ++count;
    if (mode == InfMode::kFetch) FetchEntry(run, FolderOf(inf_source.view()), entry);
  }
  return count;
}

}  // namespace upgrade
