#include "tools/package/package.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>

#include "base/text.h"
#include "tools/failure.h"
#include "tools/input_files.h"
#include "tools/package/cabinet_writer.h"
#include "tools/package/registry_values.h"
#include "upgrade/package/installed_path.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kMaxFiles = 999;  ///< their numbers have three digits
constexpr std::size_t kMacros = 17;

void CheckName(const char* option, const std::string& name) {
  const bool printable = std::all_of(name.begin(), name.end(),
                                     [](char letter) { return letter >= ' ' && letter <= '~'; });
  if (name.empty() || !printable || name.find('\\') != std::string::npos) {
    throw Failure(ExitCode::kUsage, option, "\"" + name + "\" is no name",
                  "use printable ASCII letters, without a backslash");
  }
  if (name.size() > kMaxPackageName) {
    throw Failure(ExitCode::kUsage, option, "has " + std::to_string(name.size()) + " characters",
                  "devices read " + std::to_string(kMaxPackageName));
  }
}

void CheckDestination(const std::string& folder) {
  if (folder.empty() || folder.front() != '\\' || folder.find('%') != std::string::npos) {
    throw Failure(ExitCode::kUsage, "--dest", "\"" + folder + "\" is no folder of a device",
                  "give it as '\\Program Files\\Scan'");
  }
}

/// A path that devices can have.
void CheckPath(const std::string& path, const std::string& from) {
  for (const char letter : path) {
    if (letter >= ' ' && letter <= '~' &&
        std::string_view("<>:\"|?*/%").find(letter) == std::string_view::npos) {
      continue;
    }
    throw Failure(ExitCode::kBadInput, from, "has a character that devices cannot carry",
                  "use printable ASCII letters, none of < > : \" | ? * / %");
  }
  if (path.size() > kMaxPackagePath) {
    throw Failure(
        ExitCode::kBadInput, from,
        "its path on the device has " + std::to_string(path.size()) + " characters",
        "devices keep " + std::to_string(kMaxPackagePath) + "; shorten folders or --dest");
  }
}

std::string FolderOnDevice(const std::string& destination, const std::string& relative) {
  std::string folder = destination.substr(0, destination.find_last_not_of('\\') + 1);
  std::string below = relative.substr(0, relative.rfind('/') + 1);
  std::replace(below.begin(), below.end(), '/', '\\');
  if (!below.empty()) folder += "\\" + below.substr(0, below.size() - 1);
  return folder.empty() ? "\\" : folder;
}

/// "APP.000" and so on: eight letters and the number.
std::string NameInCabinet(const std::string& text, std::size_t number) {
  std::string name;
  for (const char letter : text.substr(0, text.rfind('.'))) {
    const char upper = letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 32) : letter;
    const bool usual = (upper >= 'A' && upper <= 'Z') || (upper >= '0' && upper <= '9');
    if (usual && name.size() < 8) name += upper;
  }
  char ending[8];
  std::snprintf(ending, sizeof ending, ".%03u", static_cast<unsigned>(number));
  return (name.empty() ? "FILE" : name) + ending;
}

/// In seconds since 1970, whatever clock the library counts its file times by.
std::int64_t TimeOf(const fs::path& file) {
  struct stat status {};
  return ::stat(file.c_str(), &status) == 0 ? status.st_mtime : 0;
}

PackagePlan Plan(const PackageOptions& options, const std::vector<InputFile>& input) {
  PackagePlan plan;
  plan.provider = options.provider;
  plan.application = options.application;
  // The first folder is where an installer says that the package is.
  plan.folders.push_back(FolderWithMacro(FolderOnDevice(options.destination, "")));
  for (const InputFile& from : input) {
    const std::string folder = FolderOnDevice(options.destination, from.relative);
    const std::string name = from.relative.substr(from.relative.rfind('/') + 1);
    CheckPath(folder + "\\" + name, from.path.string());
    const std::string text = FolderWithMacro(folder);
    auto at = std::find(plan.folders.begin(), plan.folders.end(), text);
    if (at == plan.folders.end()) at = plan.folders.insert(at, text);
    plan.files.push_back({static_cast<std::size_t>(at - plan.folders.begin()), name});
  }
  if (!options.registry.empty()) AddRegistryValues(options.registry, plan);
  return plan;
}

std::vector<CabinetEntry> Entries(const PackageOptions& options,
                                  const std::vector<InputFile>& input, const PackagePlan& plan) {
  std::vector<CabinetEntry> entries(1);
  CabinetEntry& setup = entries.front();
  setup.name = NameInCabinet(options.application, 0);
  setup.content = FormatPackageSetup(plan);
  setup.size = setup.content->size();
  std::uint64_t sum = setup.size;
  std::int64_t newest = 0;
  for (std::size_t i = 0; i < input.size(); ++i) {
    CabinetEntry entry;
    entry.name = NameInCabinet(plan.files[i].name, i + 1);
    entry.file = input[i].path;
    entry.size = fs::file_size(entry.file);
    entry.time = TimeOf(entry.file);
    sum += entry.size;
    newest = std::max(newest, entry.time);
    entries.push_back(std::move(entry));
  }
  entries.front().time = newest;
  if (sum > kMaxCabinetData) {
    throw Failure(ExitCode::kBadInput, options.folder.string(),
                  "holds " + std::to_string(sum) + " bytes",
                  "a cabinet holds " + std::to_string(kMaxCabinetData));
  }
  return entries;
}

}  // namespace

std::string FolderWithMacro(const std::string& folder) {
  std::size_t best = 0;
  std::string text = folder;
  for (std::size_t number = 1; number <= kMacros; ++number) {
    const std::string_view known = upgrade::InstalledPath::FolderOfMacro(number);
    const bool inside =
        base::EqualIgnoringCase(std::string_view(folder).substr(0, known.size()), known) &&
        (folder.size() == known.size() || folder[known.size()] == '\\');
    if (!inside || known.size() <= best) continue;
    best = known.size();
    text = "%CE" + std::to_string(number) + "%" + folder.substr(best);
  }
  return text;
}

Package MakePackage(const PackageOptions& options) {
  CheckName("--application", options.application);
  CheckName("--provider", options.provider);
  CheckDestination(options.destination);
  try {
    const std::vector<InputFile> input = FindInputFiles(options.folder);
    if (input.empty() || input.size() > kMaxFiles) {
      throw Failure(ExitCode::kBadInput, options.folder.string(),
                    "holds " + std::to_string(input.size()) + " files",
                    "a package has 1 to " + std::to_string(kMaxFiles));
    }
    const PackagePlan plan = Plan(options, input);
    WriteCabinet(options.cabinet, Entries(options, input, plan));
    return {plan.files.size(), plan.values.size(), fs::file_size(options.cabinet),
            "SOFTWARE\\Apps\\" + plan.provider + " " + plan.application};
  } catch (const fs::filesystem_error& error) {
    throw Failure(ExitCode::kCannotWrite, error.path1().string(), error.code().message());
  }
}

}  // namespace tools
