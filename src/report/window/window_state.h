// What the progress window's threads share. Constant-initialised: there is nothing to set up and
// nothing to destroy with the library.
#pragma once

#include <coredll.h>

#include <atomic>

#include "base/text.h"
#include "device/lock.h"
#include "report/window/line_list.h"
#include "report/window/progress_window.h"

namespace report {

/// A plain value that any thread may read and write; each stands alone. Relaxed loads and stores
/// are ordinary instructions on every ARM core.
template <typename T>
class Shared {
 public:
  constexpr explicit Shared(T value) noexcept : value_(value) {}
  [[nodiscard]] T get() const noexcept { return value_.load(std::memory_order_relaxed); }
  void set(T value) noexcept { value_.store(value, std::memory_order_relaxed); }

 private:
  std::atomic<T> value_;
};

/// The line that can stand in place of the lower bar.
class CaptionText {
 public:
  using Text = base::WideFixedText<300>;

  void Set(const Text& text) noexcept {
    const device::LockGuard hold(lock_);
    text_.Assign(text.view());
  }
  void Copy(Text& text) noexcept {
    const device::LockGuard hold(lock_);
    text.Assign(text_.view());
  }

 private:
  device::Lock lock_;
  Text text_;
};

inline constexpr int kLineCapacity = LineList::kMaxLines;
inline constexpr int kLineCapacitySmall = 7;
inline constexpr int kBarUnits = 38;
inline constexpr int kBarUnitsSmall = 48;  // more, not fewer: the small bar moves in finer steps

struct WindowState {
  GuiStart start{};  ///< for the window's thread, set before it is created

  Shared<HWND> window{nullptr};
  Shared<HANDLE> thread{nullptr};
  Shared<bool> cannot_be_made{false};  ///< the window's thread has given up

  Shared<int> line_capacity{kLineCapacity};
  Shared<int> characters_per_line{0};  ///< 0: not known before the first paint
  Shared<int> line_pitch{0};           ///< pixels from line to line; 0 before the first paint
  Shared<bool> small_screen{false};
  Shared<int> bar_units{kBarUnits};

  Shared<int> overall_value{0};  ///< bar units
  Shared<int> file_value{0};

  /// The contract's own, inverted sense: 1 shows the lower bar, 0 shows the caption.
  Shared<int> caption_shown{1};
  CaptionText caption;
  LineList lines;
};

/// The process has one progress window.
extern WindowState window_state;  // NOLINT(bugprone-dynamic-static-initializers): it is constant

}  // namespace report
