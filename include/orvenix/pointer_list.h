// The lists of an UpgradeConfig, as its callers see them.
#pragma once

#include <cstddef>
#include <cstdint>

class UpgradeConfig;

namespace orvenix {

struct ListKeeper;  // the library's own hand on a list

/// A growable array of pointers whose storage comes from LocalAlloc. Owns the array, never what the
/// pointers point to. Only the library makes, copies and changes one.
class PointerArray {
 protected:
  PointerArray() noexcept = default;
  PointerArray(const PointerArray& other) noexcept;
  PointerArray& operator=(const PointerArray& other) noexcept;
  ~PointerArray();

  /// @return false, with the array as it was but for being incomplete, when there is no memory.
  bool Append(void* pointer) noexcept;
  /// Notes that a pointer which belongs here could not be made.
  void NoteMissing() noexcept { incomplete_ = true; }
  /// Puts the pointers in the order of their addresses, each once and without nulls.
  void SortAndDropDuplicates() noexcept;
  void Release() noexcept;

  void** items_ = nullptr;
  std::uint32_t size_ = 0;
  std::uint32_t capacity_ = 0;
  bool incomplete_ = false;
};

/// A list of pointers to T in the order in which they were added. What it points to belongs to the
/// UpgradeConfig that holds it, and lives as long. Read by one thread at a time.
template <typename T>
class PointerList : private PointerArray {
 public:
  class Iterator {
   public:
    explicit Iterator(void* const* at) noexcept : at_(at) {}
    T* operator*() const noexcept { return static_cast<T*>(*at_); }
    Iterator& operator++() noexcept {
      ++at_;
      return *this;
    }
    bool operator!=(const Iterator& other) const noexcept { return at_ != other.at_; }

   private:
    void* const* at_;
  };

  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] bool empty() const noexcept { return size_ == 0; }
  /// Whether something that was added, or was in the list that this one is a copy of, is not here
  /// for want of memory.
  [[nodiscard]] bool incomplete() const noexcept { return incomplete_; }
  /// @param index  below size()
  [[nodiscard]] T* operator[](std::size_t index) const noexcept {
    return static_cast<T*>(items_[index]);
  }
  [[nodiscard]] Iterator begin() const noexcept { return Iterator(items_); }
  [[nodiscard]] Iterator end() const noexcept { return Iterator(items_ + size_); }

 private:
  friend class ::UpgradeConfig;
  friend struct ListKeeper;
  PointerList() noexcept = default;
  PointerList(const PointerList& other) noexcept = default;
  PointerList& operator=(const PointerList& other) noexcept = default;
  ~PointerList() = default;
};

}  // namespace orvenix
