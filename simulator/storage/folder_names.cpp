#include "storage/folder_names.h"

#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>

#include "storage/device_path.h"
#include "text/names.h"

namespace sim {
namespace {

/// Smaller folders are read as quickly as they are asked about.
constexpr std::size_t kLarge = 64;
constexpr std::size_t kMostFolders = 64;

constexpr std::size_t kLargestEvent = sizeof(inotify_event) + NAME_MAX + 1;

constexpr std::uint32_t kAppears = IN_CREATE | IN_MOVED_TO;
constexpr std::uint32_t kVanishes = IN_DELETE | IN_MOVED_FROM;

std::vector<std::u16string> Matching(const std::vector<std::u16string>& all,
                                     std::u16string_view name) {
  std::vector<std::u16string> alike;
  for (const std::u16string& other : all) {
    if (SameName(other, name)) alike.push_back(other);
  }
  return alike;
}

void AddOnce(std::vector<std::u16string>& names, std::u16string name) {
  if (std::find(names.begin(), names.end(), name) == names.end()) {
    names.push_back(std::move(name));
  }
}

}  // namespace

std::optional<HostEntry> FolderNames::Find(int folder, std::u16string_view name) {
  if (std::optional<HostEntry> exact = StatEntry(folder, ToHostText(name))) return exact;
  std::vector<std::u16string> alike = Alike(folder, name);
  std::sort(alike.begin(), alike.end());
  for (const std::u16string& other : alike) {
    if (std::optional<HostEntry> entry = StatEntry(folder, ToHostText(other))) return entry;
  }
  return std::nullopt;
}

std::vector<std::u16string> FolderNames::Alike(int folder, std::u16string_view name) {
  struct stat status {};
  if (::fstat(folder, &status) != 0) return {};
  TakeChanges();
  const Key key = {status.st_dev, status.st_ino};
  const auto known = folders_.find(key);
  const Folder* kept = known == folders_.end() ? nullptr : &known->second;
  if (kept == nullptr) {
    const std::vector<std::u16string> all = ReadNames(folder);
    if (all.size() >= kLarge) kept = Keep(folder, key);
    if (kept == nullptr) return Matching(all, name);
  }
  const auto found = kept->names.find(FoldCase(name));
  return found == kept->names.end() ? std::vector<std::u16string>() : found->second;
}

FolderNames::Folder* FolderNames::Keep(int folder, const Key& key) {
  if (!changes_) changes_ = UniqueFd(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (!changes_) return nullptr;
  if (folders_.size() >= kMostFolders) ForgetAll();
  const std::string path = "/proc/self/fd/" + std::to_string(folder);
  const int watch =
      ::inotify_add_watch(changes_.get(), path.c_str(), kAppears | kVanishes | IN_ONLYDIR);
  if (watch < 0) return nullptr;
  watches_[watch] = key;
  Folder& kept = folders_[key];
  kept.watch = watch;
  // Read again, now that nothing can change unseen; what is then told twice counts once.
  for (std::u16string& name : ReadNames(folder)) {
    std::vector<std::u16string>& alike = kept.names[FoldCase(name)];
    AddOnce(alike, std::move(name));
  }
  return &kept;
}

void FolderNames::TakeChanges() {
  if (!changes_) return;
  alignas(inotify_event) std::array<char, 4096> events;
  for (;;) {
    const ssize_t got = ::read(changes_.get(), events.data(), events.size());
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return;
    for (std::size_t at = 0; at < static_cast<std::size_t>(got);) {
      inotify_event event{};
      std::memcpy(&event, events.data() + at, sizeof event);
      const char* const name = event.len == 0 ? "" : events.data() + at + sizeof event;
      TakeChange(event.wd, event.mask, name);
      at += sizeof event + event.len;
    }
    // Where one more would have had room, there was none.
    if (static_cast<std::size_t>(got) + kLargestEvent <= events.size()) return;
  }
}

void FolderNames::TakeChange(int watch, std::uint32_t what, const char* name) {
  if ((what & IN_Q_OVERFLOW) != 0) return ForgetAll();
  const auto watched = watches_.find(watch);
  if (watched == watches_.end()) return;
  if ((what & IN_IGNORED) != 0) {  // the folder is gone
    folders_.erase(watched->second);
    watches_.erase(watched);
    return;
  }
  std::u16string text;
  if (!FromHostText(name, text) || !ValidName(text)) return;
  std::vector<std::u16string>& names = folders_[watched->second].names[FoldCase(text)];
  if ((what & kAppears) != 0) {
    AddOnce(names, std::move(text));
  } else if ((what & kVanishes) != 0) {
    names.erase(std::remove(names.begin(), names.end(), text), names.end());
  }
}

void FolderNames::ForgetAll() {
  for (const auto& [watch, key] : watches_) ::inotify_rm_watch(changes_.get(), watch);
  watches_.clear();
  folders_.clear();
}

}  // namespace sim
