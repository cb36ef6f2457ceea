// A folder and all that lies below it, one entry after the other.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

#include "base/text.h"
#include "device/handle.h"
#include "device/local_memory.h"

namespace device {

/// Walks the tree below a folder in the order in which the platform lists it, as a loop: how deep a
/// tree is decides whoever has filled the device.
///
/// Paths are wide texts throughout, so that a file whose name the device's code page cannot say is
/// not taken for another one. Entries whose path would be longer than 259 characters are passed
/// over. Deleting what was found does not disturb the walk. About 3 KiB large: made with `new`.
/// One thread at a time.
class TreeWalk : public OnLocalHeap {
 public:
  enum class Step : std::uint8_t {
    kFile,
    kFolder,       ///< is passed over unless Enter follows
    kEndOfFolder,  ///< of one that was entered, or of the first one; nothing holds it open any more
    kEnd,
  };

  /// Takes the folder that `pattern` lists, which may be missing or empty; ends an earlier walk.
  /// @param prefix  what stands before the names of its entries, its last character a separator
  /// @return false, with nothing to walk, when the prefix is empty or too long.
  bool Begin(const WCHAR* pattern, base::WideView prefix) noexcept;

  /// Goes on to the next entry.
  Step Next() noexcept;

  /// Lets the walk go on inside the folder that the last step found. One whose entries' paths would
  /// all be too long is at its end at once.
  void Enter() noexcept;

  /// Of the entry, or of the folder that has ended, without a separator behind it.
  [[nodiscard]] const WCHAR* path() const noexcept { return path_.c_str(); }
  /// The entry that the last step found.
  [[nodiscard]] const WIN32_FIND_DATAW& found() const noexcept { return found_; }

 private:
  struct Level {
    SearchHandle search;
    std::size_t prefix = 0;  ///< characters of `path_` that stand before the names
  };
  /// A name and a separator a level, and the first folder: no path has room for more.
  static constexpr std::size_t kMostLevels = MAX_PATH / 2 + 1;

  void Search(Level& level, const WCHAR* pattern) noexcept;
  bool Advance(Level& level) noexcept;
  void CutPath(std::size_t length) noexcept { path_.data()[length] = 0; }

  Level levels_[kMostLevels];
  std::size_t depth_ = 0;
  bool unseen_ = false;  ///< `found_` holds the first entry of the innermost search
  base::WideFixedText<MAX_PATH> path_;
  WIN32_FIND_DATAW found_ = {};
};

}  // namespace device
