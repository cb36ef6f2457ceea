// The files of a job that stay when their folder is emptied.
#pragma once

#include <cstddef>
#include <cstdint>

#include "base/text.h"
#include "device/local_memory.h"
#include "orvenix/pointer_list.h"
#include "upgrade/paths.h"

namespace upgrade {

/// A job's save list, made ready for questions: converted and sorted once, however many files are
/// asked about. Letter case does not count, for all letters that the device knows.
///
/// Better one file too many than one lost: while the list cannot be read whole, every file counts
/// as saved. One thread at a time.
class SavedFiles {
 public:
  explicit SavedFiles(const orvenix::PointerList<char>& paths) noexcept;

  /// Whether the list has been read whole.
  [[nodiscard]] bool known() const noexcept { return known_; }

  /// @param path  whole, of at most 259 characters; left in lower case
  /// @return whether the file stays.
  bool Contains(base::WideFixedText<kPathSize>& path) const noexcept;

 private:
  struct Entry {
    std::uint32_t start = 0;  ///< in `units_`
    std::uint32_t size = 0;   ///< units
  };

  bool Read(const orvenix::PointerList<char>& paths) noexcept;
  bool Allocate(const orvenix::PointerList<char>& paths) noexcept;
  [[nodiscard]] base::WideView TextOf(const Entry& entry) const noexcept;

  device::LocalBlock<Entry> entries_;  ///< in the order of their texts
  std::size_t size_ = 0;
  device::LocalBlock<base::WideChar> units_;  ///< the texts in lower case, one behind the other
  std::size_t capacity_ = 0;                  ///< of `units_`
  bool known_ = false;
};

}  // namespace upgrade
