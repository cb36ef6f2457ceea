// Finding what a path of the device names, and its record.
#include "ce/errors.h"
#include "device/device.h"
#include "storage/storage.h"
#include "text/names.h"

namespace sim {

DWORD Storage::Locate(const WCHAR* name, Location& location) {
  DevicePath path;
  if (const DWORD error = ParsePath(name, false, path); error != ERROR_SUCCESS) return error;
  return LocateParsed(path, location);
}

DWORD Storage::LocateParsed(const DevicePath& path, Location& location) {
  location = {};
  location.volume = volumes_[0].get();
  location.folder = root_fd_.get();
  if (path.names.empty()) {
    location.volume_root = true;
    return ERROR_SUCCESS;
  }
  if (Volume* const volume = VolumeNamed(path.names[0])) {
    location.volume = volume;
    location.volume_root = path.names.size() == 1;
    if (!volume->present() && !location.volume_root) return ERROR_PATH_NOT_FOUND;
  }
  for (std::size_t i = 0; i + 1 < path.names.size(); ++i) {
    const std::optional<HostEntry> folder = folder_names_.Find(location.folder, path.names[i]);
    if (!folder || !folder->folder) return ERROR_PATH_NOT_FOUND;
    UniqueFd next = OpenFolder(location.folder, folder->name);
    if (!next) return ERROR_PATH_NOT_FOUND;
    location.owned_folder = std::move(next);
    location.folder = location.owned_folder.get();
    location.folder_path += folder->name + '/';
  }
  location.leaf = path.names.back();
  location.entry = folder_names_.Find(location.folder, location.leaf);
  if (path.closed && location.entry && !location.entry->folder) return ERROR_PATH_NOT_FOUND;
  location.closed = path.closed;
  return ERROR_SUCCESS;
}

FileRecord Storage::RecordOf(const Location& location) const {
  if (const std::shared_ptr<FileNode> node = FindNode(*location.entry)) {
    const std::lock_guard<std::mutex> hold(node->mutex);
    return node->record;
  }
  if (const auto kept = records_->Find(location.path())) return *kept;
  const FileTicks then = location.entry->modified;
  return {location.entry->folder ? 0U : FILE_ATTRIBUTE_ARCHIVE, then, then, then};
}

DWORD Storage::ShownAttributes(const Location& location, const FileRecord& record) {
  if (location.volume_root) return FILE_ATTRIBUTE_DIRECTORY | FILE_ATTRIBUTE_TEMPORARY;
  const DWORD folder = location.entry->folder ? FILE_ATTRIBUTE_DIRECTORY : 0U;
  const DWORD shown = folder | record.attributes;
  return shown == 0 ? FILE_ATTRIBUTE_NORMAL : shown;
}

void Storage::SetRecord(const Location& location, const FileRecord& record) {
  if (const std::shared_ptr<FileNode> node = FindNode(*location.entry)) {
    const std::lock_guard<std::mutex> hold(node->mutex);
    node->record = record;
    node->changed = false;
  }
  records_->Set(location.path(), record);
}

std::shared_ptr<FileNode> Storage::FindNode(const HostEntry& entry) const {
  const auto found = nodes_.find({entry.device, entry.inode});
  return found == nodes_.end() ? nullptr : found->second.lock();
}

bool Storage::OpenBelow(const std::string& path) const {
  const std::string below = path + '/';
  for (const auto& [key, weak] : nodes_) {
    const std::shared_ptr<FileNode> node = weak.lock();
    if (node != nullptr && node->path.compare(0, below.size(), below) == 0) return true;
  }
  return false;
}

DWORD Storage::GetAttributes(const WCHAR* name, DWORD& attributes) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(name, location); error != ERROR_SUCCESS) return error;
  if (location.volume_root) {
    if (!location.volume->present()) return ERROR_FILE_NOT_FOUND;
    attributes =
        location.volume->is_root() ? FILE_ATTRIBUTE_DIRECTORY : ShownAttributes(location, {});
    return ERROR_SUCCESS;
  }
  if (!location.entry) return ERROR_FILE_NOT_FOUND;
  attributes = ShownAttributes(location, RecordOf(location));
  return ERROR_SUCCESS;
}

