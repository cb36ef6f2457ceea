#include "upgrade/cleanup.h"

#include <coredll.h>

#include "device/file.h"
#include "device/tree_walk.h"
#include "device/wide_text.h"
#include "upgrade/paths.h"

namespace upgrade {
namespace {

using Step = device::TreeWalk::Step;
using WidePath = device::WideText<kPathSize>;

// What these bits mean on the device; other platforms' headers have other names for them.
constexpr DWORD kInRom = 0x40;
constexpr DWORD kMountedVolume = 0x100;
constexpr DWORD kProtecting =
    FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM | kMountedVolume;

/// Attributes are cleared only when they are in the way, unlike by File::DeleteFile: a file that
/// stays for another reason keeps them.
void DeleteOneFile(const WCHAR* path) noexcept {
  if (DeleteFileW(path) != 0) return;
  const DWORD mask = GetFileAttributesW(path);
  if (mask == INVALID_FILE_ATTRIBUTES || (mask & FILE_ATTRIBUTE_DIRECTORY) != 0 ||
      (mask & FILE_ATTRIBUTE_READONLY) == 0) {
    return;
  }
  SetFileAttributesW(path, mask & ~kProtecting);
  DeleteFileW(path);
}

bool HasDot(base::WideView text) noexcept {
  return text.find(TEXT('.')) != base::WideView::npos;
}

void ToLowerCase(WidePath& path) noexcept {
  CharLowerBuffW(path.data(), static_cast<DWORD>(path.size()));
}

/// The name of the folder in which this device keeps its flash files.
const char* FlashStoreName(const UpgradeConfig& job) noexcept {
  if (job.GetFlashFileStore()[0] != '\0') return job.GetFlashFileStore();
  const bool is_tq = job.GetType()[0] == 'T' && job.GetFamily()[0] == 'Q';
  return is_tq ? "TQ_FFS" : "Flash File Store";
}

/// Empties one folder of the delete list. About 6 KiB large.
class FolderCleaner : public device::OnLocalHeap {
 public:
  explicit FolderCleaner(const UpgradeConfig& job) noexcept
      : job_(job), flash_store_known_(flash_store_.Assign(FlashStoreName(job))) {}

  void Empty(const WidePath& folder) noexcept {
    if (!Begin(folder)) return;
    for (Step step = walk_.Next(); step != Step::kEnd; step = walk_.Next()) {
      if (step == Step::kFile && IsToBeDeleted()) DeleteOneFile(walk_.path());
      if (step == Step::kFolder && IsToBeEmptied()) walk_.Enter();
    }
  }

 private:
  /// @return false when the folder's name leaves no room for what could lie in it.
  bool Begin(const WidePath& folder) noexcept {
    const bool closed = folder.view().back() == TEXT('\\');
    WidePath pattern = folder;
    if (!pattern.Append(closed ? TEXT("*.*") : TEXT("\\*.*"))) return false;
    // KEPT ODDITY: but for the root, a folder named with a backslash at its end gets one more
    // before the names of its files, so that no entry of the save list is equal to them.
    WidePath prefix = folder;
    if (folder.view() != TEXT("\\") && !prefix.Append(TEXT("\\"))) return false;
    return walk_.Begin(pattern.c_str(), prefix.view());
  }

  bool IsToBeDeleted() noexcept {
    return (walk_.found().dwFileAttributes & kInRom) == 0 && !IsSaved();
  }

  /// Whether the file that was found is on the save list.
  bool IsSaved() noexcept {
    if (job_.FilesToSave().incomplete()) return true;
    path_.Assign(base::WideView(walk_.path()));
    ToLowerCase(path_);
    const std::size_t length = path_.size();
    for (const char* saved : job_.FilesToSave()) {
      const std::string_view text = base::View(saved);
      // Too long for a path, or too short for this one: an 8-bit text is never the shorter of the
      // two.
      if (text.size() >= kPathSize || text.size() < length) continue;
      if (!saved_.Assign(text)) return true;  // unreadable: better one file too many than one lost
      ToLowerCase(saved_);
      if (saved_.view() == path_.view()) return true;
    }
    return false;
  }

  bool IsToBeEmptied() const noexcept {
    const base::WideView name = walk_.found().cFileName;
    if (HasDot(name)) return false;
    if ((walk_.found().dwFileAttributes & kMountedVolume) == 0) return true;
    return flash_store_known_ && base::StartsWith(name, flash_store_.view());
  }

  const UpgradeConfig& job_;
  device::TreeWalk walk_;
  WidePath flash_store_;
  bool flash_store_known_;  ///< without the name no volume is touched
  WidePath path_;           ///< of the file that was found, in lower case
  WidePath saved_;          ///< an entry of the save list, in lower case
};

}  // namespace

void DeletePath(const char* path, const UpgradeConfig& job) noexcept {
  WidePath wide;
  if (!wide.Assign(path) || wide.empty()) return;
  if (HasDot(wide.view())) {
    if (device::File().Exists(path)) DeleteOneFile(wide.c_str());
    return;
  }
  const device::LocalObject<FolderCleaner> cleaner(new FolderCleaner(job));
  if (cleaner) cleaner->Empty(wide);
}

void CleanUpDevice(const UpgradeConfig& job) noexcept {
  {
    device::File programs;
    for (const char* name : job.ProcessesToStop()) programs.StopProcess(name);
  }
  for (const char* path : job.FilesToDelete()) DeletePath(path, job);
}

}  // namespace upgrade
