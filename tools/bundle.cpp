#include "tools/bundle.h"

#include <fnmatch.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <system_error>

#include "base/crc32.h"
#include "base/text.h"
#include "server/site.h"
#include "tools/bundle_rules.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/input_files.h"
#include "tools/job_file.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr const char* kFormatName = "orvenix-bundle-1";
constexpr std::size_t kCopyBlock = 1 << 20;

std::uint32_t AttributeNamed(const std::string& name) {
  if (name == "read-only") return server::kAttributeReadOnly;
  if (name == "hidden") return server::kAttributeHidden;
  if (name == "system") return server::kAttributeSystem;
  if (name == "archive") return server::kAttributeArchive;
  throw Failure(ExitCode::kUsage, "--attributes", "\"" + name + "\" is no attribute",
                "use read-only, hidden, system, archive");
}

bool Matches(const std::string& pattern, const std::string& relative) {
  return ::fnmatch(pattern.c_str(), relative.c_str(), 0) == 0;
}

std::uint32_t AttributesOf(const std::string& relative, const BundleOptions& options) {
  for (const auto& [pattern, names] : options.attributes) {
    if (Matches(pattern, relative)) return ParseAttributes(names);
  }
  return 0;
}

std::string MasksOf(const std::string& relative, const BundleOptions& options) {
  for (const auto& [pattern, masks] : options.file_masks) {
    if (Matches(pattern, relative)) return masks;
  }
  return options.masks;
}

/// An empty file is listed with a CRC that no check meets: HTTP brings it anyway.
bool GoesByMulticast(const InputFile& from, std::uint64_t size, const BundleOptions& options) {
  if (!options.multicast || size == 0) return false;
  return std::none_of(
      options.http_only.begin(), options.http_only.end(),
      [&from](const std::string& pattern) { return Matches(pattern, from.relative); });
}

std::string OnDevice(std::string folder, std::string relative, const BundleOptions& options) {
  for (const auto& [pattern, other] : options.destinations) {
    if (!Matches(pattern, relative)) continue;
    relative = relative.substr(relative.rfind('/') + 1);
    if (other == "RAM:") return other + relative;
    folder = other;
    break;
  }
  std::replace(relative.begin(), relative.end(), '/', '\\');
  const std::size_t end = folder.find_last_not_of('\\');
  return (end == std::string::npos ? "" : folder.substr(0, end + 1)) + "\\" + relative;
}

/// Copies `from` to `to` with its time. @return size and CRC-32 of what was copied.
std::pair<std::uint64_t, std::uint32_t> CopyWithChecksum(const fs::path& from, const fs::path& to) {
  fs::create_directories(to.parent_path());
  std::ifstream in(from, std::ios::binary);
  if (!in) throw Failure(ExitCode::kBadInput, from.string(), "cannot be read");
  std::ofstream out(to, std::ios::binary | std::ios::trunc);
  std::vector<char> block(kCopyBlock);
  base::Crc32 crc;
  std::uint64_t size = 0;
  while (in) {
    in.read(block.data(), static_cast<std::streamsize>(block.size()));
    const auto got = static_cast<std::size_t>(in.gcount());
    crc.Update(block.data(), got);
    out.write(block.data(), in.gcount());
    size += got;
  }
  if (in.bad()) throw Failure(ExitCode::kBadInput, from.string(), "cannot be read to its end");
  out.close();
  if (!out) {
    throw Failure(ExitCode::kCannotWrite, to.string(), "cannot be written", "is the disk full?");
  }
  fs::last_write_time(to, fs::last_write_time(from));
  return {size, crc.value()};
}

std::uint32_t ChecksumOf(const std::string& text) {
  base::Crc32 crc;
  crc.Update(text.data(), text.size());
  return crc.value();
}

