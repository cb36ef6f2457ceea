#include "orvenix/pointer_list.h"

#include <coredll.h>

#include <cstring>
#include <utility>

#include "base/heap_sort.h"

namespace orvenix {
namespace {

constexpr std::uint32_t kFirstCapacity = 8;

void** AllocateItems(std::uint32_t capacity) noexcept {
  return static_cast<void**>(LocalAlloc(LMEM_FIXED, capacity * sizeof(void*)));
}

std::uintptr_t Address(const void* pointer) noexcept {
  return reinterpret_cast<std::uintptr_t>(pointer);
}

}  // namespace

PointerArray::PointerArray(const PointerArray& other) noexcept : incomplete_(other.incomplete_) {
  if (other.size_ == 0) return;
  items_ = AllocateItems(other.size_);
  if (items_ == nullptr) {
    NoteMissing();
    return;
  }
  std::memcpy(items_, other.items_, other.size_ * sizeof(void*));
  size_ = other.size_;
  capacity_ = other.size_;
}

PointerArray& PointerArray::operator=(const PointerArray& other) noexcept {
  PointerArray copy(other);  // before the release: `other` may be this array
  std::swap(items_, copy.items_);
  std::swap(size_, copy.size_);
  std::swap(capacity_, copy.capacity_);
  std::swap(incomplete_, copy.incomplete_);
  return *this;
}

PointerArray::~PointerArray() {
  Release();
}

bool PointerArray::Append(void* pointer) noexcept {
  if (size_ == capacity_) {
    const std::uint32_t capacity = capacity_ == 0 ? kFirstCapacity : capacity_ * 2;
    void** const larger = AllocateItems(capacity);
    if (larger == nullptr) {
      NoteMissing();
      return false;
    }
    if (size_ > 0) std::memcpy(larger, items_, size_ * sizeof(void*));
    LocalFree(items_);
    items_ = larger;
    capacity_ = capacity;
  }
  items_[size_++] = pointer;
  return true;
}

void PointerArray::SortAndDropDuplicates() noexcept {
  base::HeapSort(items_, size_,
                 [](const void* a, const void* b) { return Address(a) < Address(b); });
  const void* previous = nullptr;  // sorts before all others, so nulls drop out too
  std::uint32_t kept = 0;
  for (std::uint32_t i = 0; i < size_; ++i) {
    if (items_[i] == previous) continue;
    previous = items_[i];
    items_[kept++] = items_[i];
  }
  size_ = kept;
}

void PointerArray::Release() noexcept {
  if (items_ != nullptr) LocalFree(items_);
  items_ = nullptr;
  size_ = 0;
  capacity_ = 0;
  incomplete_ = false;
}

}  // namespace orvenix
