#include "report/window/line_list.h"

#include <cstddef>

namespace report {
namespace {

/// A block of its own for the text, null without memory.
WCHAR* NewLine(std::string_view text) noexcept {
  const std::size_t room = text.size() + 2;
  auto* line = static_cast<WCHAR*>(LocalAlloc(LPTR, room * sizeof(WCHAR)));
  if (line == nullptr || text.empty()) return line;
  // A character needs no more units in UTF-16 than bytes in any code page; the block is zeroed, so
  // the text ends even if nothing can be converted.
  MultiByteToWideChar(CP_ACP, 0, text.data(), static_cast<int>(text.size()), line,
                      static_cast<int>(room) - 1);
  return line;
}

}  // namespace

LineList::Added LineList::Add(std::string_view text, int capacity) noexcept {
  WCHAR* line = NewLine(text);
  WCHAR* oldest = nullptr;
  Added added;
  {
    const device::LockGuard hold(lock_);
    if (count_ > capacity - 1) {
      added.oldest_left = true;
      oldest = lines_[0];
      --count_;
      for (int i = 0; i < count_; ++i) lines_[i] = lines_[i + 1];
    }
    if (line != nullptr) {
      added.stored = true;
      lines_[count_++] = line;
    }
  }
  if (oldest != nullptr) LocalFree(oldest);
  return added;
}

void LineList::Clear() noexcept {
  WCHAR* old[kMaxLines] = {};
  int count = 0;
  {
    const device::LockGuard hold(lock_);
    for (; count < count_; ++count) old[count] = lines_[count];
    count_ = 0;
  }
  for (int i = 0; i < count; ++i) LocalFree(old[i]);
}

bool LineList::Copy(int index, Line& line) noexcept {
  const device::LockGuard hold(lock_);
  if (index < 0 || index >= count_) return false;
  line.Assign(lines_[index]);
  return true;
}

}  // namespace report
