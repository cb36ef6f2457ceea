// Memory that the flash driver reaches: it is told addresses in 32 bits.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

namespace device {

/// Pages that lie below 4 GiB, kept from one use to the next and made larger when more is needed.
/// Where pointers have 32 bits themselves nobody needs one. Zero memory is an empty buffer.
class LowBuffer {
 public:
  /// @return at least `size` bytes, null when there are none below 4 GiB. Their content is whatever
  ///   the last user left.
  [[nodiscard]] std::uint8_t* Reserve(std::size_t size) noexcept {
    if (size == 0) size = 1;
    if (size <= size_) return bytes_;
    Free();
    void* const pages = VirtualAlloc(nullptr, size, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE);
    if (pages == nullptr) return nullptr;
    constexpr std::uint64_t kEnd = std::uint64_t{1} << 32U;
    if (std::uint64_t{reinterpret_cast<std::uintptr_t>(pages)} + size > kEnd) {
      VirtualFree(pages, 0, MEM_RELEASE);
      return nullptr;
    }
    bytes_ = static_cast<std::uint8_t*>(pages);
    size_ = size;
    return bytes_;
  }

  void Free() noexcept {
    if (bytes_ != nullptr) VirtualFree(bytes_, 0, MEM_RELEASE);
    bytes_ = nullptr;
    size_ = 0;
  }

 private:
  std::uint8_t* bytes_ = nullptr;
  std::size_t size_ = 0;
};

}  // namespace device
