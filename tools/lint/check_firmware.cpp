// The checks of what only configuration files bring: firmware packages and INF files.
#include <algorithm>
#include <memory>
#include <set>

#include "base/number.h"
#include "base/text.h"
#include "server/site.h"
#include "tools/lint/device_configuration.h"
#include "tools/lint/files_check.h"
#include "upgrade/list_file/inf_file.h"
#include "upgrade/list_file/package_options.h"

namespace tools {
namespace {

constexpr std::string_view kRamName = "RAM:";
constexpr std::string_view kPass = "Pass=";
constexpr std::string_view kPassFile = "kvoupgclnt.txt";
constexpr std::uint64_t kMostParts = 999;
constexpr std::uint64_t kRamReserve = 40960;  ///< what the device adds to RAMAllocSize
constexpr std::size_t kLongestInfName = 63;

bool IsDigit(char letter) {
  return letter >= '0' && letter <= '9';
}

bool IsForRam(const PackageSettings& package) {
  return base::LeadingInt(package.count.text) == 0 &&
         base::StartsWith(package.destination.text + package.base.text, kRamName);
}

/// Whether one device may take both.
bool MeetOnOneDevice(const PackageSettings& a, const PackageSettings& b) {
  return a.hardware.text == b.hardware.text || a.hardware.text == "*" || b.hardware.text == "*";
}

std::string NameOf(const PackageSettings& package) {
  return "the package " + Quoted(package.base.text);
}

}  // namespace

void FilesCheck::Options(const PackageSettings& package) {
  const std::string& options = package.options.text;
  const std::string where = InJob(package.options.line);
  const std::string found = NameOf(package) + " has AdditionalParms " + Quoted(options);
  const std::size_t at = options.find(kPass);
  if (at != std::string::npos) {
    const std::string_view value = std::string_view(options).substr(at + kPass.size());
    if (value.empty() || !IsDigit(value[0]) || value[0] == '0') {
      Add(Rule::kPassNever, where, found);
    } else if (value.size() > 1 && IsDigit(value[1])) {
      Add(Rule::kPassDigits, where, found);
    }
  }
  const upgrade::DiskNeed need = upgrade::PackageDiskNeed(options);
  if (options.find("DiskSize=") != std::string::npos && (need.folder.empty() || need.bytes <= 0)) {
    Add(Rule::kDiskSize, where, found);
  }
}

void FilesCheck::PackageFiles(const PackageSettings& package) {
  const std::string where = InJob(package.line);
  const std::string pass = std::to_string(upgrade::PackagePass(package.options.text));
  for (const PackageFile& each : FilesOf(package)) {
    const WantedFile file{where, each.source, each.destination, package.hardware.text, {}, {}};
    Source(file);
    Destination(file);
    Served(file);
    // The same file may come again in another pass.
    const std::string masks = package.hardware.text + " in pass " + pass;
    Twice({where, each.source, each.destination, masks, {}, {}});
    if (site_ != nullptr && site_->Open(PathOnServer(each.source)) == nullptr) break;
  }
}

void FilesCheck::Package(const PackageSettings& package) {
  const std::string where = InJob(package.line);
  const auto add = [&](Rule rule, const Setting& setting, const std::string& found) {
    Add(rule, setting.given() ? InJob(setting.line) : where, NameOf(package) + " " + found);
  };
  if (package.hardware.text.find_first_not_of(',') == std::string::npos) {
    add(Rule::kPackageNoHardware, package.hardware, "has no HardwareVersion");
  }
  if (package.flash.given() && package.flash.text != "0") {
    add(Rule::kPackageFlash, package.flash, "has the FLASH " + Quoted(package.flash.text));
  }
  if (package.count.given() && !IsNumber(package.count.text, kMostParts)) {
    add(Rule::kPackageCount, package.count, "has the Count " + Quoted(package.count.text));
  }
  Options(package);
  if (!package.source.given()) {
    add(Rule::kPackageNoSource, package.source, "has no SourceDir");
    return;
  }
  if (FilesOf(package).empty()) {
    add(Rule::kPackageNoFile, package.base, "has neither Base nor Count");
  }
  if (base::EndsWith(package.source.text, "/\\")) {
    add(Rule::kPackageSourceSlash, package.source,
        "has a SourceDir that becomes " + Quoted(package.source.text));
    return;
  }
  PackageFiles(package);
}

void FilesCheck::RamSizes() {
  const auto& packages = check_.job.packages;
  for (const PackageSettings& first : packages) {
    if (!IsForRam(first)) continue;
    std::uint64_t store = 0, images = 0;
    bool is_first = true;
    for (const PackageSettings& other : packages) {
      const bool together =
          MeetOnOneDevice(first, other) &&
          upgrade::PackagePass(first.options.text) == upgrade::PackagePass(other.options.text);
      if (!together) continue;
      const std::int32_t size = upgrade::PackageRamSize(other.options.text);
      if (store == 0 && size > 0) store = static_cast<std::uint64_t>(size);
      if (!IsForRam(other)) continue;
      if (&other < &first) is_first = false;
      const auto served = site_ == nullptr
                              ? nullptr
                              : site_->Open(PathOnServer(other.source.text + other.base.text));
      if (served != nullptr) images += served->size();
    }
    if (store == 0) {
      Add(Rule::kRamNoSize, InJob(first.line), NameOf(first) + " has no size for its store");
    } else if (is_first && images > store + kRamReserve) {
      Add(Rule::kRamSizeShort, InJob(first.line),
          "the store is made for " + std::to_string(store) + " bytes, the images have " +
              std::to_string(images));
    }
  }
}

void FilesCheck::Passes() {
  const DeviceJob& job = check_.job;
  std::set<int> passes;
  bool several = false;
  for (const PackageSettings& package : job.packages) {
    passes.insert(upgrade::PackagePass(package.options.text));
    several = several || package.options.text.find(kPass) != std::string::npos;
  }
  if (!several) return;
  for (int pass = 1; pass < *passes.rbegin(); ++pass) {
    if (passes.count(pass) != 0) continue;
    Add(Rule::kPassGap, InJob(job.packages.front().line),
        "there is no package of pass " + std::to_string(pass));
  }
  const bool saved = std::any_of(job.saves.begin(), job.saves.end(), [](const Setting& save) {
    return base::EndsWith(PathKey(save.text), kPassFile);
  });
  for (const Setting& remove : job.deletes) {
    const std::string key = PathKey(remove.text);
    const bool of_file = key == "\\" || base::EndsWith(key, kPassFile);
    if (of_file && !saved) {
      Add(Rule::kPassStateDeleted, InJob(remove.line), "deletes " + Quoted(remove.text));
    }
  }
}

void FilesCheck::Packages() {
  for (const PackageSettings& package : check_.job.packages) Package(package);
  if (check_.job.packages.empty()) return;
  RamSizes();
  Passes();
}

// ---- INF files ----

void FilesCheck::InfEntries(std::string_view text, const std::string& path) {
  upgrade::InfFileReader reader(text);
  const std::string folder =
      path.substr(0, path.rfind('/') == std::string::npos ? 0 : path.rfind('/') + 1);
  std::size_t number = 0;
  for (upgrade::InfEntry entry; reader.Next(&entry);) {
    const std::string where = path + ", entry " + std::to_string(++number);
    const std::size_t star = entry.pattern.find_first_of("*?");
    const bool for_all = star != std::string_view::npos && star + 1 == entry.pattern.size();
    if (for_all || entry.pattern.find('?') != std::string_view::npos) {
      Add(Rule::kInfPattern, where, "the pattern is " + Quoted(entry.pattern));
    }
    const std::size_t name = entry.source.find_last_of("\\/");
    const std::string source =
        folder + std::string(entry.source.substr(name == std::string_view::npos ? 0 : name + 1));
    const WantedFile file{where, source, entry.destination, entry.pattern, {}, {}};
    Wanted(file);
    Served(file);
  }
}

void FilesCheck::Inf() {
  const Setting& inf = check_.job.inf;
  if (inf.text.empty()) return;
  const std::size_t at = inf.text.find_last_of("\\/:");
  const std::string name = inf.text.substr(at == std::string::npos ? 0 : at + 1);
  if (name.empty() || name.size() > kLongestInfName) {
    Add(Rule::kInfName, InJob(inf.line),
        "the INF file's name has " + std::to_string(name.size()) + " characters");
  }
  const std::string destination = "\\" + name;
  const WantedFile file{InJob(inf.line), inf.text, destination, "*", {}, {}};
  Wanted(file);
  Served(file);
  if (site_ == nullptr) return;
  const std::string path = PathOnServer(inf.text);
  if (const auto served = site_->Open(path)) InfEntries(ReadServed(*served), path);
}

}  // namespace tools
