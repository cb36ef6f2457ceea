#include <coredll.h>

#include "base/format.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/fetch.h"
#include "upgrade/memory_division.h"
#include "upgrade/pass_state.h"
#include "upgrade/paths.h"
#include "upgrade/phases.h"
#include "upgrade/storage_card.h"

namespace upgrade {
namespace {

/// A package's texts; whoever made the record may have left them without terminator.
struct PackageTexts {
  explicit PackageTexts(const FirmwarePackage& package) noexcept
      : base(base::FieldView(package.base)),
        source_folder(base::FieldView(package.source_folder)),
        destination_folder(base::FieldView(package.destination_folder)) {}
  std::string_view base;
  std::string_view source_folder;
  std::string_view destination_folder;
};

/// @return false when the name is longer than a path may be.
bool JoinPath(PathText& path, std::string_view folder, std::string_view name,
              std::string_view ending) noexcept {
  path.Clear();
  return path.Append(folder) && path.Append(name) && path.Append(ending);
}

bool FetchShown(Run& run, const PathText& source, const PathText& destination) noexcept {
  report::ShowStatus("%s", destination.c_str());
  if (FetchFile(run, source.c_str(), destination.c_str(), OnFailedGet::kTryAgain)) return true;
  report::Log("Error getting file %s\r\n", source.c_str());
  return false;
}

void AppendCommandLine(UpgradeConfig& job, const FirmwarePackage& package) noexcept {
  const base::FixedText<sizeof package.command_line> text(base::FieldView(package.command_line));
  if (!text.empty()) job.AppendFlashWriterParms(text.c_str());
}

/// A package in numbered parts.
bool FetchParts(Run& run, const FirmwarePackage& package, bool result) noexcept {
  const PackageTexts texts(package);
  // A negative count, which only a damaged or hostile file holds, brings no part.
  const std::uint32_t parts = package.count < 0 ? 0 : static_cast<std::uint32_t>(package.count);
  if (parts > 0) AppendCommandLine(run.job, package);
  for (std::uint32_t part = 1; part <= parts; ++part) {
    char ending[24];
    base::Format(ending, sizeof ending, "%03u.zip", part);
    PathText source;
    PathText destination;
    if (!JoinPath(source, texts.source_folder, texts.base, ending) ||
        !JoinPath(destination, texts.destination_folder, texts.base, ending)) {
      break;  // later numbers are not shorter
    }
    result = FetchShown(run, source, destination);
  }
  return result;
}

/// A package in one file.
bool FetchWhole(Run& run, const FirmwarePackage& package, bool result) noexcept {
  const PackageTexts texts(package);
  PathText source;
  PathText destination;
  if (!JoinPath(source, texts.source_folder, texts.base, "") ||
      !JoinPath(destination, texts.destination_folder, texts.base, "")) {
    return result;
  }
  if (IsOnCard(destination.view()) && !run.storage_card) return result;
  // Anywhere in the name here, unlike everywhere else.
  if (destination.view().find("RAM:") != std::string_view::npos) SetMemoryDivision(0.5);
  AppendCommandLine(run.job, package);
  return FetchShown(run, source, destination);
}

}  // namespace

bool FetchOsFiles(Run& run) noexcept {
  report::ShowStatus("Server = !%s!", run.job.GetBaseURL());
  report::Log("Server = !%s!", run.job.GetBaseURL());
  bool result = true;
  for (const FirmwarePackage* package : run.job.FirmwarePackages()) {
    if (package == nullptr || !IsInPass(run.job, *package, run.pass)) continue;
    if (package->count != 0) {
      result = FetchParts(run, *package, result);
    } else if (package->base[0] != '\0') {
      result = FetchWhole(run, *package, result);
    }
  }
  return result;
}

}  // namespace upgrade
