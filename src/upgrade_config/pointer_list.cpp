#include "orvenix/pointer_list.h"

#include <coredll.h>

#include <algorithm>
#include <cstring>
#include <functional>
#include <utility>

namespace orvenix {
namespace {

constexpr std::uint32_t kFirstCapacity = 8;

void** AllocateItems(std::uint32_t capacity) noexcept {
  return static_cast<void**>(LocalAlloc(LMEM_FIXED, capacity * sizeof(void*)));
}

}  // namespace

PointerArray::PointerArray(const PointerArray& other) noexcept {
  if (other.size_ == 0) return;
  items_ = AllocateItems(other.size_);
  if (items_ == nullptr) return;
  std::memcpy(items_, other.items_, other.size_ * sizeof(void*));
  size_ = other.size_;
  capacity_ = other.size_;
}

PointerArray& PointerArray::operator=(const PointerArray& other) noexcept {
  PointerArray copy(other);  // before the release: `other` may be this array
  std::swap(items_, copy.items_);
  std::swap(size_, copy.size_);
  std::swap(capacity_, copy.capacity_);
  return *this;
}

PointerArray::~PointerArray() {
  Release();
}

bool PointerArray::Append(void* pointer) noexcept {
  if (size_ == capacity_) {
    const std::uint32_t capacity = capacity_ == 0 ? kFirstCapacity : capacity_ * 2;
    void** const larger = AllocateItems(capacity);
    if (larger == nullptr) return false;
    if (size_ > 0) std::memcpy(larger, items_, size_ * sizeof(void*));
    LocalFree(items_);
    items_ = larger;
    capacity_ = capacity;
  }
  items_[size_++] = pointer;
  return true;
}

void PointerArray::SortAndDropDuplicates() noexcept {
  std::sort(items_, items_ + size_, std::less<>());
  void** const end = std::unique(items_, items_ + size_);
  void** const kept = std::remove(items_, end, nullptr);
  size_ = static_cast<std::uint32_t>(kept - items_);
}

void PointerArray::Release() noexcept {
  if (items_ != nullptr) LocalFree(items_);
  items_ = nullptr;
  size_ = 0;
  capacity_ = 0;
}

}  // namespace orvenix
