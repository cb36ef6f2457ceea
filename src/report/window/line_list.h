// The status lines that the progress window shows.
#pragma once

#include <coredll.h>

#include <string_view>

#include "base/text.h"
#include "device/lock.h"

namespace report {

/// The newest status lines, oldest first, each in a LocalAlloc block of its own. Any thread.
class LineList {
 public:
  static constexpr int kMaxLines = 16;
  /// Room for the longest line there is, and the terminating zero.
  using Line = base::WideFixedText<172>;

  struct Added {
    bool oldest_left = false;  ///< the list was full
    bool stored = false;       ///< false: no memory for the line
  };

  /// Adds `text` (the device's code page) at the end. When the list is full, which is at
  /// `capacity` lines (1 to kMaxLines), the oldest line leaves, whether or not there is memory for
  /// the new one.
  Added Add(std::string_view text, int capacity) noexcept;

  /// Frees all lines.
  void Clear() noexcept;

  /// Copies line `index`, counted from the oldest, for drawing. @return false when there is none.
  bool Copy(int index, Line& line) noexcept;

 private:
  device::Lock lock_;
  int count_ = 0;
  WCHAR* lines_[kMaxLines] = {};
};

}  // namespace report