/// Records without sizes and checksums; enough to refuse what devices cannot take.
Bundle Plan(const std::vector<InputFile>& input, const BundleOptions& options) {
  Bundle bundle;
  bundle.name = options.name;
  bundle.address = options.address;
  bundle.port = options.port;
  bundle.list.source = options.name + ".lst";
  bundle.list.destination = "\\Orvenix\\" + bundle.list.source;
  bundle.list.masks = options.masks;
  bundle.list.by_multicast = options.multicast.has_value() && !input.empty();
  bundle.multicast = options.multicast;
  CheckBundleFile(bundle.list, "--name");
  for (const InputFile& from : input) {
    BundleFile file;
    file.source = options.name + "/" + from.relative;
    file.destination = OnDevice(options.destination, from.relative, options);
    file.masks = MasksOf(from.relative, options);
    file.size = fs::file_size(from.path);
    file.by_multicast = GoesByMulticast(from, file.size, options);
    file.attributes = AttributesOf(from.relative, options);
    CheckBundleFile(file, from.path.string());
    bundle.total_size += file.size;
    bundle.files.push_back(std::move(file));
  }
  CheckBundleAsAWhole(bundle);
  return bundle;
}

/// Nothing in a folder to upgrade from, and no other files either.
void RefuseEmptyBundle(const Bundle& bundle, const ConfigurationPlan& plan) {
  if (!bundle.files.empty() || !plan.Files().empty()) return;
  throw Failure(ExitCode::kBadInput, bundle.name, "there is no file in the folder", "add files");
}

nlohmann::ordered_json ToJson(const BundleFile& file) {
  nlohmann::ordered_json json{{"source", file.source},
                              {"destination", file.destination},
                              {"masks", file.masks},
                              {"crc32", file.crc32},
                              {"size", file.size}};
  if (file.attributes != 0) json["attributes"] = file.attributes;
  if (file.by_multicast) json["multicast"] = true;
  return json;
}

nlohmann::ordered_json ToJson(const MulticastSetup& setup) {
  return {{"group", setup.group},
          {"port", setup.port},
          {"private_group", setup.private_group},
          {"block_size", setup.block_size},
          {"device_text", setup.device_text},
          {"encrypt", setup.encrypt}};
}

MulticastSetup SetupFromJson(const nlohmann::json& json) {
  MulticastSetup setup;
  json.at("group").get_to(setup.group);
  json.at("port").get_to(setup.port);
  json.at("private_group").get_to(setup.private_group);
  json.at("block_size").get_to(setup.block_size);
  setup.device_text = json.value("device_text", "");
  setup.encrypt = json.value("encrypt", false);
  return setup;
}

std::string FormatManifest(const Bundle& bundle) {
  nlohmann::ordered_json json{{"format", kFormatName},           {"name", bundle.name},
                              {"address", bundle.address},       {"port", bundle.port},
                              {"total_size", bundle.total_size}, {"list", ToJson(bundle.list)}};
  if (bundle.multicast) json["multicast"] = ToJson(*bundle.multicast);
  if (bundle.configured_files) {
    json["configuration"] = {{"file", kBundleConfiguration}, {"files", *bundle.configured_files}};
  }
  json["files"] = nlohmann::ordered_json::array();
  for (const BundleFile& file : bundle.files) json["files"].push_back(ToJson(file));
  return json.dump(2) + "\n";
}

BundleFile FileFromJson(const nlohmann::json& json) {
  BundleFile file;
  json.at("source").get_to(file.source);
  json.at("destination").get_to(file.destination);
  json.at("masks").get_to(file.masks);
  json.at("crc32").get_to(file.crc32);
  json.at("size").get_to(file.size);
  file.attributes = json.value("attributes", 0U);
  file.by_multicast = json.value("multicast", false);
  return file;
}

/// The folder that takes a new bundle until it is complete. Refuses to replace what is no bundle.
fs::path PrepareOutput(const BundleOptions& options) {
  const fs::path out = fs::weakly_canonical(options.out);
  const fs::path folder = fs::canonical(options.folder);
  const auto inside = [](const fs::path& inner, const fs::path& outer) {
    const fs::path relative = inner.lexically_relative(outer);
    return !relative.empty() && *relative.begin() != "..";
  };
  if (inside(out, folder) || inside(folder, out)) {
    throw Failure(ExitCode::kUsage, options.out.string(),
                  "the bundle and its input lie in one another", "choose another place");
  }
  if (fs::exists(out) && !fs::exists(out / kBundleManifest) && !fs::is_empty(out)) {
    throw Failure(ExitCode::kCannotWrite, options.out.string(), "is there and is not a bundle",
                  "choose another place, or remove it");
  }
  fs::path beside = out;
  beside += ".new";
  fs::remove_all(beside);
  fs::create_directories(beside / kBundleTree);
  return beside;
}