DWORD Storage::SetAttributes(const WCHAR* name, DWORD attributes) {
  return ChangeAttributes(name, attributes, kSettableAttributes);
}

DWORD Storage::ChangeAttributes(const WCHAR* name, DWORD attributes, DWORD settable) {
  const Hold hold(mutex_);
  Location location;
  if (const DWORD error = Locate(name, location); error != ERROR_SUCCESS) return error;
  if (location.volume_root) return ERROR_ACCESS_DENIED;
  if (!location.entry) return ERROR_FILE_NOT_FOUND;
  FileRecord record = RecordOf(location);
  record.attributes = (record.attributes & ~settable) | (attributes & settable);
  SetRecord(location, record);
  return ERROR_SUCCESS;
}

// ---- searches ----

DWORD Storage::FindFirst(const WCHAR* pattern, std::shared_ptr<Search>& search,
                         WIN32_FIND_DATAW& data) {
  DevicePath path;
  if (const DWORD error = ParsePath(pattern, true, path); error != ERROR_SUCCESS) return error;
  if (path.names.empty() || path.closed) return ERROR_FILE_NOT_FOUND;
  {
    const Hold hold(mutex_);
    Location location;
    if (const DWORD error = LocateParsed(path, location); error != ERROR_SUCCESS) return error;
    std::vector<std::u16string> names;
    if (location.leaf.find_first_of(u"*?") == std::u16string::npos) {
      std::u16string name;
      if (location.entry && FromHostText(location.entry->name, name)) names.push_back(name);
    } else {
      for (std::u16string& name : ListNames(location.folder)) {
        if (MatchesWildCards(name, location.leaf)) names.push_back(std::move(name));
      }
    }
    if (!location.owned_folder) {
      location.owned_folder = OpenFolder(root_fd_.get(), ".");
      if (!location.owned_folder) return ERROR_TOO_MANY_OPEN_FILES;
      location.folder = location.owned_folder.get();
    }
    search = std::make_shared<Search>(std::move(location), std::move(names));
  }
  const DWORD error = FindNext(*search, data);
  return error == ERROR_NO_MORE_FILES ? ERROR_FILE_NOT_FOUND : error;
}

DWORD Storage::FindNext(Search& search, WIN32_FIND_DATAW& data) {
  const Hold hold(mutex_);
  while (search.next < search.names.size()) {
    if (Describe(search, search.names[search.next++], data)) return ERROR_SUCCESS;
  }
  return ERROR_NO_MORE_FILES;
}

bool Storage::Describe(Search& search, const std::u16string& name, WIN32_FIND_DATAW& data) {
  Location& at = search.location;
  at.entry = StatEntry(at.folder, ToHostText(name));
  if (!at.entry || name.size() >= MAX_PATH) return false;
  const Volume* const volume =
      at.folder_path.empty() && at.entry->folder ? VolumeNamed(name) : nullptr;
  if (volume != nullptr && !volume->present()) return false;
  at.volume_root = volume != nullptr;
  const FileRecord record = RecordOf(at);
  data = {};
  data.dwFileAttributes = ShownAttributes(at, record);
  data.ftCreationTime = ToFileTime(record.created);
  data.ftLastAccessTime = ToFileTime(record.accessed);
  data.ftLastWriteTime = ToFileTime(record.written);
  data.nFileSizeHigh = static_cast<DWORD>(at.entry->size >> 32U);
  data.nFileSizeLow = static_cast<DWORD>(at.entry->size & 0xFFFFFFFFU);
  name.copy(data.cFileName, name.size());
  return true;
}

}  // namespace sim
