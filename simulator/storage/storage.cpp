// A device's volumes and the room in them, and what tests and tools ask for.
#include "storage/storage.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <stdexcept>

#include "ce/errors.h"
#include "device/device.h"
#include "memory/memory.h"
#include "profile/profile.h"
#include "text/names.h"

namespace sim {
namespace {

/// Deeper than any path that the device can say.
constexpr int kDeepest = 300;

[[noreturn]] void ThrowHostError(const std::filesystem::path& path) {
  throw std::runtime_error("cannot use " + path.string() + ": " + std::strerror(errno));
}

/// Opens a folder that may have to be made.
UniqueFd MakeFolder(int parent, const std::string& name) {
  if (::mkdirat(parent, name.c_str(), 0755) != 0 && errno != EEXIST) return {};
  return OpenFolder(parent, name);
}

}  // namespace

std::string Location::path() const {
  return folder_path + (entry ? entry->name : ToHostText(leaf));
}

Storage::Storage(Device& device) : device_(device), folder_(device.folder() / "storage") {
  std::error_code failed;
  std::filesystem::create_directories(device.folder(), failed);
  const UniqueFd own(::open(device.folder().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!own) ThrowHostError(device.folder());
  root_fd_ = MakeFolder(own.get(), "storage");
  if (!root_fd_) ThrowHostError(folder_);
  records_ = std::make_unique<FileRecords>(device.folder() / "storage.attributes");
  volumes_.push_back(std::make_unique<Volume>(device.memory().store()));
  ReadProfile();
  std::set<std::string> existing;
  Count([&existing](const std::string& path) { existing.insert(path); });
  records_->Prune([&existing](const std::string& path) { return existing.count(path) != 0; });
  device.memory().GrowStoreFor(device.memory().store().figures().used);
}

Storage::~Storage() {
  mappings_.DetachAll();
  streams_.Clear();
  const std::set<OpenFile*> left = open_files_;
  for (OpenFile* file : left) Close(*file);
}

void Storage::ReadProfile() {
  for (const VolumeProfile& profile : device_.profile().volumes) {
    std::u16string name;
    DevicePath path;
    const bool readable =
        FromHostText(profile.path, name) && ParsePath(name.c_str(), false, path) == ERROR_SUCCESS;
    if (readable && path.names.empty()) continue;  // the root is there anyway
    if (!readable || path.names.size() != 1 || VolumeNamed(path.names[0]) != nullptr) {
      throw std::runtime_error("the device profile's volume \"" + profile.path +
                               "\" is no single folder of the root, or named twice");
    }
    volumes_.push_back(std::make_unique<Volume>(path.names[0], profile.capacity, profile.present));
    if (profile.present) MakeVolumeFolder(*volumes_.back());
  }
}

void Storage::MakeVolumeFolder(const Volume& volume) {
  const std::optional<HostEntry> there = folder_names_.Find(root_fd_.get(), volume.name());
  if (there && there->folder) return;
  const std::string name = ToHostText(volume.name());
  if (!MakeFolder(root_fd_.get(), name)) ThrowHostError(folder_ / name);
  const FileTicks now = SystemTicks(device_);
  records_->Set(name, {0, now, now, now});
}

Volume* Storage::VolumeNamed(std::u16string_view name) const {
  for (const auto& volume : volumes_) {
    if (!volume->is_root() && SameName(volume->name(), name)) return volume.get();
  }
  return nullptr;
}

void Storage::Count(const std::function<void(const std::string&)>& seen) {
  std::uint64_t in_root = 0;
  for (const std::u16string& name : ListNames(root_fd_.get())) {
    const std::string host_name = ToHostText(name);
    const std::optional<HostEntry> entry = StatEntry(root_fd_.get(), host_name);
    if (!entry) continue;
    seen(host_name);
    const UniqueFd below = entry->folder ? OpenFolder(root_fd_.get(), host_name) : UniqueFd();
    const std::uint64_t bytes =
        below ? CountFolder(below.get(), host_name + '/', 1, seen) : entry->size;
    Volume* const volume = entry->folder ? VolumeNamed(name) : nullptr;
    if (volume == nullptr) {
      in_root += bytes;
    } else {
      volume->space().SetUsed(bytes);
    }
  }
  volumes_[0]->space().SetUsed(in_root);
}

std::uint64_t Storage::CountFolder(int folder, const std::string& path, int depth,
                                   const std::function<void(const std::string&)>& seen) {
  std::uint64_t bytes = 0;
  for (const std::u16string& name : ListNames(folder)) {
    const std::string host_name = ToHostText(name);
    const std::optional<HostEntry> entry = StatEntry(folder, host_name);
    if (!entry) continue;
    seen(path + host_name);
    bytes += entry->size;
    if (!entry->folder || depth == kDeepest) continue;
    const UniqueFd below = OpenFolder(folder, host_name);
    if (below) bytes += CountFolder(below.get(), path + host_name + '/', depth + 1, seen);
  }
  return bytes;
}

void Storage::Recount() {
  const Hold hold(mutex_);
  // No file may grow between its counting and the new figures.
  std::vector<std::shared_ptr<FileNode>> nodes;
  std::vector<std::unique_lock<std::mutex>> quiet;
  for (const auto& [key, weak] : nodes_) {
    if (auto node = weak.lock()) nodes.push_back(std::move(node));
  }
  quiet.reserve(nodes.size());
  for (const auto& node : nodes) quiet.emplace_back(node->mutex);
  Count([](const std::string&) {});
}

DWORD Storage::SetAllAttributes(const WCHAR* name, DWORD attributes) {
  return ChangeAttributes(name, attributes, kSettableAttributes | FILE_ATTRIBUTE_INROM);
}

bool Storage::SetVolumePresent(const WCHAR* name, bool present) {
  DevicePath path;
  if (ParsePath(name, false, path) != ERROR_SUCCESS || path.names.size() != 1) return false;
  const Hold hold(mutex_);
  Volume* const volume = VolumeNamed(path.names[0]);
  if (volume == nullptr) return false;
  if (present) MakeVolumeFolder(*volume);
  volume->set_present(present);
  return true;
}

void Storage::ShareContent(SharedContent content) {
  const Hold hold(mutex_);
  shared_content_ = std::move(content);
}

void Storage::PutSharedParts(const Location& location) {
  const auto found = shared_parts_.find({location.entry->device, location.entry->inode});
  if (found == shared_parts_.end()) return;
  const std::shared_ptr<FileNode> node = FindNode(*location.entry);
  std::unique_lock<std::mutex> quiet;
  if (node != nullptr) quiet = std::unique_lock(node->mutex);
  const UniqueFd file(::openat(location.folder, location.entry->name.c_str(),
                               O_WRONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  bool written = static_cast<bool>(file);
  found->second->ForEach([&](std::uint64_t at, const char* bytes, std::size_t size) {
    written = written && ::pwrite(file.get(), bytes, size, static_cast<off_t>(at)) ==
                             static_cast<ssize_t>(size);
  });
  if (!written) return;
  found->second->Cut(0);
  if (node == nullptr) return;
  node->host_is_short = false;
  ++node->version;
}

std::optional<std::filesystem::path> Storage::HostPath(const WCHAR* name) {
  const Hold hold(mutex_);
  Location location;
  if (Locate(name, location) != ERROR_SUCCESS || !location.volume->present()) return std::nullopt;
  if (location.entry) {
    PutSharedParts(location);
    return folder_ / location.path();
  }
  if (location.volume_root && location.volume->is_root()) return folder_;
  return std::nullopt;
}

std::size_t Storage::open_files() const {
  const Hold hold(mutex_);
  return open_files_.size();
}

DWORD Storage::FreeSpace(const WCHAR* name, Space::Figures& room) {
  DevicePath path;
  if (const DWORD error = ParsePath(name, false, path); error != ERROR_SUCCESS) return error;
  const Hold hold(mutex_);
  Volume* volume = path.names.empty() ? volumes_[0].get() : VolumeNamed(path.names[0]);
  if (volume == nullptr) {
    if (!folder_names_.Find(root_fd_.get(), path.names[0])) return ERROR_PATH_NOT_FOUND;
    volume = volumes_[0].get();
  }
  if (!volume->present()) return ERROR_PATH_NOT_FOUND;
  room = volume->space().figures();
  return ERROR_SUCCESS;
}

void Storage::Keep(FileNode& node) {
  if (!node.changed) return;
  records_->Set(node.path, node.record);
  node.changed = false;
}

void Storage::Flush(FileNode& node) {
  Keep(node);
  records_->Flush();
}

}  // namespace sim
