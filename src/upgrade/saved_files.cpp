#include "upgrade/saved_files.h"

#include <coredll.h>

#include <string_view>

#include "base/heap_sort.h"
#include "device/wide_text.h"

namespace upgrade {
namespace {

/// As many units as a block of memory can hold on the device.
constexpr std::size_t kMostUnits = 0x3FFFFFFF;

void ToLowerCase(WCHAR* text, std::size_t size) noexcept {
  CharLowerBuffW(text, static_cast<DWORD>(size));
}

}  // namespace

SavedFiles::SavedFiles(const orvenix::PointerList<char>& paths) noexcept
    : known_(!paths.incomplete() && Read(paths)) {}

/// An 8-bit text is never the shorter one of the two: its bytes are room enough.
bool SavedFiles::Allocate(const orvenix::PointerList<char>& paths) noexcept {
  for (const char* path : paths) {
    capacity_ += base::View(path).size() + 1;
    if (capacity_ > kMostUnits) return false;
  }
  entries_ = device::LocalBlock<Entry>::Allocate(paths.size());
  units_ = device::LocalBlock<WCHAR>::Allocate(capacity_);
  return entries_ && units_;
}

bool SavedFiles::Read(const orvenix::PointerList<char>& paths) noexcept {
  if (paths.empty()) return true;
  if (!Allocate(paths)) return false;
  std::uint32_t used = 0;
  for (const char* path : paths) {
    WCHAR* const text = units_.get() + used;
    if (!device::ToWide(base::View(path), text, capacity_ - used)) return false;
    const auto size = static_cast<std::uint32_t>(base::WideView(text).size());
    ToLowerCase(text, size);
    entries_[size_++] = {used, size};
    used += size + 1;
  }
  base::HeapSort(entries_.get(), size_,
                 [this](const Entry& a, const Entry& b) { return TextOf(a) < TextOf(b); });
  return true;
}

base::WideView SavedFiles::TextOf(const Entry& entry) const noexcept {
  return {units_.get() + entry.start, entry.size};
}

bool SavedFiles::Contains(base::WideFixedText<kPathSize>& path) const noexcept {
  if (!known_) return true;
  ToLowerCase(path.data(), path.size());
  const base::WideView wanted = path.view();
  std::size_t first = 0;
  for (std::size_t end = size_; first < end;) {
    const std::size_t middle = first + (end - first) / 2;
    const base::WideView text = TextOf(entries_[middle]);
    if (text == wanted) return true;
    if (text < wanted) {
      first = middle + 1;
    } else {
      end = middle;
    }
  }
  return false;
}

}  // namespace upgrade
