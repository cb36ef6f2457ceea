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
