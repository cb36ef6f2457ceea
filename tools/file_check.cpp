#include "tools/file_check.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <optional>

#include "base/crc32.h"
#include "base/number.h"
#include "base/text.h"
#include "device/device.h"
#include "driver/flash_driver.h"
#include "server/site.h"
#include "storage/storage.h"
#include "text/names.h"
#include "tools/file_text.h"
#include "tools/lint/device_configuration.h"
#include "upgrade/list_file/inf_file.h"
#include "upgrade/list_file/list_file.h"
#include "upgrade/list_file/package_options.h"
#include "upgrade/list_file/patterns.h"

namespace tools {
namespace {

constexpr std::string_view kRename = ".rename";
constexpr std::string_view kRamFile = "RAM:";

std::optional<std::filesystem::path> OnHost(sim::Storage& storage, std::string_view path) {
  std::u16string name;
  if (!sim::FromHostText(path, name)) return std::nullopt;
  return storage.HostPath(name.c_str());
}

/// A file that is listed as "x.rename" ends up as "x", unless there was an "x" already.
std::optional<std::filesystem::path> FindFile(sim::Device& device, std::string_view path) {
  if (base::StartsWith(path, kRamFile)) {
    auto image = sim::FlashDriver::ImageFile(device, path.substr(kRamFile.size()));
    if (!std::filesystem::exists(image)) return std::nullopt;
    return image;
  }
  auto found = OnHost(device.storage(), path);
  if (!found && base::EndsWith(path, kRename)) {
    found = OnHost(device.storage(), path.substr(0, path.size() - kRename.size()));
  }
  return found;
}

/// What it is when there is no such file: before it flashes, a device keeps one of its loader
/// images.
FileState Absent(std::string_view path) {
  const bool in_root = !path.empty() && path.rfind('\\') == 0;
  const bool is_loader =
      in_root && (base::EndsWith(path, ".IPL.G3.nb0") || base::EndsWith(path, ".IPL.G4.nb0") ||
                  base::EndsWith(path, ".IPL.H3.nb0"));
  return is_loader ? FileState::kRemoved : FileState::kMissing;
}

struct Content {
  std::uint64_t size = 0;
  std::uint32_t crc = 0;
};

Content ContentOf(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  std::vector<char> block(std::size_t{1} << 16U);
  base::Crc32 crc;
  Content content;
  while (in) {
    in.read(block.data(), static_cast<std::streamsize>(block.size()));
    crc.Update(block.data(), static_cast<std::size_t>(in.gcount()));
    content.size += static_cast<std::uint64_t>(in.gcount());
  }
  content.crc = crc.value();
  return content;
}

FileState Check(const std::filesystem::path& file, const upgrade::ListRecord& record) {
  const Content content = ContentOf(file);
  // A CRC of 0 cannot be listed; such a file has 1 in its place.
  const std::uint32_t listed = content.crc == 0 ? 1 : content.crc;
  const bool right =
      content.size == base::LeadingNumber(record.size) && listed == base::LeadingNumber(record.crc);
  return right ? FileState::kRight : FileState::kWrong;
}

/// Looks at one file after the other.
class ConfiguredFiles {
 public:
  ConfiguredFiles(sim::Device& device, server::Site* site) : device_(device), site_(site) {}

  void Add(const std::string& source, const std::string& destination) {
    CheckedFile checked{destination, Absent(destination)};
    if (const auto file = FindFile(device_, destination)) checked.state = Compare(*file, source);
    check_.files.push_back(std::move(checked));
  }

  /// The INF file as it came to the device, and what it names there.
  void AddInf(const std::string& source) {
    const std::size_t at = source.find_last_of("\\/:");
    const std::string folder = source.substr(0, at == std::string::npos ? 0 : at + 1);
    const std::string path = "\\" + source.substr(folder.size());
    Add(source, path);
    const auto file = OnHost(device_.storage(), path);
    if (!file) return;
    const std::string text = ReadWholeFile(*file);
    upgrade::InfFileReader reader(text);
    for (upgrade::InfEntry entry; reader.Next(&entry);) {
      if (!upgrade::InfPatternMatches(entry.pattern, device_.profile().configuration)) continue;
      const std::size_t name = entry.source.find_last_of("\\/");
      Add(folder + std::string(entry.source.substr(name == std::string_view::npos ? 0 : name + 1)),
          std::string(entry.destination));
    }
  }

  [[nodiscard]] FileCheck Finish() {
    check_.list_found = true;
    return std::move(check_);
  }

 private:
  [[nodiscard]] FileState Compare(const std::filesystem::path& file, std::string source) const {
    if (site_ == nullptr) return FileState::kUnchecked;
    std::replace(source.begin(), source.end(), '\\', '/');
    const auto served =
        site_->Open(source.substr(std::min(source.find_first_not_of('/'), source.size())));
    if (served == nullptr) return FileState::kUnchecked;
    const Content content = ContentOf(file);
    const bool right = content.size == served->size() && content.crc == served->crc32();
    return right ? FileState::kRight : FileState::kWrong;
  }

  sim::Device& device_;
  server::Site* const site_;
  FileCheck check_;
};

}  // namespace

bool FileCheck::all_right() const {
  return std::all_of(files.begin(), files.end(), [](const CheckedFile& file) {
    return file.state != FileState::kWrong && file.state != FileState::kMissing;
  });
}

const char* NameOf(FileState state) {
  switch (state) {
    case FileState::kRight: return "right";
    case FileState::kWrong: return "wrong";
    case FileState::kMissing: return "missing";
    case FileState::kUnchecked: return "unchecked";
    case FileState::kRemoved: return "removed";
  }
  return "";
}

FileCheck CheckFiles(sim::Device& device, const Job& job) {
  FileCheck check;
  const std::string list_path = FindField(job, "FileList", "Dest");
  if (list_path.empty()) {
    check.list_found = true;
    return check;
  }
  const auto list_file = OnHost(device.storage(), list_path);
  if (!list_file) return check;
  check.list_found = true;
  const std::string list = ReadWholeFile(*list_file);
  upgrade::ListFileReader reader(list);
  for (upgrade::ListRecord record; reader.Next(&record);) {
    if (!upgrade::AnyListPatternMatches(record.masks, device.profile().configuration)) continue;
    CheckedFile checked{std::string(record.destination), Absent(record.destination)};
    if (const auto file = FindFile(device, record.destination)) {
      checked.state =
          base::LeadingNumber(record.crc) == 0 ? FileState::kUnchecked : Check(*file, record);
    }
    check.files.push_back(std::move(checked));
  }
  return check;
}

FileCheck CheckConfiguredFiles(sim::Device& device, const DeviceJob& job, int pass,
                               server::Site* site) {
  ConfiguredFiles files(device, site);
  const auto packages = PackagesFor(job, device.profile().configuration);
  const bool multi_pass = IsMultiPass(packages);
  for (const PackageSettings* package : packages) {
    if (multi_pass && upgrade::PackagePass(package->options.text) != pass) continue;
    for (const PackageFile& file : FilesOf(*package)) files.Add(file.source, file.destination);
  }
  if (!job.inf.text.empty()) files.AddInf(job.inf.text);
  for (const DownloadSettings& file : job.downloads) {
    files.Add(file.source.text, file.destination.text);
  }
  return files.Finish();
}

}  // namespace tools
