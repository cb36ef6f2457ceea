#include "upgrade/paths.h"

#include "base/text.h"
#include "device/file.h"

namespace upgrade {
namespace {

bool Create(device::File& files, std::string_view folder) noexcept {
  return files.CreateDirectory(PathText(folder).c_str());
}

bool ExistsOrCreated(device::File& files, std::string_view folder) noexcept {
  return files.GetAttributes(PathText(folder).c_str()) != INVALID_FILE_ATTRIBUTES ||
         Create(files, folder);
}

}  // namespace

// Climbs until a folder is there or can be made, then makes the ones below it. A loop, because the
// depth of a path from a list file is the list's choice.
void CreateFolderOf(std::string_view path) noexcept {
  const std::string_view whole = FolderOf(base::Part(path, 0, kPathSize - 1));
  device::File files;
  std::string_view there = whole;
  while (!there.empty() && there != "\\" && !ExistsOrCreated(files, there)) {
    there = FolderOf(there);
  }
  while (there.size() < whole.size()) {
    const std::size_t next = whole.find('\\', there.size() + 1);
    there = base::Part(whole, 0, next);
    static_cast<void>(Create(files, there));  // the next level tells by itself
  }
}

}  // namespace upgrade
