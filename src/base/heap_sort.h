// Sorting in place, for a library without a run time to bring a sort along.
#pragma once

#include <cstddef>
#include <utility>

namespace base {
namespace internal {

/// Lets the item at `from` sink to its place in the heap of `size` items.
template <typename Item, typename Less>
void Sink(Item* items, std::size_t from, std::size_t size, const Less& less) noexcept {
  for (std::size_t child = 2 * from + 1; child < size; child = 2 * from + 1) {
    if (child + 1 < size && less(items[child], items[child + 1])) ++child;
    if (!less(items[from], items[child])) return;
    std::swap(items[from], items[child]);
    from = child;
  }
}

}  // namespace internal

/// Puts the items in the order of `less`; equal ones in any order. Takes no memory, and no order in
/// which a stranger could hand the items over makes it slow.
template <typename Item, typename Less>
void HeapSort(Item* items, std::size_t size, const Less& less) noexcept {
  for (std::size_t at = size / 2; at-- > 0;) internal::Sink(items, at, size, less);
  for (std::size_t left = size; left-- > 1;) {
    std::swap(items[0], items[left]);
    internal::Sink(items, 0, left, less);
  }
}

}  // namespace base