void FillConfiguration(const fs::path& beside, const BundleOptions& options, const Bundle& bundle,
                       const ConfigurationPlan& plan) {
  if (!plan.wanted) return;
  for (const ConfiguredFile& file : plan.Files()) {
    CopyWithChecksum(file.from, beside / kBundleTree / file.source);
  }
  WriteWholeFile(beside / kBundleConfiguration, FormatConfiguration(bundle, options, plan));
}

void Fill(const fs::path& beside, const std::vector<InputFile>& input, const BundleOptions& options,
          Bundle& bundle) {
  bundle.total_size = 0;
  for (std::size_t i = 0; i < input.size(); ++i) {
    BundleFile& file = bundle.files[i];
    const fs::path to = beside / kBundleTree / file.source;
    std::tie(file.size, file.crc32) = CopyWithChecksum(input[i].path, to);
    bundle.total_size += file.size;
  }
  if (input.empty()) return;
  const std::string list = FormatListFile(bundle);
  bundle.list.size = list.size();
  bundle.list.crc32 = ChecksumOf(list);
  CheckBundleAsAWhole(bundle);
  // The server tells a file's time: that of the list must come from the files too.
  auto newest = fs::file_time_type::min();
  for (const InputFile& from : input) newest = std::max(newest, fs::last_write_time(from.path));
  WriteWholeFile(beside / kBundleTree / bundle.list.source, list);
  fs::last_write_time(beside / kBundleTree / bundle.list.source, newest);
  WriteWholeFile(beside / kBundleJob, FormatBundleJob(bundle, options));
}

void AddMulticast(JobGroup& upgrade, const MulticastSetup& setup) {
  JobGroup& transfer = upgrade.AddGroup("MultiCast");
  transfer.AddField("MulticastIP", setup.group);
  transfer.AddField("UDPPort", std::to_string(setup.port));
  transfer.AddField("UDPBlockSize", std::to_string(setup.block_size));
  // What counts: the fields above are only kept.
  upgrade.AddGroup("MulticastClient").AddField("Parameters", ClientParameters(setup));
}

/// The volume that a path on the device lies on, as the space check names it.
std::string VolumeOf(const std::string& destination) {
  for (const char* volume : {"\\Flash File Store", "\\SDMMC Disk", "\\Storage Card", "\\SD Card"}) {
    const std::string prefix = std::string(volume) + "\\";
    if (base::EqualIgnoringCase(destination.substr(0, prefix.size()), prefix)) return volume;
  }
  if (base::StartsWith(destination, "RAM:")) return "RAM:";
  return "\\";
}

}  // namespace

std::uint32_t ListedCrc(const BundleFile& file) {
  return file.crc32 == 0 ? 1 : file.crc32;
}

std::string FormatListFile(const Bundle& bundle) {
  std::string list;
  for (const BundleFile& file : bundle.files) {
    list += file.source + "," + file.destination + "," + file.masks + "," +
            std::to_string(ListedCrc(file)) + "," + std::to_string(file.size) + "\r\n";
  }
  return list;
}

std::string FormatBundleJob(const Bundle& bundle, const BundleOptions& options) {
  Job job;
  job.groups.push_back({"Orvenix", {}, 0});
  JobGroup& upgrade = job.groups.back().AddGroup("Upgrade");
  upgrade.AddField("ShowGUI", options.show_window ? "true" : "false");
  // Said in every job: port 0 is what makes a device log to its own file.
  JobGroup& syslog = upgrade.AddGroup("Syslog");
  syslog.AddField("Address", options.syslog_address);
  syslog.AddField("Port",
                  options.syslog_address.empty() ? "0" : std::to_string(options.syslog_port));
  JobGroup& http = upgrade.AddGroup("HTTPServer");
  http.AddField("IPAddress", bundle.address);
  http.AddField("HTTPPort", std::to_string(bundle.port));
  http.AddField("BaseURL", "http://" + bundle.address);
  if (bundle.multicast) AddMulticast(upgrade, *bundle.multicast);
  if (!options.begin_text.empty() || !options.end_text.empty()) {
    JobGroup& reason = upgrade.AddGroup("AlternateRTWReason");
    reason.AddField("BeginText", options.begin_text);
    reason.AddField("EndText", options.end_text);
  }
  std::map<std::string, std::uint64_t> needed;
  for (const BundleFile& file : bundle.files) needed[VolumeOf(file.destination)] += file.size;
  JobGroup& storage = upgrade.AddGroup("StorageRequirements");
  for (const auto& [volume, size] : needed) {
    JobGroup& store = storage.AddGroup("Store");
    store.AddField("Name", volume);
    store.AddField("RequiredSpace", std::to_string(size));
  }
  if (!options.program.empty()) {
    JobGroup& start = upgrade.AddGroup("StartProcess");
    start.AddField("Process", options.program);
    start.AddField("Parameters", options.parameters);
    start.AddField("Wait", options.wait ? "true" : "false");
  }
  JobGroup& list = upgrade.AddGroup("FileList");
  list.AddField("Source", bundle.list.source);
  list.AddField("Dest", bundle.list.destination);
  list.AddField("CRC", std::to_string(bundle.list.crc32));
  list.AddField("MCTMask", bundle.list.masks);
  return FormatJob(job);
}

