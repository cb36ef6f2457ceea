#include "tools/bundle_firmware.h"

#include <algorithm>
#include <cstdio>
#include <pugixml.hpp>
#include <set>
#include <sstream>

#include "base/number.h"
#include "base/text.h"
#include "tools/bundle.h"
#include "tools/bundle_rules.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "upgrade/list_file/inf_file.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kFirstPart = "001.zip";
constexpr std::size_t kMostParts = 999;
constexpr std::size_t kPackageText = 255;
constexpr const char* kRam = "RAM:";

[[noreturn]] void RefuseUsage(const std::string& text, const std::string& what,
                              const std::string& advice) {
  throw Failure(ExitCode::kUsage, "--firmware " + text, what, advice);
}

std::uint64_t ReadNumber(const std::string& package, const std::string& value, std::uint64_t least,
                         std::uint64_t most) {
  const bool digits = !value.empty() && value.size() <= 10 &&
                      value.find_first_not_of("0123456789") == std::string::npos;
  const std::uint64_t number = digits ? std::stoull(value) : 0;
  if (!digits || number < least || number > most) {
    RefuseUsage(package,
                "\"" + value + "\" is no number from " + std::to_string(least) + " to " +
                    std::to_string(most),
                "correct it");
  }
  return number;
}

void TakeOption(FirmwareOptions& options, const std::string& package, const std::string& key,
                const std::string& value) {
  constexpr std::uint64_t kMostBytes = 0x7FFFFFFF;
  if (key == "hardware") {
    options.hardware = value;
  } else if (key == "flash") {
    options.flash = value;
  } else if (key == "to") {
    options.destination = value;
  } else if (key == "cmd") {
    options.command_line = value;
  } else if (key == "pass") {
    options.pass = static_cast<int>(ReadNumber(package, value, 1, 9));
  } else if (key == "ram") {
    options.ram = ReadNumber(package, value, 1, kMostBytes);
  } else if (key == "disk") {
    options.disk = value;
  } else {
    RefuseUsage(package, "knows no \"" + key + "\"",
                "use hardware=, flash=, to=, cmd=, pass=, ram= and disk=");
  }
}

/// "bundle/firmware/1/os.nb0" of the first package.
ConfiguredFile FileAt(const fs::path& from, const std::string& folder) {
  std::error_code error;
  const std::uint64_t size = fs::file_size(from, error);
  if (error || !fs::is_regular_file(from)) {
    throw Failure(ExitCode::kBadInput, from.string(), "there is no such file",
                  "name a file, or the first part \"...001.zip\" of several");
  }
  return {from, folder + "/" + from.filename().string(), size};
}

std::string PartName(const std::string& base, std::size_t part) {
  char number[16];
  std::snprintf(number, sizeof number, "%03zu.zip", part);
  return base + number;
}

/// The parts beside the first one, without a gap.
void FindParts(FirmwarePlan& plan) {
  const fs::path folder = plan.options.file.parent_path();
  std::size_t part = 2;
  for (; part <= kMostParts && fs::exists(folder / PartName(plan.base, part)); ++part) {
    plan.files.push_back(FileAt(folder / PartName(plan.base, part), plan.folder));
  }
  plan.count = static_cast<int>(part - 1);
  for (std::size_t later = part + 1; later <= kMostParts; ++later) {
    if (!fs::exists(folder / PartName(plan.base, later))) continue;
    throw Failure(ExitCode::kBadInput, (folder / PartName(plan.base, part)).string(),
                  "is missing, and a later part is there", "number the parts without a gap");
  }
}

std::string OnDevice(const FirmwarePlan& plan, const ConfiguredFile& file) {
  std::string folder = plan.options.destination;
  if (folder != kRam && folder.back() != '\\') folder += '\\';
  return folder + fs::path(file.source).filename().string();
}

void CheckPackage(const FirmwarePlan& plan) {
  const std::string package = plan.options.file.string();
  const std::string& to = plan.options.destination;
  if (to != kRam && (to.empty() || to.front() != '\\')) {
    RefuseUsage(package, "\"" + to + "\" is no folder on a device",
                "give to=RAM: or a folder that begins with a backslash");
  }
  if (plan.options.hardware.find_first_not_of(", ") == std::string::npos) {
    RefuseUsage(package, "hardware= names no device", "give patterns, * for every device");
  }
  if (std::max({plan.options.command_line.size(), plan.parameters.size(), plan.folder.size()}) >=
      kPackageText) {
    RefuseUsage(package, "has a text of more than 254 characters", "shorten it");
  }
  for (const ConfiguredFile& file : plan.files) {
    BundleFile record;
    record.source = file.source;
    record.destination = OnDevice(plan, file);
    record.size = file.size;
    CheckBundleFile(record, file.from.string());
  }
}

