// Memory that grows in blocks and is given back as a whole.
#pragma once

#include <cstddef>
#include <cstdint>

namespace xml {

/// A chain of blocks from LocalAlloc, from which pieces are cut and never given back singly.
///
/// Not zeroed. One thread at a time.
class Pool {
 public:
  /// Sizes of blocks are multiples of it.
  static constexpr std::size_t kGranule = 256;
  /// The largest block; more than a device has.
  static constexpr std::size_t kMaxCapacity = std::size_t{1} << 31U;

  Pool() noexcept = default;
  ~Pool() { Clear(); }
  Pool(const Pool&) = delete;
  Pool& operator=(const Pool&) = delete;

  /// Cuts `size` bytes from the first block that has room for them, or from a new one at the head
  /// of the chain. Pieces are aligned for records as long as all sizes asked for are multiples of
  /// a record's alignment.
  /// @return null when there is no memory.
  [[nodiscard]] void* Take(std::size_t size) noexcept {
    if (head_ != nullptr && head_->capacity - head_->used >= size) return Cut(*head_, size);
    return TakeElsewhere(size);
  }

  /// Puts a new block with room for `capacity` bytes at the head of the chain.
  /// @return false when there is no memory.
  [[nodiscard]] bool AddBlock(std::size_t capacity) noexcept;

  /// Frees all blocks, and so all pieces.
  void Clear() noexcept;

  /// What all blocks take of the heap, in bytes, headers included.
  [[nodiscard]] std::size_t MemoryInUse() const noexcept;

 private:
  /// What a block begins with; its data follow.
  struct Block {
    std::uint32_t capacity;  ///< bytes of data
    std::uint32_t used;      ///< bytes of them that are given out, from the front
    Block* next;
  };
  static_assert(sizeof(Block) % alignof(void*) == 0, "the data behind it are aligned for records");

  static void* Cut(Block& block, std::size_t size) noexcept {
    char* const piece = static_cast<char*>(static_cast<void*>(&block + 1)) + block.used;
    block.used += static_cast<std::uint32_t>(size);
    return piece;
  }
  [[nodiscard]] void* TakeElsewhere(std::size_t size) noexcept;
  [[nodiscard]] std::size_t NextCapacity() const noexcept;

  Block* head_ = nullptr;
};

}  // namespace xml
