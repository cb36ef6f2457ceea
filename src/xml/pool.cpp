#include "xml/pool.h"

#include <coredll.h>

#include <new>

namespace xml {

// Growth follows the size of the block in hand, so that a document of any size takes few blocks and
// the chain that is searched for room stays short.
std::size_t Pool::NextCapacity() const noexcept {
  if (head_ == nullptr) return kGranule;
  const std::size_t capacity = head_->capacity;
  return head_->next == nullptr ? capacity / 2 : capacity + capacity / 2;
}

void* Pool::TakeElsewhere(std::size_t size) noexcept {
  for (Block* block = head_; block != nullptr; block = block->next) {
    if (block->capacity - block->used >= size) return Cut(*block, size);
  }
  const std::size_t capacity = NextCapacity();
  if (!AddBlock(capacity < size ? size : capacity)) return nullptr;
  return Cut(*head_, size);
}

bool Pool::AddBlock(std::size_t capacity) noexcept {
  if (capacity > kMaxCapacity - sizeof(Block) - kGranule) return false;
  const std::size_t rounded =
      capacity == 0 ? kGranule : (capacity + kGranule - 1) / kGranule * kGranule;
  void* const memory = LocalAlloc(LMEM_FIXED, sizeof(Block) + rounded);
  if (memory == nullptr) return false;
  head_ = new (memory) Block{static_cast<std::uint32_t>(rounded), 0, head_};
  return true;
}

void Pool::Clear() noexcept {
  while (head_ != nullptr) {
    Block* const freeing = head_;
    head_ = freeing->next;
    LocalFree(freeing);
  }
}

std::size_t Pool::MemoryInUse() const noexcept {
  std::size_t bytes = 0;
  for (const Block* block = head_; block != nullptr; block = block->next) {
    bytes += sizeof(Block) + block->capacity;
  }
  return bytes;
}

}  // namespace xml
