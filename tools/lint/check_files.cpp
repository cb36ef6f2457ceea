// The checks of the files that a job brings: what it says about them, and what the server has.
#include <algorithm>
#include <filesystem>
#include <map>
#include <memory>
#include <set>

#include "base/number.h"
#include "base/text.h"
#include "server/site.h"
#include "tools/lint/files_check.h"
#include "tools/lint/multicast_line.h"
#include "upgrade/list_file/package_options.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kMaxListFile = std::size_t{16} << 20U;
constexpr std::size_t kMaxCabinet = std::size_t{256} << 20U;
constexpr std::uint64_t kLargestCrc = 0xFFFFFFFF;
constexpr std::uint64_t kLargestSize = 0x7FFFFFFF;
constexpr std::string_view kRamName = "RAM:";
constexpr std::string_view kRename = ".rename";
constexpr std::size_t kLongestRamName = 19;

bool IsLetter(char letter) {
  return (letter >= 'A' && letter <= 'Z') || (letter >= 'a' && letter <= 'z');
}

/// The fields of one line; runs of commas give empty ones, which the device would not see.
std::vector<std::string_view> Fields(std::string_view line) {
  std::vector<std::string_view> fields;
  for (std::size_t start = 0; start <= line.size();) {
    const std::size_t end = std::min(line.find(',', start), line.size());
    fields.push_back(line.substr(start, end - start));
    start = end + 1;
  }
  return fields;
}

}  // namespace

std::string ReadServed(const server::SiteFile& file) {
  std::string text(static_cast<std::size_t>(file.size()), '\0');
  std::size_t at = 0;
  while (at < text.size()) {
    const std::size_t got = file.ReadAt(at, text.data() + at, text.size() - at);
    if (got == 0) break;
    at += got;
  }
  text.resize(at);
  return text;
}

std::string FilesCheck::PathOnServer(std::string_view source) {
  std::string path(source);
  std::replace(path.begin(), path.end(), '\\', '/');
  return path.substr(std::min(path.find_first_not_of('/'), path.size()));
}

FilesCheck::FilesCheck(const JobCheck& check, server::Site* site) : check_(check), site_(site) {
  const auto& job = check.job;
  has_ram_ = std::any_of(job.stores.begin(), job.stores.end(),
                         [](const StoreSettings& store) {
                           return base::StartsWith(store.name.text, kRamName);
                         }) ||
             std::any_of(job.packages.begin(), job.packages.end(), [](const auto& package) {
               return upgrade::PackageRamSize(package.options.text) != 0;
             });
}

// ---- what the job or a line of the list says ----

void FilesCheck::Source(const WantedFile& file) {
  if (file.source.empty()) {
    Add(Rule::kFileNoSource, file.where, "no Source for " + Quoted(file.destination));
    return;
  }
  // A base URL with a path of its own goes in front.
  const std::string& url = check_.job.base_url.text;
  if (url.find_first_of("/\\", 8) != std::string::npos) return;
  const auto letter = std::find_if(file.source.begin(), file.source.end(), IsLetter);
  const auto start = std::find_if(file.source.begin(), file.source.end(),
                                  [](char c) { return c != '/' && c != '\\'; });
  if (letter == file.source.end()) {
    Add(Rule::kPathNoLetter, file.where, "the path on the server is " + Quoted(file.source));
  } else if (letter != start) {
    Add(Rule::kPathLeading, file.where, "the path on the server is " + Quoted(file.source));
  }
}

