// How the job record changes its lists.
#pragma once

#include "orvenix/pointer_list.h"

namespace orvenix {

struct ListKeeper {
  /// Lists `element` at the end. When there is no memory for that, `release` gets it, unless the
  /// list holds it already.
  template <typename T, typename Release>
  static void Take(PointerList<T>& list, T* element, Release release) noexcept {
    if (!list.Append(element) && element != nullptr && !Holds(list, element)) release(element);
  }

  /// Lists an element that was made for this list and that nothing else knows yet; looking for it
  /// in a long list would be in vain. When there is no memory, its owner frees it.
  /// @return whether it is listed
  template <typename T, typename Owner>
  static bool TakeNew(PointerList<T>& list, Owner element) noexcept {
    if (!list.Append(element.get())) return false;
    static_cast<void>(element.Release());
    return true;
  }

  /// Notes that an element could not even be made.
  template <typename T>
  static void NoteMissing(PointerList<T>& list) noexcept {
    list.NoteMissing();
  }

  /// Frees every distinct element. A host that ends a group twice has handed the same record over
  /// twice.
  template <typename T, typename Release>
  static void FreeElements(PointerList<T>& list, Release release) noexcept {
    list.SortAndDropDuplicates();
    for (T* element : list) release(element);
  }

  template <typename T>
  [[nodiscard]] static bool Holds(const PointerList<T>& list, const T* element) noexcept {
    for (const T* listed : list) {
      if (listed == element) return true;
    }
    return false;
  }
};

}  // namespace orvenix
