// Removing a folder with all it holds.
#include <cstring>

#include "base/format.h"
#include "device/file.h"

namespace device {
namespace {

/// Room for a path one longer than the longest valid one, so that a path that does not fit is seen
/// as too long instead of being cut into another valid one.
using PathText = base::FixedText<File::kNameSize + 1>;

bool IsDotName(std::string_view name) noexcept {
  return name == "." || name == "..";
}

/// Removes what the search of `walk` has found. A path that does not fit is left alone.
void RemoveFound(File& walk, std::string_view prefix) noexcept {
  PathText path;
  if (IsDotName(walk.found_name()) || !path.Assign(prefix) || !path.Append(walk.found_name())) {
    return;
  }
  if (!walk.IsDirectory(walk.found())) {
    walk.DeleteFile(path.c_str(), nullptr);
    return;
  }
  if (!path.Append("\\*.*")) return;
  // The folder below needs a search of its own, and deep trees must not fill the stack.
  const LocalObject<File> below(new File);
  if (below) below->RemoveDirectoryTree(path.c_str());
}

}  // namespace

bool File::RemoveDirectoryTree(const char* pattern) noexcept {
  const std::string_view text = base::View(pattern);
  const std::size_t star = text.find('*');
  if (star == std::string_view::npos || star == 0) return false;
  const std::string_view prefix = text.substr(0, star);
  for (bool more = FindFirst(pattern); more; more = FindNext()) RemoveFound(*this, prefix);
  FindClose();  // before the removal: a folder that is being searched stays

  PathText folder;
  if (!folder.Assign(prefix.substr(0, prefix.size() - 1))) return false;
  SetAttributes(folder.c_str(), FILE_ATTRIBUTE_NORMAL);
  return Note(RemoveDirectoryW(WideText<kNameSize>(folder.c_str()).c_str()) != 0);
}

}  // namespace device