void FilesCheck::Destination(const WantedFile& file) {
  const std::string_view path = file.destination;
  const std::string found = "the path on the device is " + Quoted(path);
  if (path.empty()) {
    Add(Rule::kFileNoDestination, file.where, "no Dest for " + Quoted(file.source));
    return;
  }
  if (base::StartsWith(path, kRamName)) {
    if (!has_ram_) Add(Rule::kRamWithoutStore, file.where, found);
    if (path.size() - kRamName.size() > kLongestRamName) Add(Rule::kRamName, file.where, found);
    return;
  }
  if (base::EqualIgnoringCase(path.substr(0, kRamName.size()), kRamName)) {
    Add(Rule::kRamCase, file.where, found);
    return;
  }
  if (path.find("%CE") != std::string_view::npos) Add(Rule::kDestinationMacro, file.where, found);
  if (path.find_first_of("<>:\"|?*") != std::string_view::npos) {
    Add(Rule::kDestinationName, file.where, found);
  }
  if (path.back() == '\\' || path.back() == '/') Add(Rule::kDestinationFolder, file.where, found);
  if (path.front() != '\\') Add(Rule::kDestinationRelative, file.where, found);
}

void FilesCheck::Twice(const WantedFile& file) {
  if (file.destination.empty()) return;
  std::string key = PathKey(file.destination);
  const auto [known, is_new] =
      destinations_.emplace(key, std::pair(file.where, std::string(file.masks)));
  if (!is_new) {
    const bool same =
        known->second.second == file.masks || file.masks == "*" || known->second.second == "*";
    Add(same ? Rule::kDuplicateDestination : Rule::kDuplicateForOthers, file.where,
        Quoted(file.destination) + " comes from " + known->second.first + " too");
  }
  const bool renamed = base::EndsWith(file.destination, kRename);
  const std::string partner =
      renamed ? key.substr(0, key.size() - kRename.size()) : key + std::string(kRename);
  if (const auto other = destinations_.find(partner); other != destinations_.end()) {
    Add(Rule::kRenameTarget, file.where,
        Quoted(file.destination) + " and the file of " + other->second.first);
  }
}

void FilesCheck::Crc(const WantedFile& file) {
  if (!IsNumber(file.crc, kLargestCrc)) {
    Add(Rule::kCrcNumber, file.where,
        "the CRC of " + Quoted(file.destination) + " is " + Quoted(file.crc));
  } else if (base::LeadingNumber(file.crc) == 0) {
    Add(Rule::kCrcZero, file.where, "the CRC of " + Quoted(file.destination) + " is 0");
  }
}

void FilesCheck::Wanted(const WantedFile& file) {
  Source(file);
  Destination(file);
  Twice(file);
}

void FilesCheck::Downloads() {
  const DeviceJob& job = check_.job;
  if (!job.list && job.downloads.empty() && job.packages.empty() && job.inf.text.empty()) {
    check_.Add(Rule::kNothingToFetch, std::max(job.upgrade_line, 1),
               job.is_configuration ? "neither Downloads nor OSFirmware nor InfFile"
                                    : "neither FileList nor Download");
  }
  if (job.list) {
    const DownloadSettings& list = *job.list;
    const WantedFile file{
        InJob(list.line), list.source.text, list.destination.text, "*", list.crc.text, {}};
    Wanted(file);
    if (!IsNumber(list.crc.text, kLargestCrc)) {
      Crc(file);
    } else if (site_ == nullptr && base::LeadingNumber(list.crc.text) == 0) {
      // Unlike a file's, this 0 is compared.
      Add(Rule::kListCrc, file.where, "the CRC of the list is 0");
    }
  }
  for (const DownloadSettings& download : job.downloads) {
    const WantedFile file{InJob(download.line), download.source.text, download.destination.text,
                          download.masks.text,  download.crc.text,    {}};
    Wanted(file);
    Served(file);
    sizes_known_ = false;
    if (job.is_configuration) continue;  // which has neither
    Crc(file);
    if (download.masks.text.find_first_not_of(" ;") == std::string::npos) {
      Add(Rule::kFileNoMask, file.where, "no MCTMask for " + Quoted(file.destination));
    }
  }
}

// ---- what the server has ----