bool MeetOnOneDevice(const FirmwarePlan& a, const FirmwarePlan& b) {
  return a.options.hardware == b.options.hardware || a.options.hardware == "*" ||
         b.options.hardware == "*";
}

/// What the images of one pass take together, on a device that gets this one.
std::uint64_t RamNeedOf(const FirmwarePlan& plan, const std::vector<FirmwarePlan>& all) {
  std::uint64_t sum = 0;
  for (const FirmwarePlan& other : all) {
    const bool together = std::max(other.options.pass, 1) == std::max(plan.options.pass, 1) &&
                          MeetOnOneDevice(plan, other);
    if (together && other.is_for_ram()) sum += other.size();
  }
  return sum;
}

/// The card that a folder lies on, empty for others.
std::string CardOf(const std::string& folder) {
  for (const char* card : {"\\SDMMC Disk", "\\Storage Card", "\\SD Card"}) {
    if (base::StartsWith(folder, card)) return card;
  }
  return {};
}

std::string ParametersOf(const FirmwarePlan& plan, const std::vector<FirmwarePlan>& all) {
  std::string text;
  const auto add = [&text](const std::string& option) {
    text += (text.empty() ? "" : ",") + option;
  };
  const FirmwareOptions& options = plan.options;
  if (options.pass > 0) add("Pass=" + std::to_string(options.pass));
  const std::string card = CardOf(options.destination);
  if (!options.disk.empty()) {
    add("DiskSize=" + options.disk);
  } else if (!card.empty()) {
    add("DiskSize=" + card + ":" + std::to_string(plan.size()));
  }
  if (options.ram > 0) {
    add("RAMAllocSize=" + std::to_string(options.ram));
  } else if (plan.is_for_ram()) {
    add("RAMAllocSize=" + std::to_string(RamNeedOf(plan, all)));
  }
  return text;
}

FirmwarePlan PlanPackage(const FirmwareOptions& options, const std::string& folder) {
  FirmwarePlan plan;
  plan.options = options;
  plan.folder = folder;
  plan.base = options.file.filename().string();
  plan.files.push_back(FileAt(options.file, folder));
  if (base::EndsWith(plan.base, kFirstPart)) {
    plan.base.resize(plan.base.size() - kFirstPart.size());
    FindParts(plan);
  }
  return plan;
}

/// A file of the bundle that goes to the flash store; it is served already.
FirmwarePlan PlanImage(const BundleFile& file) {
  FirmwarePlan plan;
  const std::size_t at = file.source.rfind('/');
  plan.folder = file.source.substr(0, at);
  plan.base = file.source.substr(at + 1);
  plan.files.push_back({{}, file.source, file.size});
  return plan;
}

void PlanInf(const fs::path& inf, const std::string& folder, ConfigurationPlan& plan) {
  constexpr std::size_t kLongestName = 63;
  if (inf.filename().string().size() > kLongestName) {
    throw Failure(ExitCode::kBadInput, inf.string(), "has a name of more than 63 characters",
                  "devices keep 63; rename it");
  }
  plan.inf_files.push_back(FileAt(inf, folder));
  plan.inf = plan.inf_files.front().source;
  const std::string text = ReadWholeFile(inf);
  upgrade::InfFileReader reader(text);
  std::set<std::string> seen{plan.inf};
  for (upgrade::InfEntry entry; reader.Next(&entry);) {
    const std::size_t at = entry.source.find_last_of("\\/");
    const auto name = entry.source.substr(at == std::string_view::npos ? 0 : at + 1);
    ConfiguredFile file = FileAt(inf.parent_path() / name, folder);
    BundleFile record;
    record.source = file.source;
    record.destination = entry.destination;
    record.size = file.size;
    CheckBundleFile(record, file.from.string());
    if (seen.insert(file.source).second) plan.inf_files.push_back(std::move(file));
  }
}

pugi::xml_node AddText(pugi::xml_node parent, const char* name, const std::string& text) {
  pugi::xml_node node = parent.append_child(name);
  node.text().set(text.c_str());
  return node;
}

void AddAttribute(pugi::xml_node node, const char* name, const std::string& value) {
  node.append_attribute(name).set_value(value.c_str());
}

void AddHead(pugi::xml_node root, const Bundle& bundle, const BundleOptions& options) {
  AddText(root, "BaseUrl", "http://" + bundle.address);
  AddText(root, "HTTPPort", std::to_string(bundle.port));
  if (!options.syslog_address.empty()) {
    pugi::xml_node syslog = root.append_child("Syslog");
    AddAttribute(syslog, "Address", options.syslog_address);
    AddAttribute(syslog, "Port", std::to_string(options.syslog_port));
  }
  if (!options.begin_text.empty()) AddText(root, "BeginText", options.begin_text);
  if (!options.end_text.empty()) AddText(root, "EndText", options.end_text);
  AddText(root, "ShowGUI", options.show_window ? "true" : "false");
  if (!options.program.empty()) {
    pugi::xml_node writer = root.append_child("FlashWriter");
    AddAttribute(writer, "Name", options.program);
    AddAttribute(writer, "CmdLine", options.parameters);
    AddAttribute(writer, "Wait", options.wait ? "true" : "false");
  }
}

