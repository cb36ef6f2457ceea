#include "upgrade/cleanup.h"

#include <coredll.h>

#include "device/file.h"
#include "device/tree_walk.h"
#include "device/wide_text.h"
#include "upgrade/paths.h"
#include "upgrade/saved_files.h"

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

/// The name of the folder in which this device keeps its flash files.
const char* FlashStoreName(const UpgradeConfig& job) noexcept {
  if (job.GetFlashFileStore()[0] != '\0') return job.GetFlashFileStore();
  const bool is_tq = job.GetType()[0] == 'T' && job.GetFamily()[0] == 'Q';
  return is_tq ? "TQ_FFS" : "Flash File Store";
}

/// Empties the folders of one job's delete list. About 5 KiB large.
class FolderCleaner : public device::OnLocalHeap {
 public:
  explicit FolderCleaner(const UpgradeConfig& job) noexcept
      : saved_(job.FilesToSave()), flash_store_known_(flash_store_.Assign(FlashStoreName(job))) {}

  void Empty(const WidePath& folder) noexcept {
    if (!saved_.known() || !Begin(folder)) return;
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
    // KEPT ODDITY: paths are put together as the job has them and compared with the save list as
    // they are. A folder named "\Temp\", "\Temp\\Sub", "\\Temp" or "Temp", or the root as "\\", is
    // found, but the paths of its files are equal to no entry that is written properly.
    WidePath prefix = folder;
    if (folder.view() != TEXT("\\") && !prefix.Append(TEXT("\\"))) return false;
    return walk_.Begin(pattern.c_str(), prefix.view());
  }

  bool IsToBeDeleted() noexcept {
    if ((walk_.found().dwFileAttributes & kInRom) != 0) return false;
    path_.Assign(base::WideView(walk_.path()));
    return !saved_.Contains(path_);
  }

  /// KEPT ODDITY: in the flash file store's name letter case counts, unlike in the save list.
  bool IsToBeEmptied() const noexcept {
    const base::WideView name = walk_.found().cFileName;
    if (HasDot(name)) return false;
    if ((walk_.found().dwFileAttributes & kMountedVolume) == 0) return true;
    return flash_store_known_ && base::StartsWith(name, flash_store_.view());
  }

  const SavedFiles saved_;
  device::TreeWalk walk_;
  WidePath flash_store_;
  bool flash_store_known_;  ///< without the name no volume is touched
  WidePath path_;           ///< of the file that was found
};

/// Deletes entries of one job's delete list. What it takes to empty folders is made for the first
/// one that is.
class Deleter {
 public:
  explicit Deleter(const UpgradeConfig& job) noexcept : job_(job) {}

  void Delete(const char* path) noexcept {
    WidePath wide;
    if (!wide.Assign(path) || wide.empty()) return;
    if (HasDot(wide.view())) {
      if (device::File().Exists(path)) DeleteOneFile(wide.c_str());
      return;
    }
    if (!folders_) folders_.Reset(new FolderCleaner(job_));
    if (folders_) folders_->Empty(wide);
  }

 private:
  const UpgradeConfig& job_;
  device::LocalObject<FolderCleaner> folders_;
};

}  // namespace

void DeletePath(const char* path, const UpgradeConfig& job) noexcept {
  Deleter(job).Delete(path);
}

// KEPT ODDITY: nobody waits for the end of a program that is ended here. What it holds open at that
// moment cannot be deleted, and stays.
void CleanUpDevice(const UpgradeConfig& job) noexcept {
  {
    device::File programs;
    for (const char* name : job.ProcessesToStop()) programs.StopProcess(name);
  }
  Deleter deleter(job);
  for (const char* path : job.FilesToDelete()) deleter.Delete(path);
}

}  // namespace upgrade
