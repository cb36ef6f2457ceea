// Removing a folder with all it holds.
#include "device/file.h"
#include "device/tree_walk.h"

namespace device {
namespace {

using Step = TreeWalk::Step;

void RemoveFile(const WCHAR* path) noexcept {
  SetFileAttributesW(path, FILE_ATTRIBUTE_NORMAL);
  DeleteFileW(path);
}

bool RemoveFolder(const WCHAR* path) noexcept {
  SetFileAttributesW(path, FILE_ATTRIBUTE_NORMAL);
  return RemoveDirectoryW(path) != 0;
}

/// @return whether the first folder is gone, which is what the walk comes to last.
bool RemoveAll(TreeWalk& walk) noexcept {
  bool removed = false;
  for (Step step = walk.Next(); step != Step::kEnd; step = walk.Next()) {
    if (step == Step::kFile) RemoveFile(walk.path());
    if (step == Step::kFolder) walk.Enter();
    if (step == Step::kEndOfFolder) removed = RemoveFolder(walk.path());
  }
  return removed;
}

}  // namespace

bool File::RemoveDirectoryTree(const char* pattern) noexcept {
  WideText<kNameSize> wide;
  if (!wide.Assign(pattern)) return false;
  const std::size_t star = wide.view().find(TEXT('*'));
  if (star == base::WideView::npos || star == 0) return false;
  const LocalObject<TreeWalk> walk(new TreeWalk);
  if (!walk) return Note(false);
  const base::WideView prefix(wide.c_str(), star);
  return Note(walk->Begin(wide.c_str(), prefix) && RemoveAll(*walk));
}

}  // namespace device
