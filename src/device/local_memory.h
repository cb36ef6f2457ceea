// Memory from the platform's local heap, the only heap that the library uses.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <new>
#include <type_traits>
#include <utility>

namespace device {

/// Owns a LocalAlloc block of plain records; empty when there was no memory.
template <typename T>
class [[nodiscard]] LocalBlock {
  static_assert(std::is_trivially_destructible_v<T>, "the block is freed, never destroyed");

 public:
  LocalBlock() noexcept = default;
  /// Takes over a block that LocalAlloc gave.
  explicit LocalBlock(T* block) noexcept : block_(block) {}
  ~LocalBlock() { Reset(); }
  LocalBlock(LocalBlock&& other) noexcept : block_(other.Release()) {}
  LocalBlock& operator=(LocalBlock&& other) noexcept {
    if (this != &other) Reset(other.Release());
    return *this;
  }

  /// Room for `count` records, all zero. Empty when there is no memory for them.
  static LocalBlock Allocate(std::size_t count = 1) noexcept {
    if (count > static_cast<std::size_t>(0x7FFFFFFF) / sizeof(T)) return LocalBlock();
    return LocalBlock(static_cast<T*>(LocalAlloc(LPTR, count * sizeof(T))));
  }

  [[nodiscard]] explicit operator bool() const noexcept { return block_ != nullptr; }
  [[nodiscard]] T* get() const noexcept { return block_; }
  T* operator->() const noexcept { return block_; }
  T& operator*() const noexcept { return *block_; }
  T& operator[](std::size_t index) const noexcept { return block_[index]; }

  void Reset(T* block = nullptr) noexcept {
    T* freeing = std::exchange(block_, block);
    if (freeing != nullptr) LocalFree(freeing);
  }
  /// Gives the block up: whoever takes it frees it with LocalFree.
  [[nodiscard]] T* Release() noexcept { return std::exchange(block_, nullptr); }

 private:
  T* block_ = nullptr;
};

/// Base of classes that are made with `new`: their objects come from LocalAlloc, and `new` gives
/// null when there is no memory.
class OnLocalHeap {
 public:
  static void* operator new(std::size_t size) noexcept { return LocalAlloc(LPTR, size); }
  static void* operator new(std::size_t, void* place) noexcept { return place; }
  static void operator delete(void* object) noexcept {
    if (object != nullptr) LocalFree(object);
  }
  static void operator delete(void*, void*) noexcept {}

 protected:
  OnLocalHeap() noexcept = default;
  ~OnLocalHeap() = default;
};

/// Owns one object made with `new` on the local heap; may be empty.
template <typename T>
class [[nodiscard]] LocalObject {
 public:
  LocalObject() noexcept = default;
  explicit LocalObject(T* object) noexcept : object_(object) {}
  ~LocalObject() { Reset(); }
  LocalObject(LocalObject&& other) noexcept : object_(other.Release()) {}
  LocalObject& operator=(LocalObject&& other) noexcept {
    if (this != &other) Reset(other.Release());
    return *this;
  }

  [[nodiscard]] explicit operator bool() const noexcept { return object_ != nullptr; }
  [[nodiscard]] T* get() const noexcept { return object_; }
  T* operator->() const noexcept { return object_; }
  T& operator*() const noexcept { return *object_; }

  void Reset(T* object = nullptr) noexcept { delete std::exchange(object_, object); }
  [[nodiscard]] T* Release() noexcept { return std::exchange(object_, nullptr); }

 private:
  T* object_ = nullptr;
};

}  // namespace device