std::vector<BundleFile> AnnouncedFiles(const Bundle& bundle) {
  std::vector<BundleFile> announced;
  for (const BundleFile& file : bundle.files) {
    if (file.by_multicast) announced.push_back(file);
  }
  const auto depth = [](const BundleFile& file) {
    return std::count(file.destination.begin(), file.destination.end(), '\\');
  };
  std::stable_sort(
      announced.begin(), announced.end(),
      [&depth](const BundleFile& a, const BundleFile& b) { return depth(a) < depth(b); });
  if (bundle.list.by_multicast) announced.push_back(bundle.list);
  return announced;
}

std::uint32_t ParseAttributes(const std::string& names) {
  std::uint32_t mask = 0;
  for (std::size_t start = 0; start <= names.size();) {
    const std::size_t end = std::min(names.find(',', start), names.size());
    mask |= AttributeNamed(names.substr(start, end - start));
    start = end + 1;
  }
  return mask;
}

Bundle MakeBundle(const BundleOptions& options) {
  CheckBundleOptions(options);
  try {
    const std::vector<InputFile> input = FindInputFiles(options.folder);
    Bundle bundle = Plan(input, options);
    const ConfigurationPlan plan = PlanConfiguration(bundle, options);
    RefuseEmptyBundle(bundle, plan);
    if (plan.wanted) bundle.configured_files = plan.Files().size();
    const fs::path beside = PrepareOutput(options);
    try {
      Fill(beside, input, options, bundle);
      FillConfiguration(beside, options, bundle, plan);
      WriteWholeFile(beside / kBundleManifest, FormatManifest(bundle));
      const fs::path out = fs::weakly_canonical(options.out);
      fs::remove_all(out);
      fs::rename(beside, out);
    } catch (...) {
      std::error_code ignored;
      fs::remove_all(beside, ignored);
      throw;
    }
    return bundle;
  } catch (const fs::filesystem_error& error) {
    throw Failure(ExitCode::kCannotWrite, error.path1().string(), error.code().message());
  }
}

Bundle ReadBundle(const fs::path& folder) {
  const fs::path file = folder / kBundleManifest;
  const std::string text = ReadWholeFile(file, std::size_t{64} << 20U);
  try {
    const nlohmann::json json = nlohmann::json::parse(text);
    if (json.at("format") != kFormatName) {
      throw Failure(ExitCode::kBadInput, file.string(), "is of a format that is not known",
                    "make the bundle anew");
    }
    Bundle bundle;
    json.at("name").get_to(bundle.name);
    json.at("address").get_to(bundle.address);
    json.at("port").get_to(bundle.port);
    json.at("total_size").get_to(bundle.total_size);
    bundle.list = FileFromJson(json.at("list"));
    if (json.contains("configuration")) {
      bundle.configured_files = json.at("configuration").at("files").get<std::size_t>();
    }
    if (json.contains("multicast")) bundle.multicast = SetupFromJson(json.at("multicast"));
    for (const auto& entry : json.at("files")) bundle.files.push_back(FileFromJson(entry));
    return bundle;
  } catch (const nlohmann::json::exception& error) {
    throw Failure(ExitCode::kBadInput, file.string(), error.what(), "make the bundle anew");
  }
}

}  // namespace tools
