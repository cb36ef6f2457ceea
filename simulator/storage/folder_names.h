// Finding a name in a folder of the host without regard to case, also among thousands of others.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "storage/host_folder.h"
#include "storage/unique_fd.h"

namespace sim {

/// A name that is missing in its own spelling is looked for in the whole folder. The names of large
/// folders are kept for that, and the host tells of every change to them before the call that made
/// it returns, whoever made it; where the host cannot, the folder is read each time. For one thread
/// at a time.
class FolderNames {
 public:
  /// The entry that the device means by `name`: the same spelling if there is one, otherwise the
  /// first, in sorted order, that differs in letter case only.
  [[nodiscard]] std::optional<HostEntry> Find(int folder, std::u16string_view name);

  /// Folders whose names are kept.
  [[nodiscard]] std::size_t kept() const { return folders_.size(); }

 private:
  using Key = std::pair<std::uint64_t, std::uint64_t>;  ///< device and inode of the host
  struct Folder {
    int watch = -1;
    std::unordered_map<std::u16string, std::vector<std::u16string>> names;  ///< by folded name
  };

  [[nodiscard]] std::vector<std::u16string> Alike(int folder, std::u16string_view name);
  Folder* Keep(int folder, const Key& key);
  void TakeChanges();
  void TakeChange(int watch, std::uint32_t what, const char* name);
  void ForgetAll();

  UniqueFd changes_;  ///< of the host, made for the first large folder
  std::map<Key, Folder> folders_;
  std::map<int, Key> watches_;
};

}  // namespace sim
