#include "window/screen.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "ce/window.h"
#include "faults/faults.h"
#include "support/device_test.h"
#include "trace/trace.h"
#include "window/progress_view.h"
#include "window/window_system.h"

namespace sim {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

/// What a test's window draws at WM_PAINT.
void (*paint_with)(HDC dc) = nullptr;

LRESULT CALLBACK Procedure(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  if (message != WM_PAINT) return DefWindowProcW(window, message, wparam, lparam);
  PAINTSTRUCT paint = {};
  HDC dc = BeginPaint(window, &paint);
  if (dc != nullptr && paint_with != nullptr) paint_with(dc);
  EndPaint(window, &paint);
  return 0;
}

class ScreenTest : public DeviceTest {
 protected:
  ScreenTest() {
    paint_with = nullptr;
    WNDCLASSW definition = {};
    definition.lpfnWndProc = Procedure;
    definition.lpszClassName = u"Test";
    RegisterClassW(&definition);
  }

  static HWND Window(const RECT& frame, DWORD style = WS_VISIBLE, DWORD extended = 0) {
    return CreateWindowExW(extended, u"Test", u"", style, frame.left, frame.top,
                           frame.right - frame.left, frame.bottom - frame.top, nullptr, nullptr,
                           nullptr, nullptr);
  }
  [[nodiscard]] Screen& screen() { return device().screen(); }
};

void FillAll(HDC dc) {
  Rectangle(dc, 0, 0, 1000, 1000);
}

void WriteAbove(HDC dc) {
  Rectangle(dc, 0, 0, 100, 100);
  ExtTextOutW(dc, 5, 10, 0, nullptr, u"Above", 5, nullptr);
}

void DrawBelow(HDC dc) {
  const POINT line[] = {{5, 60}, {25, 60}};
  Rectangle(dc, 0, 0, 100, 100);
  Polyline(dc, line, 2);
}

TEST_F(ScreenTest, StartsAsAnEmptyDesktopOfTheProfilesSize) {
  const Image picture = screen().Snapshot();

  EXPECT_EQ(picture, Image(240, 320, kDesktopColour));
  EXPECT_THAT(screen().Windows(), IsEmpty());
  EXPECT_EQ(screen().finished_paints(), 0U);
}

TEST_F(ScreenTest, WhatAWindowDoesNotPaintShowsWhatWasThereBefore) {
  HWND window = Window({10, 10, 30, 30}, WS_VISIBLE | WS_BORDER);

  UpdateWindow(window);  // paints nothing

  const Image picture = screen().Snapshot();
  EXPECT_EQ(picture.At(10, 10), kBlack) << "the border";
  EXPECT_EQ(picture.At(29, 29), kBlack);
  EXPECT_EQ(picture.At(11, 11), kDesktopColour);
  EXPECT_EQ(picture.At(30, 30), kDesktopColour);
}

TEST_F(ScreenTest, ClientCoordinatesBeginInsideTheBorder) {
  paint_with = FillAll;
  UpdateWindow(Window({10, 10, 30, 30}, WS_VISIBLE | WS_BORDER));

  const Image picture = screen().Snapshot();
  EXPECT_EQ(picture.At(11, 11), kBlack) << "the rectangle's own edge";
  EXPECT_EQ(picture.At(12, 12), kWhite);
  EXPECT_EQ(picture.At(28, 28), kWhite);
  EXPECT_EQ(picture.At(29, 29), kBlack) << "the border is no client area";
}

TEST_F(ScreenTest, PaintingStaysWithinTheUpdateArea) {
  HWND window = Window({0, 0, 50, 50});
  UpdateWindow(window);
  paint_with = FillAll;
  const RECT area = {10, 20, 30, 40};

  InvalidateRect(window, &area, FALSE);
  UpdateWindow(window);

  const Image picture = screen().Snapshot();
  EXPECT_EQ(picture.At(10, 20), kWhite);
  EXPECT_EQ(picture.At(29, 39), kWhite);
  EXPECT_EQ(picture.At(9, 20), kDesktopColour);
  EXPECT_EQ(picture.At(10, 40), kDesktopColour);
}

TEST_F(ScreenTest, HiddenAndDestroyedWindowsLeaveThePicture) {
  paint_with = FillAll;
  HWND window = Window({0, 0, 50, 50});
  UpdateWindow(window);
  EXPECT_EQ(screen().Snapshot().At(5, 5), kWhite);

  ShowWindow(window, SW_HIDE);
  EXPECT_EQ(screen().Snapshot(), Image(240, 320, kDesktopColour));
  ShowWindow(window, SW_SHOW);
  UpdateWindow(window);
  EXPECT_EQ(screen().Snapshot().At(5, 5), kWhite);
  DestroyWindow(window);
  EXPECT_EQ(screen().Snapshot(), Image(240, 320, kDesktopColour));
}

TEST_F(ScreenTest, TopMostWindowsStayAboveTheOthers) {
  HWND top = Window({0, 0, 20, 20}, WS_VISIBLE, WS_EX_TOPMOST);
  HWND other = Window({0, 0, 40, 40});

  const std::vector<WindowInfo> windows = screen().Windows();

  ASSERT_THAT(windows, SizeIs(2));
  EXPECT_EQ(windows[0].handle, top);
  EXPECT_EQ(windows[1].handle, other);
  EXPECT_TRUE(windows[1].active);
  EXPECT_EQ(windows[0].extended_style, WS_EX_TOPMOST);
}

TEST_F(ScreenTest, TellsEachFinishedPaintWithItsAreaAndCalls) {
  std::vector<FinishedPaint> paints;
  screen().OnPaint([&paints](const FinishedPaint& paint) { paints.push_back(paint); });
  paint_with = WriteAbove;
  HWND window = Window({0, 0, 100, 100});

  UpdateWindow(window);
  const RECT area = {0, 50, 100, 100};
  InvalidateRect(window, &area, FALSE);
  UpdateWindow(window);

  ASSERT_THAT(paints, SizeIs(2));
  EXPECT_EQ(paints[0].number, 1U);
  EXPECT_EQ(paints[0].window, window);
  EXPECT_TRUE(paints[0].erase);
  ASSERT_THAT(paints[0].calls, SizeIs(2));
  EXPECT_EQ(std::get<DrawnText>(paints[0].calls[1]).text, u"Above");
  EXPECT_EQ(paints[1].area.top, 50);
  EXPECT_FALSE(paints[1].erase);
  EXPECT_EQ(screen().finished_paints(), 2U);
}

TEST_F(ScreenTest, RemembersWhatAPartialPaintDidNotTouch) {
  paint_with = WriteAbove;
  HWND window = Window({0, 0, 100, 100});
  UpdateWindow(window);
  paint_with = DrawBelow;
  const RECT below = {0, 50, 100, 100};

  InvalidateRect(window, &below, FALSE);
  UpdateWindow(window);

  const std::vector<Drawn> shown = screen().Shown(window);
  ASSERT_THAT(shown, SizeIs(3));
  EXPECT_EQ(std::get<DrawnText>(shown[0]).text, u"Above") << "from the first paint";
  EXPECT_TRUE(std::holds_alternative<DrawnRectangle>(shown[1]));
  EXPECT_EQ(std::get<DrawnLine>(shown[2]).points[1].x, 25);

  InvalidateRect(window, nullptr, FALSE);
  UpdateWindow(window);
  EXPECT_THAT(screen().Shown(window), SizeIs(2)) << "now everything is from this paint";
}

TEST_F(ScreenTest, SavesEachPaintUnderItsNumber) {
  if (!HavePictures()) GTEST_SKIP() << "this build of the simulator has no pictures";
  const auto pictures = folder() / "screen" / "one";
  screen().SavePaints(pictures);
  paint_with = FillAll;
  HWND window = Window({0, 0, 50, 50});

  UpdateWindow(window);
  InvalidateRect(window, nullptr, FALSE);
  UpdateWindow(window);
  screen().SavePaints({});
  InvalidateRect(window, nullptr, FALSE);
  UpdateWindow(window);

  Image read;
  std::string error;
  ASSERT_TRUE(ReadPng(pictures / "paint-000001.png", read, error)) << error;
  EXPECT_EQ(read, screen().Snapshot());
  EXPECT_TRUE(std::filesystem::exists(pictures / "paint-000002.png"));
  EXPECT_FALSE(std::filesystem::exists(pictures / "paint-000003.png"));
}

TEST_F(ScreenTest, StopsSavingWhenAPictureCannotBeWritten) {
  screen().SavePaints("/dev/null/pictures");
  HWND window = Window({0, 0, 50, 50});

  ::testing::internal::CaptureStderr();
  UpdateWindow(window);
  InvalidateRect(window, nullptr, FALSE);
  UpdateWindow(window);
  const std::string said = ::testing::internal::GetCapturedStderr();

  EXPECT_THAT(said, HasSubstr("/dev/null/pictures/paint-000001.png"));
  EXPECT_EQ(said.find("paint-000002"), std::string::npos) << said;
}

TEST_F(ScreenTest, AMessageBoxIsNotedAndAnsweredAtOnce) {
  EXPECT_EQ(MessageBoxW(nullptr, u"No window", u"Info", MB_OK), IDOK);
  screen().AnswerMessageBoxes([](const ShownMessageBox&) { return 7; });
  EXPECT_EQ(MessageBoxW(nullptr, u"Another", nullptr, MB_OK), 7);

  const std::vector<ShownMessageBox> boxes = screen().MessageBoxes();
  ASSERT_THAT(boxes, SizeIs(2));
  EXPECT_EQ(boxes[0].text, u"No window");
  EXPECT_EQ(boxes[0].caption, u"Info");
}

/// How often a program looks for messages until another of its threads is done, 20 ms later.
int PollsUntilDone(UINT remove) {
  static bool done;  // threads of a virtual world take turns
  done = false;
  const auto finish_later = [](void*) -> DWORD {
    Sleep(20);
    done = true;
    return 0;
  };
  CloseHandle(CreateThread(nullptr, 0, finish_later, nullptr, 0, nullptr));
  MSG message = {};
  int polls = 0;
  for (; !done; ++polls) PeekMessageW(&message, nullptr, 0, 0, remove);
  return polls;
}

TEST_F(ScreenTest, LetsTimePassForAProgramThatPollsForMessages) {
  EXPECT_LE(PollsUntilDone(PM_REMOVE), 20001) << "a microsecond passes with each look";
  EXPECT_LE(PollsUntilDone(PM_NOREMOVE), 20001);
}

TEST_F(ScreenTest, LetsTimePassForAProgramThatPollsAndLeavesWhatItFinds) {
  HWND window = Window({0, 0, 50, 50});
  EXPECT_LE(PollsUntilDone(PM_REMOVE), 20001) << "to be painted, and nobody paints";
  PostMessageW(window, WM_USER, 0, 0);
  EXPECT_LE(PollsUntilDone(PM_NOREMOVE), 20001);

  MSG message = {};
  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  EXPECT_EQ(message.message, WM_USER) << "still there";
}

TEST_F(ScreenTest, CountsWhatProgramsHaveNotGivenBack) {
  HPEN pen = CreatePen(PS_SOLID, 2, 0);
  HDC dc = GetDC(nullptr);
  EXPECT_EQ(screen().gdi_objects(), 1U);
  EXPECT_EQ(screen().device_contexts(), 1U);

  ReleaseDC(nullptr, dc);
  DeleteObject(pen);

  EXPECT_EQ(screen().gdi_objects(), 0U);
  EXPECT_EQ(screen().device_contexts(), 0U);
}

TEST_F(ScreenTest, EveryCallCanBeMadeToFail) {
  device().faults().Add({"CreateWindowExW", 1, 1, 0});
  device().faults().Add({"BeginPaint", 1, 1, ERROR_NOT_ENOUGH_MEMORY});

  EXPECT_EQ(Window({0, 0, 50, 50}), nullptr);
  HWND window = Window({0, 0, 50, 50});
  ASSERT_NE(window, nullptr);
  PAINTSTRUCT paint = {};
  EXPECT_EQ(BeginPaint(window, &paint), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_NOT_ENOUGH_MEMORY);
  EXPECT_TRUE(GetUpdateRect(window, nullptr, FALSE)) << "what was not painted stays to be painted";
}

TEST_F(ScreenTest, DevicesInOneWorldHaveScreensOfTheirOwn) {
  Window({0, 0, 50, 50});
  Profile profile;
  profile.screen_width = 100;
  profile.screen_height = 50;
  Device second(world(), profile, folder() / "second");

  EXPECT_EQ(second.screen().Snapshot(), Image(100, 50, kDesktopColour));
  EXPECT_THAT(second.screen().Windows(), IsEmpty());
  EXPECT_THAT(screen().Windows(), SizeIs(1));
}

TEST_F(ScreenTest, WritesItsCallsIntoTheTrace) {
  std::vector<std::string> lines;
  device().trace().SetSink([&lines](std::string_view line) { lines.emplace_back(line); });

  GetDesktopWindow();
  FindWindowW(u"WCELOAD", nullptr);
  device().trace().SetSink({});

  ASSERT_THAT(lines, SizeIs(2));
  EXPECT_THAT(lines[1], HasSubstr("FindWindowW"));
  EXPECT_THAT(lines[1], HasSubstr("WCELOAD"));
}

// ---- the progress window as read from outside ----

DrawnRectangle Box(int left, int top, int right, int bottom) {
  return {{left, top, right, bottom}, 1, kBlack, kWhite};
}
DrawnLine FillTo(int left, int right, int y) {
  return {{{left, y}, {right, y}}, 8, 0x808080};
}

TEST(ProgressViewTest, ReadsStatusLinesAndBothBars) {
  const std::vector<Drawn> shown = {
      DrawnText{{5, 5, 50, 18}, u"One", 0},
      DrawnText{{5, 18, 50, 31}, u"Two \u00e4", 0},
      Box(2, 2, 236, 251),
      Box(0, 0, 238, 296),
      Box(4, 225, 234, 235),
      FillTo(5, 5 + 19 * 6, 230),
      Box(4, 238, 234, 248),
  };

  const ProgressView view = ReadProgress(shown);

  EXPECT_THAT(view.status_lines, ElementsAre("One", "Two \xC3\xA4"));
  EXPECT_EQ(view.overall->filled, 19);
  EXPECT_EQ(view.overall->total, 38);
  EXPECT_EQ(view.file->filled, 0);
  EXPECT_EQ(view.file->total, 38);
  EXPECT_FALSE(view.caption.has_value());
}

TEST(ProgressViewTest, ReadsTheCaptionInPlaceOfTheFileBar) {
  const std::vector<Drawn> shown = {Box(4, 100, 198, 110), FillTo(5, 5 + 48 * 4, 105),
                                    DrawnText{{5, 117, 50, 130}, u"Corvanta, MR700123", 0}};

  const ProgressView view = ReadProgress(shown);

  EXPECT_EQ(view.overall->filled, 48);
  EXPECT_EQ(view.overall->total, 48);
  EXPECT_FALSE(view.file.has_value());
  EXPECT_EQ(view.caption, "Corvanta, MR700123");
}

TEST(ProgressViewTest, TakesABarWithoutWidthForWhatItIs) {
  const ProgressView view = ReadProgress({Box(4, 100, 6, 110)});

  EXPECT_EQ(view.overall->filled, 0);
  EXPECT_EQ(view.overall->total, 0);
}

}  // namespace
}  // namespace sim
