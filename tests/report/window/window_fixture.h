// A device whose process has the progress window.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "faults/faults.h"
#include "kernel/debug.h"
#include "kernel/handle_table.h"
#include "memory/memory.h"
#include "support/device_test.h"
#include "window/progress_view.h"
#include "window/screen.h"
// Last: the platform's header renames some of the build machine's names.
#include "report/window/progress_window.h"
#include "report/window/window_state.h"

namespace report {

inline sim::Profile ProfileWithScreen(int width, int height) {
  sim::Profile profile;
  profile.screen_width = width;
  profile.screen_height = height;
  return profile;
}

inline void ExpectArea(const RECT& actual, const RECT& expected, const char* what) {
  EXPECT_EQ(actual.left, expected.left) << what;
  EXPECT_EQ(actual.top, expected.top) << what;
  EXPECT_EQ(actual.right, expected.right) << what;
  EXPECT_EQ(actual.bottom, expected.bottom) << what;
}

/// The window's state lives as long as its process: every test begins with that of a new one.
inline void BecomeANewProcess() {
  window_state.line_capacity.set(kLineCapacity);
  window_state.characters_per_line.set(0);
  window_state.line_pitch.set(0);
  window_state.small_screen.set(false);
  window_state.bar_units.set(kBarUnits);
  window_state.caption_shown.set(1);
  window_state.caption.Set({});
  window_state.lines.Clear();
}

class ProgressWindowTest : public DeviceTest {
 protected:
  explicit ProgressWindowTest(sim::Profile profile = {},
                              test::WorldKind world = test::WorldKind::kVirtual)
      : DeviceTest(world, std::move(profile)) {
    BecomeANewProcess();
  }
  ~ProgressWindowTest() override { CloseProgressWindow(); }

  /// Starts the window and lets it paint.
  void Start(int show_command = SW_SHOWNORMAL) {
    const GuiStart start = {nullptr, show_command};
    StartGUI(&start);
    Settle();
  }

  /// Lets the window's thread do everything that is to be done.
  static void Settle() { Sleep(1); }

  [[nodiscard]] std::size_t OpenHandles() {
    const auto lock = world().Acquire();
    return device().handles().open_handles();
  }
  [[nodiscard]] sim::Screen& screen() { return device().screen(); }
  [[nodiscard]] sim::ProgressView view() { return ReadProgress(screen()).value(); }
  [[nodiscard]] std::vector<sim::Drawn> shown() {
    return screen().Shown(window_state.window.get());
  }
};

class SmallProgressWindowTest : public ProgressWindowTest {
 protected:
  SmallProgressWindowTest() : ProgressWindowTest(ProfileWithScreen(240, 319)) {}
};

}  // namespace report