void FilesCheck::Served(const WantedFile& file) {
  if (site_ == nullptr || file.source.empty()) return;
  const std::string path = PathOnServer(file.source);
  asked_.insert(path);
  const auto served = site_->Open(path);
  if (served == nullptr) {
    Add(Rule::kFileMissing, file.where, Quoted(path) + " is not there");
    return;
  }
  // A list cannot say 0: it would mean that the file is not looked at.
  const std::uint32_t crc = base::LeadingNumber(file.crc);
  const bool empty_as_one = served->crc32() == 0 && crc == 1;
  if (crc != 0 && crc != served->crc32() && !empty_as_one) {
    Add(Rule::kFileCrc, file.where,
        Quoted(path) + " has the CRC " + std::to_string(served->crc32()) + ", not " +
            std::to_string(crc));
  }
  if (!file.size.empty() && base::LeadingNumber(file.size) != served->size()) {
    Add(Rule::kFileSize, file.where,
        Quoted(path) + " has " + std::to_string(served->size()) + " bytes, not " +
            std::string(file.size));
  }
  if (IsInstalledPackage(check_.job, file.destination) && served->size() <= kMaxCabinet) {
    CheckCabinet(check_, file.where, file.destination, ReadServed(*served));
  }
}

/// @return false when the record and all behind it would be misread.
bool FilesCheck::Record(std::string_view line, const std::string& where) {
  const std::vector<std::string_view> fields = Fields(line);
  const bool whole = fields.size() == 5 && std::none_of(fields.begin(), fields.end(),
                                                        [](auto field) { return field.empty(); });
  if (!whole) {
    Add(Rule::kListShift, where,
        std::to_string(fields.size()) + " fields, or an empty one: " + Quoted(line));
    return false;
  }
  const WantedFile file{where, fields[0], fields[1], fields[2], fields[3], fields[4]};
  constexpr std::size_t kPath = 259, kMasks = 2007, kNumber = 31;
  if (file.source.size() > kPath || file.destination.size() > kPath || file.masks.size() > kMasks ||
      file.crc.size() > kNumber || file.size.size() > kNumber) {
    Add(Rule::kListFieldLong, where, "the record of " + Quoted(file.destination));
    return true;
  }
  Wanted(file);
  Crc(file);
  if (!IsNumber(file.size, kLargestSize)) {
    Add(Rule::kSizeNumber, where,
        "the size of " + Quoted(file.destination) + " is " + Quoted(file.size));
    sizes_known_ = false;
  }
  listed_bytes_ += base::LeadingNumber(file.size);
  masks_.insert(std::string(file.masks));
  if (!base::StartsWith(file.destination, kRamName)) listed_.emplace_back(file.destination);
  Served(file);
  return true;
}

