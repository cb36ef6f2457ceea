// An amount of room that many may take from: a volume's bytes, program memory.
#pragma once

#include <algorithm>
#include <cstdint>
#include <mutex>

namespace sim {

/// Bytes in use out of a capacity. Any thread; each operation is one step to all others.
class Space {
 public:
  explicit Space(std::uint64_t capacity = 0) : capacity_(capacity) {}

  /// Takes `bytes`. @return false, with nothing taken, when they do not fit.
  [[nodiscard]] bool Reserve(std::uint64_t bytes) {
    const std::lock_guard<std::mutex> hold(mutex_);
    if (used_ > capacity_ || bytes > capacity_ - used_) return false;
    used_ += bytes;
    return true;
  }
  /// Gives `old_bytes` back and takes `new_bytes`, or neither when they do not fit then.
  [[nodiscard]] bool Exchange(std::uint64_t old_bytes, std::uint64_t new_bytes) {
    const std::lock_guard<std::mutex> hold(mutex_);
    const std::uint64_t others = used_ - std::min(old_bytes, used_);
    if (new_bytes > old_bytes && (others > capacity_ || new_bytes > capacity_ - others)) {
      return false;
    }
    used_ = others + new_bytes;
    return true;
  }
  /// Gives back what Reserve took.
  void Release(std::uint64_t bytes) {
    const std::lock_guard<std::mutex> hold(mutex_);
    used_ -= std::min(bytes, used_);
  }
  /// Changes the capacity. @return false, with nothing changed, when it would shrink below what is
  ///   in use; it can always grow.
  [[nodiscard]] bool Resize(std::uint64_t capacity) {
    const std::lock_guard<std::mutex> hold(mutex_);
    if (capacity < capacity_ && capacity < used_) return false;
    capacity_ = capacity;
    return true;
  }
  /// Sets what a fresh count found, which may be above the capacity: then nothing is free.
  void SetUsed(std::uint64_t used) {
    const std::lock_guard<std::mutex> hold(mutex_);
    used_ = used;
  }

  struct Figures {
    std::uint64_t capacity;
    std::uint64_t used;
    [[nodiscard]] std::uint64_t free() const { return used < capacity ? capacity - used : 0; }
  };
  [[nodiscard]] Figures figures() const {
    const std::lock_guard<std::mutex> hold(mutex_);
    return {capacity_, used_};
  }

 private:
  mutable std::mutex mutex_;
  std::uint64_t capacity_;
  std::uint64_t used_ = 0;
};

}  // namespace sim
