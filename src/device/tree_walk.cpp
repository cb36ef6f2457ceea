#include "device/tree_walk.h"

#include <utility>

namespace device {
namespace {

/// The platform's own entries for a folder and its parent, which not every platform lists.
bool IsDotName(base::WideView name) noexcept {
  return name == TEXT(".") || name == TEXT("..");
}

}  // namespace

bool TreeWalk::Begin(const WCHAR* pattern, base::WideView prefix) noexcept {
  while (depth_ > 0) levels_[--depth_].search.Reset();
  if (prefix.empty() || !path_.Assign(prefix)) return false;
  Level& level = levels_[depth_++];
  level.prefix = prefix.size();
  Search(level, pattern);
  return true;
}

void TreeWalk::Search(Level& level, const WCHAR* pattern) noexcept {
  level.search.Reset(FindFirstFileW(pattern, &found_));
  unseen_ = static_cast<bool>(level.search);
}

bool TreeWalk::Advance(Level& level) noexcept {
  if (!level.search) return false;
  return std::exchange(unseen_, false) || FindNextFileW(level.search.get(), &found_) != 0;
}

TreeWalk::Step TreeWalk::Next() noexcept {
  while (depth_ > 0) {
    Level& level = levels_[depth_ - 1];
    if (!Advance(level)) {
      level.search.Reset();  // a folder that is being searched cannot be removed
      CutPath(level.prefix - 1);
      --depth_;
      return Step::kEndOfFolder;
    }
    found_.cFileName[MAX_PATH - 1] = 0;
    const base::WideView name = found_.cFileName;
    CutPath(level.prefix);
    if (name.empty() || IsDotName(name) || !path_.Append(name)) continue;
    const bool is_folder = (found_.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
    return is_folder ? Step::kFolder : Step::kFile;
  }
  return Step::kEnd;
}

void TreeWalk::Enter() noexcept {
  const std::size_t length = path_.size();
  Level& level = levels_[depth_++];
  level.prefix = length + 1;
  if (path_.Append(TEXT("\\*.*"))) {
    Search(level, path_.c_str());
  } else {
    CutPath(length);
  }
}

}  // namespace device