void AddPackage(pugi::xml_node firmware, const FirmwarePlan& plan) {
  const FirmwareOptions& options = plan.options;
  pugi::xml_node package = firmware.append_child("Package");
  AddAttribute(package, "HardwareVersion", options.hardware);
  if (!options.flash.empty()) AddAttribute(package, "FLASH", options.flash);
  AddAttribute(package, "SourceDir", plan.folder);
  AddAttribute(package, "Base", plan.base);
  if (plan.count > 0) AddAttribute(package, "Count", std::to_string(plan.count));
  AddAttribute(package, "DestDir", options.destination);
  if (!options.command_line.empty()) AddAttribute(package, "CmdLine", options.command_line);
  if (!plan.parameters.empty()) AddAttribute(package, "AdditionalParms", plan.parameters);
}

bool IsImage(const BundleFile& file) {
  return base::StartsWith(file.destination, kRam);
}

}  // namespace

std::uint64_t FirmwarePlan::size() const {
  std::uint64_t sum = 0;
  for (const ConfiguredFile& file : files) sum += file.size;
  return sum;
}

std::vector<ConfiguredFile> ConfigurationPlan::Files() const {
  std::vector<ConfiguredFile> all;
  for (const FirmwarePlan& package : packages) {
    all.insert(all.end(), package.files.begin(), package.files.end());
  }
  all.insert(all.end(), inf_files.begin(), inf_files.end());
  // What the bundle serves in any case has no file of its own here.
  all.erase(std::remove_if(all.begin(), all.end(),
                           [](const ConfiguredFile& file) { return file.from.empty(); }),
            all.end());
  return all;
}

FirmwareOptions ParseFirmware(const std::string& text) {
  FirmwareOptions options;
  std::istringstream in(text);
  std::string word;
  std::getline(in, word, ';');
  options.file = word;
  if (word.empty()) RefuseUsage(text, "names no file", "write FILE;to=RAM:;hardware=TQ52*");
  while (std::getline(in, word, ';')) {
    const std::size_t at = word.find('=');
    if (at == std::string::npos) {
      RefuseUsage(text, "\"" + word + "\" is no option", "write key=value, divided by ';'");
    }
    TakeOption(options, text, word.substr(0, at), word.substr(at + 1));
  }
  return options;
}

ConfigurationPlan PlanConfiguration(const Bundle& bundle, const BundleOptions& options) {
  ConfigurationPlan plan;
  plan.wanted = options.configuration || !options.firmware.empty() || !options.inf.empty();
  if (!plan.wanted) return plan;
  for (const BundleFile& file : bundle.files) {
    if (file.masks != "*") {
      throw Failure(ExitCode::kUsage, "--masks",
                    "are given, and a configuration file knows none for its downloads",
                    "name files for certain devices in an INF file: --inf");
    }
    if (IsImage(file)) plan.packages.push_back(PlanImage(file));
  }
  int number = 0;
  for (const FirmwareOptions& package : options.firmware) {
    plan.packages.push_back(
        PlanPackage(package, options.name + "/firmware/" + std::to_string(++number)));
  }
  for (FirmwarePlan& package : plan.packages) {
    package.parameters = ParametersOf(package, plan.packages);
    CheckPackage(package);
  }
  if (!options.inf.empty()) PlanInf(options.inf, options.name + "/inf", plan);
  return plan;
}

std::string FormatConfiguration(const Bundle& bundle, const BundleOptions& options,
                                const ConfigurationPlan& plan) {
  pugi::xml_document document;
  pugi::xml_node declaration = document.append_child(pugi::node_declaration);
  AddAttribute(declaration, "version", "1.0");
  AddAttribute(declaration, "encoding", "utf-8");
  pugi::xml_node root = document.append_child("Upgrade");
  AddHead(root, bundle, options);
  if (!plan.packages.empty()) {
    pugi::xml_node firmware = root.append_child("OSFirmware");
    for (const FirmwarePlan& package : plan.packages) AddPackage(firmware, package);
  }
  if (!plan.inf.empty()) AddText(root, "InfFile", plan.inf);
  pugi::xml_node downloads;
  for (const BundleFile& file : bundle.files) {
    if (IsImage(file)) continue;
    if (!downloads) downloads = root.append_child("Downloads");
    pugi::xml_node entry = downloads.append_child("File");
    AddAttribute(entry, "SourceDir", file.source);
    AddAttribute(entry, "DestDir", file.destination);
  }
  std::ostringstream out;
  document.save(out, "  ", pugi::format_indent, pugi::encoding_utf8);
  return out.str();
}

}  // namespace tools
