// The check of the package that a job installs, as the server has it.
#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "base/text.h"
#include "tools/lint/checks.h"
#include "upgrade/package/cabinet.h"
#include "upgrade/package/setup_file.h"

namespace tools {
namespace {

using upgrade::PackageResult;

/// What the setup file says of its files.
struct Prepared {
  std::size_t files = 0;
  std::string with_macro;  ///< the first path that keeps one
};

Prepared Prepare(const upgrade::SetupFile& setup) {
  upgrade::EntryIndex files(setup.stored(), setup.files());
  upgrade::EntryIndex strings(setup.stored(), setup.strings());
  std::vector<std::uint32_t> file_slots(files.SlotsFor(files.table().count));
  std::vector<std::uint32_t> string_slots(strings.SlotsFor(0xFFFF));
  files.Build(file_slots.data(), static_cast<std::uint32_t>(file_slots.size()));
  strings.Build(string_slots.data(), static_cast<std::uint32_t>(string_slots.size()));
  Prepared prepared;
  for (std::uint32_t id = 0; id < file_slots.size(); ++id) {
    upgrade::InstalledPath path;
    if (setup.ReadPath(id, files, strings, &path) != PackageResult::kDone) continue;
    ++prepared.files;
    const bool has_macro = path.view().find('%') != std::string_view::npos;
    if (has_macro && prepared.with_macro.empty()) prepared.with_macro = std::string(path.view());
  }
  return prepared;
}

void CheckSetup(const JobCheck& check, const std::string& where, const std::string& name,
                const upgrade::SetupFile& setup) {
  upgrade::SetupFile::RegistryKey key;
  if (setup.ReadKey(&key) != PackageResult::kDone) {
    check.findings.Add(Rule::kCabinetBroken, where, name + " has no names of at most 64 bytes");
    return;
  }
  const Prepared prepared = Prepare(setup);
  if (prepared.files < setup.files().count) {
    check.findings.Add(Rule::kCabinetFiles, where,
                       std::to_string(prepared.files) + " of " +
                           std::to_string(setup.files().count) + " files of " + name +
                           " are found in it");
  }
  if (!prepared.with_macro.empty()) {
    check.findings.Add(Rule::kCabinetMacro, where,
                       name + " has a file for " + Quoted(prepared.with_macro));
  }
}

}  // namespace

bool IsInstalledPackage(const DeviceJob& job, std::string_view destination) {
  if (job.program.text.find("wceload.exe") == std::string::npos) return false;
  const std::size_t blank = job.parameters.text.rfind(' ');
  return blank != std::string::npos &&
         PathKey(job.parameters.text.substr(blank + 1)) == PathKey(destination);
}

void CheckCabinet(const JobCheck& check, const std::string& where, std::string_view destination,
                  std::string_view bytes) {
  const std::string name = Quoted(destination);
  upgrade::StoredFile stored;
  switch (upgrade::FindSetupFile(bytes, &stored)) {
    case PackageResult::kDone: CheckSetup(check, where, name, upgrade::SetupFile(stored)); break;
    case PackageResult::kNoSetupFile:
      check.findings.Add(Rule::kCabinetCompressed, where,
                         name + " begins no folder with a setup file that is stored");
      break;
    default: check.findings.Add(Rule::kCabinetBroken, where, name + " is no cabinet, or not whole");
  }
}

}  // namespace tools