void FilesCheck::ServedList(const std::string& text) {
  const std::string& list_name = check_.job.list->source.text;
  const std::string_view bytes = std::string_view(text).substr(0, text.find('\0'));
  int number = 1;
  bool good = true;
  for (std::size_t start = 0; good && start < bytes.size(); ++number) {
    const std::size_t end = std::min(bytes.find('\n', start), bytes.size());
    std::string_view line = bytes.substr(start, end - start);
    while (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    if (!line.empty()) good = Record(line, PathOnServer(list_name) + ":" + std::to_string(number));
    start = end + 1;
  }
  if (bytes.size() < text.size()) {
    Add(Rule::kListZeroByte, PathOnServer(list_name) + ":" + std::to_string(number),
        "a zero byte at offset " + std::to_string(bytes.size()));
  }
  if (good) Sizes();
}

/// Compares the sum of the list with the sum of the requirements, where one sum holds for every
/// device.
void FilesCheck::Sizes() {
  const auto& stores = check_.job.stores;
  if (!sizes_known_ || masks_.size() > 1 || stores.empty()) return;
  std::uint64_t required = 0;
  for (const StoreSettings& store : stores) {
    if (!IsNumber(store.space.text, kLargestSize)) return;
    required += base::LeadingNumber(store.space.text);
  }
  if (required == listed_bytes_) return;
  check_.Add(required < listed_bytes_ ? Rule::kSizeShort : Rule::kSizeReserve, stores.front().line,
             std::to_string(required) + " bytes are required, the list's files have " +
                 std::to_string(listed_bytes_));
}

void FilesCheck::List() {
  if (site_ == nullptr || !check_.job.list || check_.job.list->source.text.empty()) return;
  const DownloadSettings& list = *check_.job.list;
  const std::string path = PathOnServer(list.source.text);
  const std::string where = InJob(list.line);
  asked_.insert(path);
  const auto served = site_->Open(path);
  if (served == nullptr) {
    Add(Rule::kListMissing, where, Quoted(path) + " is not there");
    return;
  }
  if (base::LeadingNumber(list.crc.text) != served->crc32()) {
    Add(Rule::kListCrc, where,
        Quoted(path) + " has the CRC " + std::to_string(served->crc32()) + ", not " +
            Quoted(list.crc.text));
  }
  if (served->size() > kMaxListFile) {
    Add(Rule::kListFieldLong, where,
        Quoted(path) + " has " + std::to_string(served->size()) + " bytes");
    return;
  }
  ServedList(ReadServed(*served));
}

/// Follows a device that makes folders as files are announced, those with the shortest paths first.
void FilesCheck::Folders() {
  const auto depth = [](const std::string& path) {
    return std::count(path.begin(), path.end(), '\\');
  };
  std::stable_sort(listed_.begin(), listed_.end(),
                   [&depth](const auto& a, const auto& b) { return depth(a) < depth(b); });
  std::set<std::string> there = {"",
                                 "\\windows",
                                 "\\temp",
                                 "\\program files",
                                 "\\my documents",
                                 "\\flash file store",
                                 "\\sdmmc disk",
                                 "\\storage card",
                                 "\\sd card"};
  const auto above = [](const std::string& path) {
    return path.substr(0, std::min(path.rfind('\\'), path.size()));
  };
  std::string first;
  std::size_t count = 0;
  for (const std::string& file : listed_) {
    const std::string folder = above(PathKey(file));
    if (there.count(folder) == 0 && there.count(above(folder)) == 0) {
      if (++count == 1) first = file;
      continue;
    }
    there.insert(folder);
  }
  if (count == 0) return;
  check_.Add(Rule::kMulticastFolder, check_.job.multicast_parameters.line,
             Quoted(first) + (count == 1 ? "" : " and " + std::to_string(count - 1) + " more"));
}

void FilesCheck::Multicast() {
  const Setting& parameters = check_.job.multicast_parameters;
  if (parameters.text.empty()) return;
  const MulticastLine line = ReadMulticastLine(parameters.text);
  if (line.refused) return;
  const bool for_some =
      site_ == nullptr || std::any_of(masks_.begin(), masks_.end(),
                                      [](const std::string& masks) { return masks != "*"; });
  if (for_some && line.text.value_or("").empty()) {
    check_.Add(Rule::kMulticastNoText, parameters.line,
               "Parameters are " + Quoted(parameters.text));
  }
  Folders();
}

void FilesCheck::Unlisted() {
  constexpr std::size_t kNamed = 3;
  std::string names;
  std::size_t count = 0;
  std::error_code error;
  for (fs::recursive_directory_iterator at(site_->root(), error), end; !error && at != end;
       at.increment(error)) {
    const std::string path = at->path().lexically_relative(site_->root()).generic_string();
    if (at->is_directory(error) || asked_.count(path) != 0) continue;
    if (++count <= kNamed) names += (names.empty() ? "" : ", ") + Quoted(path);
  }
  if (count == 0) return;
  Add(Rule::kFileUnlisted, site_->root().string(),
      std::to_string(count) + (count == 1 ? " file: " : " files: ") + names +
          (count > kNamed ? ", ..." : ""));
}

void CheckFiles(const JobCheck& check, server::Site* site, bool unlisted) {
  FilesCheck files(check, site);
  files.Downloads();
  files.List();
  files.Multicast();
  files.Packages();
  files.Inf();
  if (site != nullptr && unlisted) files.Unlisted();
}

}  // namespace tools
