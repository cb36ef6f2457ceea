#include "window_fixture.h"
// Behind the fixture, which brings the platform's header last.
#include "report/window/gui_thread.h"
#include "report/window/layout.h"

namespace report {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

void ExpectArea(const RECT& actual, const RECT& expected, const char* what) {
  EXPECT_EQ(actual.left, expected.left) << what;
  EXPECT_EQ(actual.top, expected.top) << what;
  EXPECT_EQ(actual.right, expected.right) << what;
  EXPECT_EQ(actual.bottom, expected.bottom) << what;
}

void ExpectBox(const sim::Drawn& drawn, const RECT& expected, const char* what) {
  ASSERT_TRUE(std::holds_alternative<sim::DrawnRectangle>(drawn)) << what;
  const auto& box = std::get<sim::DrawnRectangle>(drawn);
  ExpectArea(box.area, expected, what);
  EXPECT_EQ(box.pen_width, 1) << what;
  EXPECT_EQ(box.outline, RGB(0, 0, 0)) << what;
  EXPECT_EQ(box.inside, RGB(255, 255, 255)) << what;
}

void ExpectFill(const sim::Drawn& drawn, POINT from, POINT to) {
  ASSERT_TRUE(std::holds_alternative<sim::DrawnLine>(drawn));
  const auto& line = std::get<sim::DrawnLine>(drawn);
  EXPECT_EQ(line.pen_width, 8);
  EXPECT_EQ(line.colour, RGB(128, 128, 128));
  ASSERT_EQ(line.points.size(), 2U);
  EXPECT_EQ(line.points[0].x, from.x);
  EXPECT_EQ(line.points[0].y, from.y);
  EXPECT_EQ(line.points[1].x, to.x);
  EXPECT_EQ(line.points[1].y, to.y);
}

void ExpectText(const sim::Drawn& drawn, POINT at, const char16_t* text) {
  ASSERT_TRUE(std::holds_alternative<sim::DrawnText>(drawn));
  EXPECT_EQ(std::get<sim::DrawnText>(drawn).area.left, at.x);
  EXPECT_EQ(std::get<sim::DrawnText>(drawn).area.top, at.y);
  EXPECT_EQ(std::get<sim::DrawnText>(drawn).text, text);
}

// ---- start, window, end ----

TEST_F(ProgressWindowTest, IsATopMostBorderedWindowOverTheWholeScreen) {
  Start();

  const std::vector<sim::WindowInfo> windows = screen().Windows();
  ASSERT_THAT(windows, SizeIs(1));
  EXPECT_EQ(windows[0].class_name, u"TWUpgrade");
  EXPECT_EQ(windows[0].title, u"TW Upgrade");
  EXPECT_EQ(windows[0].style, WS_VISIBLE | WS_BORDER);
  EXPECT_EQ(windows[0].extended_style, WS_EX_TOPMOST | 0x00020000U);
  ExpectArea(windows[0].frame, {0, 0, 240, 320}, "frame");
  EXPECT_TRUE(windows[0].visible);
  EXPECT_TRUE(windows[0].active);
}

TEST_F(ProgressWindowTest, SaysToADebuggerWhenItsThreadBeginsAndEnds) {
  Start();
  EXPECT_EQ(device().debug().OutputText(), "GUI Creating thread\r\n");

  CloseProgressWindow();

  EXPECT_EQ(device().debug().OutputText(), "GUI Creating thread\r\nGUIMAIN Exiting\r\n");
  EXPECT_THAT(screen().Windows(), IsEmpty());
}

TEST_F(ProgressWindowTest, IsLookedForEveryHundredMilliseconds) {
  const DWORD before = GetTickCount();
  const GuiStart start = {nullptr, SW_SHOWNORMAL};

  StartGUI(&start);

  EXPECT_EQ(GetTickCount() - before, 100U);
  EXPECT_NE(window_state.window.get(), nullptr);
}

TEST_F(ProgressWindowTest, DoesNotStartWithoutParameters) {
  StartGUI(nullptr);

  EXPECT_EQ(window_state.thread.get(), nullptr);
  EXPECT_EQ(device().debug().OutputText(), "");
}

TEST_F(ProgressWindowTest, ASecondStartOnlyBringsItToTheForeground) {
  Start();
  WNDCLASSW other_class = {};
  other_class.lpfnWndProc = DefWindowProcW;
  other_class.lpszClassName = TEXT("Other");
  RegisterClassW(&other_class);
  HWND other = CreateWindowExW(0, TEXT("Other"), TEXT(""), WS_VISIBLE, 0, 0, 9, 9, nullptr, nullptr,
                               nullptr, nullptr);
  ASSERT_EQ(GetForegroundWindow(), other);

  StartGUI(nullptr);

  EXPECT_EQ(GetForegroundWindow(), window_state.window.get());
  EXPECT_EQ(device().debug().OutputText(), "GUI Creating thread\r\n") << "no second thread";
  DestroyWindow(other);
}

TEST_F(ProgressWindowTest, LooksForThePackageInstallersWindowWhenItLosesTheForeground) {
  Start();
  const auto looked = device().faults().Count("FindWindowW");
  WNDCLASSW other_class = {};
  other_class.lpfnWndProc = DefWindowProcW;
  other_class.lpszClassName = TEXT("Other");
  RegisterClassW(&other_class);

  HWND other = CreateWindowExW(0, TEXT("Other"), TEXT(""), WS_VISIBLE, 0, 0, 9, 9, nullptr, nullptr,
                               nullptr, nullptr);

  EXPECT_EQ(device().faults().Count("FindWindowW"), looked + 1);
  SetForegroundWindow(window_state.window.get());
  EXPECT_EQ(device().faults().Count("FindWindowW"), looked + 1) << "only on deactivation";
  DestroyWindow(other);
}

TEST_F(ProgressWindowTest, AnswersTimersAndActivationWithZero) {
  Start();
  HWND window = window_state.window.get();

  EXPECT_EQ(SendMessageW(window, WM_TIMER, 1, 0), 0);
  EXPECT_EQ(SendMessageW(window, WM_ACTIVATE, WA_ACTIVE, 0), 0);
  EXPECT_EQ(SendMessageW(window, WM_ACTIVATE, WA_INACTIVE, 0), 0);
  EXPECT_EQ(SendMessageW(window, WM_SIZE, 0, 0), 0);
}

TEST_F(ProgressWindowTest, ItsThreadEndsWithZeroAfterTheMessageLoop) {
  GuiStart start = {nullptr, SW_SHOWNORMAL};
  HANDLE thread = CreateThread(nullptr, 0, GUIMain, &start, 0, nullptr);
  Settle();

  PostMessageW(window_state.window.get(), WM_CLOSE, 0, 0);

  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  DWORD exit_code = 99;
  GetExitCodeThread(thread, &exit_code);
  EXPECT_EQ(exit_code, 0U);
  EXPECT_NE(window_state.window.get(), nullptr) << "the thread does not forget the window";
  CloseHandle(thread);
}

TEST_F(ProgressWindowTest, ItsThreadEndsWithEightWhenTheWindowCannotBeMade) {
  device().faults().Add({"CreateWindowExW", 1, 1, ERROR_OUTOFMEMORY});
  GuiStart start = {nullptr, SW_SHOWNORMAL};

  HANDLE thread = CreateThread(nullptr, 0, GUIMain, &start, 0, nullptr);

  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  DWORD exit_code = 99;
  GetExitCodeThread(thread, &exit_code);
  EXPECT_EQ(exit_code, 8U);
  ASSERT_THAT(screen().MessageBoxes(), SizeIs(1));
  EXPECT_EQ(screen().MessageBoxes()[0].text, u"GUIMain - bad InitInstance");
  EXPECT_EQ(screen().MessageBoxes()[0].caption, u"Info");
  EXPECT_EQ(device().debug().OutputText(), "") << "it has had no message loop to leave";
  CloseHandle(thread);
}

TEST_F(ProgressWindowTest, StartingComesBackWhenTheWindowCannotBeMade) {
  device().faults().Add({"CreateWindowExW", 1, 1, 0});

  Start();

  EXPECT_EQ(window_state.window.get(), nullptr);
  ShowStatus("kept for nobody");
  SetOverallProgress(50);
  CloseProgressWindow();
  Start();
  EXPECT_NE(window_state.window.get(), nullptr) << "the next job tries again";
}

TEST_F(ProgressWindowTest, StartingComesBackWhileTheMessageBoxWaitsForItsButton) {
  device().faults().Add({"CreateWindowExW", 1, 1, 0});
  screen().AnswerMessageBoxes([](const sim::ShownMessageBox&) {
    Sleep(3600 * 1000);
    return IDOK;
  });
  const DWORD before = GetTickCount();

  Start();

  EXPECT_LT(GetTickCount() - before, 1000U);
  CloseProgressWindow();
  EXPECT_LT(GetTickCount() - before, 4000U) << "closing waits 2000 ms at most";
}

TEST_F(ProgressWindowTest, StartingComesBackWithoutAThread) {
  device().faults().Add({"CreateThread", 1, 1, 0});

  Start();

  EXPECT_EQ(window_state.window.get(), nullptr);
  EXPECT_EQ(window_state.thread.get(), nullptr);
}

TEST_F(ProgressWindowTest, ClosingWithoutAWindowDoesNothing) {
  const DWORD before = GetTickCount();

  CloseProgressWindow();

  EXPECT_EQ(GetTickCount(), before);
}

TEST_F(ProgressWindowTest, ClosingWaitsForItsThreadAndForgetsWindowAndThread) {
  Start();
  HWND window = window_state.window.get();
  const std::size_t handles = OpenHandles();

  CloseProgressWindow();

  EXPECT_FALSE(IsWindow(window));
  EXPECT_EQ(window_state.window.get(), nullptr);
  EXPECT_EQ(window_state.thread.get(), nullptr);
  EXPECT_EQ(OpenHandles(), handles - 1);
}

TEST_F(ProgressWindowTest, TheNextJobOfAProcessHasAWindowOfItsOwn) {
  Start();
  HWND first = window_state.window.get();
  ShowStatus("first job");
  SetOverallProgress(70);
  SetFileProgress(30);
  CloseProgressWindow();

  Start();

  EXPECT_NE(window_state.window.get(), nullptr);
  EXPECT_NE(window_state.window.get(), first);
  EXPECT_THAT(view().status_lines, IsEmpty());
  EXPECT_EQ(view().overall->filled, 0);
  EXPECT_EQ(view().file->filled, 0);
}

TEST_F(ProgressWindowTest, AfterSomebodyClosedItTheUpgradeGoesOnWithoutIt) {
  Start();
  HWND window = window_state.window.get();
  SendMessageW(window, WM_CLOSE, 0, 0);
  ASSERT_FALSE(IsWindow(window));

  ShowStatus("unseen");
  SetOverallProgress(50);
  const GuiStart start = {nullptr, SW_SHOWNORMAL};
  StartGUI(&start);

  EXPECT_EQ(window_state.window.get(), window) << "the handle stays until the job ends";
  EXPECT_THAT(screen().Windows(), IsEmpty());
}

TEST_F(ProgressWindowTest, LeavesNeitherPensNorContextsNorMemoryBehind) {
  Start();
  for (int i = 0; i < 40; ++i) {
    ShowStatus("line %d", i);
    SetOverallProgress(i);
    Settle();
  }
  CloseProgressWindow();

  EXPECT_EQ(screen().gdi_objects(), 0U);
  EXPECT_EQ(screen().device_contexts(), 0U);
  EXPECT_EQ(device().memory().live_blocks(), 0U);
}

// ---- hidden ----

TEST_F(ProgressWindowTest, StartedHiddenItKeepsTheLinesUntilItIsShown) {
  Start(SW_HIDE);
  ShowStatus("unseen");
  SetOverallProgress(50);
  Settle();
  EXPECT_FALSE(IsWindowVisible(window_state.window.get()));
  EXPECT_EQ(screen().Snapshot(), sim::Image(240, 320, screen().Snapshot().At(0, 0)));

  ShowProgressWindow();
  Settle();

  EXPECT_THAT(view().status_lines, ElementsAre("unseen"));
  EXPECT_EQ(view().overall->filled, 19);
}

TEST_F(ProgressWindowTest, WithoutAWindowNothingOfTheDesktopIsTouched) {
  ShowStatus("early");
  SetOverallProgress(10);
  SetFileProgress(20);
  ShowCaption("Corvanta", "MR700123");
  RepaintWindow();
  ShowProgressWindow();

  for (const char* call : {"InvalidateRect", "SetForegroundWindow", "ShowWindow", "GetDC"}) {
    EXPECT_EQ(device().faults().Count(call), 0U) << call;
  }
  EXPECT_EQ(window_state.file_value.get(), 7) << "20 % of 38 units";
}

TEST_F(ProgressWindowTest, StartsWithoutTheLinesAndValuesFromBefore) {
  ShowStatus("early");
  SetOverallProgress(50);

  Start();

  EXPECT_THAT(view().status_lines, IsEmpty());
  EXPECT_EQ(view().overall->filled, 0);
}

// ---- geometry, 240 x 320: client area 238 x 318, font 13 high with a leading of 2 inside ----

TEST_F(ProgressWindowTest, DrawsFrameThenBackgroundThenBothBars) {
  Start();

  const std::vector<sim::Drawn> calls = shown();
  ASSERT_THAT(calls, SizeIs(4));
  ExpectBox(calls[0], {2, 2, 236, 2 + 13 * 19 + 2}, "frame");
  ExpectBox(calls[1], {0, 0, 238, 318 - 22}, "background");
  ExpectBox(calls[2], {4, 13 * 17 + 4, 5 + 38 * 6 + 1, 13 * 17 + 14}, "overall bar");
  ExpectBox(calls[3], {4, 13 * 18 + 4, 5 + 38 * 6 + 1, 13 * 18 + 14}, "file bar");
}

TEST_F(ProgressWindowTest, DrawsTheLinesFromTheTopALineHeightApart) {
  Start();
  ShowStatus("one");
  ShowStatus("two");
  Settle();

  const std::vector<sim::Drawn> calls = shown();
  ASSERT_THAT(calls, SizeIs(6));
  ExpectText(calls[2], {0 + 3 + 2, 2 + 3 + 0}, u"one");
  ExpectText(calls[3], {5, 5 + 13}, u"two");
}

TEST_F(ProgressWindowTest, FillsTheBarsWithAGreyLine) {
  Start();
  SetOverallProgress(50);
  SetFileProgress(100);
  Settle();

  const std::vector<sim::Drawn> calls = shown();
  ASSERT_THAT(calls, SizeIs(6));
  ExpectFill(calls[3], {5, 225 + 5}, {5 + 19 * 6, 230});
  ExpectFill(calls[5], {5, 238 + 5}, {5 + 38 * 6, 243});
}

TEST_F(ProgressWindowTest, ABarHoldsItsPercentBetweenEmptyAndFull) {
  Start();

  SetOverallProgress(150);
  SetFileProgress(-5);
  Settle();

  EXPECT_EQ(view().overall->filled, 38);
  EXPECT_EQ(view().overall->total, 38);
  EXPECT_EQ(view().file->filled, 0);
}

TEST_F(ProgressWindowTest, TheFirstStepOfAnUpgradeShowsNothingYet) {
  Start();

  SetOverallProgress(2);
  Settle();

  EXPECT_EQ(view().overall->filled, 0);
}

TEST_F(ProgressWindowTest, PaintsFromTheOverallBarDownwardsForEitherBar) {
  Start();
  ShowStatus("stays");
  Settle();
  std::vector<sim::FinishedPaint> paints;
  screen().OnPaint([&paints](const sim::FinishedPaint& paint) { paints.push_back(paint); });

  SetOverallProgress(40);
  Settle();
  SetFileProgress(40);
  Settle();
  screen().OnPaint({});

  ASSERT_THAT(paints, SizeIs(2));
  ExpectArea(paints[0].area, {0, 13 * 17 + 2, 238, 318}, "after the overall bar");
  ExpectArea(paints[1].area, {0, 13 * 17 + 2, 238, 318}, "after the file bar");
  for (const sim::Drawn& drawn : paints[0].calls) {
    EXPECT_FALSE(std::holds_alternative<sim::DrawnText>(drawn)) << "the lines are not drawn again";
  }
  EXPECT_THAT(view().status_lines, ElementsAre("stays"));
}

TEST_F(ProgressWindowTest, ErasesOnlyForAShrinkingBar) {
  Start();
  std::vector<bool> erased;
  screen().OnPaint([&erased](const sim::FinishedPaint& paint) { erased.push_back(paint.erase); });

  for (const int percent : {40, 80, 80, 10}) {
    SetFileProgress(percent);
    Settle();
  }
  screen().OnPaint({});

  EXPECT_THAT(erased, ElementsAre(false, false, false, true));
}

TEST_F(ProgressWindowTest, AsksTheFontForItsSizesBeforeTheFirstPaintOnly) {
  Start(SW_HIDE);
  SetFileProgress(50);
  EXPECT_EQ(device().faults().Count("GetDC"), 1U);
  ShowProgressWindow();
  Settle();

  SetFileProgress(60);

  EXPECT_EQ(device().faults().Count("GetDC"), 1U);
  EXPECT_EQ(device().faults().Count("ReleaseDC"), 1U);
}

// ---- status lines ----

TEST_F(ProgressWindowTest, TheSeventeenthLinePushesOutTheFirst) {
  Start();
  for (int i = 1; i <= 17; ++i) ShowStatus("line %d", i);
  Settle();

  const std::vector<std::string> lines = view().status_lines;
  ASSERT_THAT(lines, SizeIs(16));
  EXPECT_EQ(lines.front(), "line 2");
  EXPECT_EQ(lines.back(), "line 17");
}

TEST_F(ProgressWindowTest, AFullListIsErasedBeforeItMoves) {
  Start();
  std::vector<bool> erased;
  screen().OnPaint([&erased](const sim::FinishedPaint& paint) { erased.push_back(paint.erase); });

  for (int i = 1; i <= 17; ++i) {
    ShowStatus("line %d", i);
    Settle();
  }
  screen().OnPaint({});

  ASSERT_THAT(erased, SizeIs(17));
  EXPECT_FALSE(erased[15]) << "the sixteenth line fits";
  EXPECT_TRUE(erased[16]);
}

TEST_F(ProgressWindowTest, ALineThatMovesTheListInvalidatesTwice) {
  Start();
  for (int i = 0; i < 16; ++i) ShowStatus("line");
  const auto before = device().faults().Count("InvalidateRect");

  ShowStatus("line");

  EXPECT_EQ(device().faults().Count("InvalidateRect"), before + 2);
}

TEST_F(ProgressWindowTest, EveryLineBringsTheWindowToTheForeground) {
  Start();
  const auto before = device().faults().Count("SetForegroundWindow");

  ShowStatus("one");
  ShowStatus("two");

  EXPECT_EQ(device().faults().Count("SetForegroundWindow"), before + 2);
}

TEST_F(ProgressWindowTest, BeforeTheFirstPaintALongTextIsCutAtThirtyEightCharacters) {
  Start(SW_HIDE);
  ShowStatus("%s", "12345678901234567890123456789012345678901234567890");
  ShowProgressWindow();
  Settle();

  EXPECT_THAT(view().status_lines, ElementsAre("12345678901234567890123456789012345678..."));
}

TEST_F(ProgressWindowTest, AfterTheFirstPaintALongTextIsCutForTheScreen) {
  Start();
  // 240 pixels / (6 + 1) = 34 characters: dots at 29, 30 and 31.
  ShowStatus("%s", "12345678901234567890123456789012345678901234567890");
  Settle();

  EXPECT_THAT(view().status_lines, ElementsAre("12345678901234567890123456789..."));
}

TEST_F(ProgressWindowTest, ATextOfAnyLengthAndContentIsALine) {
  Start();
  const std::string huge(5000, '%');

  ShowStatus("%s", huge.c_str());
  ShowStatus("%s", "");
  ShowStatus("100%% \xFF\xFE");
  Settle();

  const std::vector<std::string> lines = view().status_lines;
  ASSERT_THAT(lines, SizeIs(3));
  EXPECT_EQ(lines[0], std::string(29, '%') + "...");
  EXPECT_EQ(lines[1], "");
  EXPECT_THAT(lines[2], HasSubstr("100% "));
}

TEST_F(ProgressWindowTest, WithoutMemoryTheLineIsLostAndTheNextOneShown) {
  Start();
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});

  ShowStatus("lost");
  ShowStatus("shown");
  Settle();

  EXPECT_THAT(view().status_lines, ElementsAre("shown"));
}

TEST_F(ProgressWindowTest, WithoutMemoryAFullListLosesItsOldestLineToo) {
  Start();
  for (int i = 1; i <= 16; ++i) ShowStatus("line %d", i);
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});

  ShowStatus("lost");
  Settle();

  EXPECT_THAT(view().status_lines, SizeIs(15));
  EXPECT_EQ(view().status_lines.front(), "line 2");
}

// ---- caption ----

TEST_F(ProgressWindowTest, ShowsTheCaptionInPlaceOfTheFileBar) {
  ShowCaption("Corvanta", "MR700123");
  Start();
  SetFileProgress(50);
  Settle();

  const std::vector<sim::Drawn> calls = shown();
  ASSERT_THAT(calls, SizeIs(4));
  ExpectText(calls[3], {5, 13 * 18}, u"Corvanta, MR700123");
  EXPECT_FALSE(view().file.has_value());
  EXPECT_EQ(view().overall->filled, 0);
}

TEST_F(ProgressWindowTest, ACaptionMayBeEmptyLongAndChangedWhileShown) {
  ShowCaption(nullptr, nullptr);
  Start();
  EXPECT_EQ(view().caption, ", ");

  ShowCaption(std::string(5000, 'x').c_str(), "serial");
  RepaintWindow();
  Settle();

  EXPECT_EQ(view().caption, std::string(CaptionText::Text::capacity() - 1, 'x'));
}

// ---- failing calls ----

TEST_F(ProgressWindowTest, APaintThatCannotBeginDoesNotAskForEver) {
  Start();
  device().faults().Add({"BeginPaint", 1, 0, 0});

  ShowStatus("unpainted");
  Settle();

  device().faults().Clear();
  RepaintWindow();
  Settle();
  EXPECT_THAT(view().status_lines, ElementsAre("unpainted"));
}

TEST_F(ProgressWindowTest, WithoutAPenTheBarIsEmpty) {
  Start();
  device().faults().Add({"CreatePen", 1, 1, 0});

  SetOverallProgress(100);
  Settle();

  EXPECT_EQ(view().overall->filled, 0);
}

TEST_F(ProgressWindowTest, SurvivesTheFailureOfEachCallInTurn) {
  for (std::uint64_t nth = 1;; ++nth) {
    device().faults().Clear();
    const auto fired = device().faults().fired();
    device().faults().Add({"*", nth, 1, 0});
    Start();
    for (int i = 0; i < 17; ++i) ShowStatus("line %d", i);
    SetOverallProgress(50);
    SetFileProgress(30);
    Settle();
    CloseProgressWindow();
    const bool failed = device().faults().fired() != fired;
    device().faults().Clear();
    Sleep(5000);  // a thread that was given up has ended

    EXPECT_EQ(device().memory().live_blocks(), 0U) << device().faults().last_fired();
    EXPECT_EQ(screen().gdi_objects(), 0U) << device().faults().last_fired();
    EXPECT_THAT(screen().Windows(), IsEmpty()) << device().faults().last_fired();
    if (!failed) break;
    ASSERT_LT(nth, 2000U);
  }
}

// ---- the small screen, 240 x 319: client area 238 x 317 ----

TEST_F(SmallProgressWindowTest, HasSevenLinesFortyEightUnitsAndHigherBars) {
  Start();
  ShowStatus("one");
  SetOverallProgress(50);
  SetFileProgress(100);
  Settle();

  const std::vector<sim::Drawn> calls = shown();
  ASSERT_THAT(calls, SizeIs(7));
  ExpectBox(calls[0], {2, 2, 236, 2 + 13 * 10 + 2}, "frame");
  ExpectBox(calls[1], {0, 0, 238, 317}, "background to the bottom");
  ExpectText(calls[2], {5, 5}, u"one");
  ExpectBox(calls[3], {4, 13 * 8 - 8 + 4, 5 + 48 * 4 + 1, 13 * 8 - 8 + 14}, "overall bar");
  ExpectFill(calls[4], {5, 105}, {5 + 24 * 4, 105});
  ExpectBox(calls[5], {4, 13 * 9 - 8 + 4, 5 + 48 * 4 + 1, 13 * 9 - 8 + 14}, "file bar");
  ExpectFill(calls[6], {5, 118}, {5 + 48 * 4, 118});
}

TEST_F(SmallProgressWindowTest, TheEighthLinePushesOutTheFirst) {
  Start();
  for (int i = 1; i <= 8; ++i) ShowStatus("line %d", i);
  Settle();

  EXPECT_THAT(view().status_lines,
              ElementsAre("line 2", "line 3", "line 4", "line 5", "line 6", "line 7", "line 8"));
}

TEST_F(SmallProgressWindowTest, TheCaptionIsNotLiftedWithTheBars) {
  ShowCaption("Corvanta", "MR700123");
  Start();

  ExpectText(shown().back(), {5, 13 * 9}, u"Corvanta, MR700123");
}

TEST_F(SmallProgressWindowTest, TheBarsAreaIsLiftedWithThem) {
  Start();
  RECT area = {};
  screen().OnPaint([&area](const sim::FinishedPaint& paint) { area = paint.area; });

  SetOverallProgress(50);
  Settle();
  screen().OnPaint({});

  ExpectArea(area, {0, 13 * 8 - 8 + 2, 238, 317}, "bar area");
}

class ScreenSizeTest : public ProgressWindowTest, public ::testing::WithParamInterface<RECT> {
 protected:
  ScreenSizeTest() : ProgressWindowTest(ProfileWithScreen(GetParam().right, GetParam().bottom)) {}
};
class NormalScreenTest : public ScreenSizeTest {};
class SmallScreenTest : public ScreenSizeTest {};

TEST_P(NormalScreenTest, HasThirtyEightUnits) {
  Start();
  EXPECT_EQ(view().overall->total, 38);
  EXPECT_EQ(window_state.line_capacity.get(), 16);
}
INSTANTIATE_TEST_SUITE_P(Sizes, NormalScreenTest,
                         ::testing::Values(RECT{0, 0, 240, 320}, RECT{0, 0, 480, 640},
                                           RECT{0, 0, 800, 480}));

TEST_P(SmallScreenTest, HasFortyEightUnits) {
  Start();
  EXPECT_EQ(view().overall->total, 48);
  EXPECT_EQ(window_state.line_capacity.get(), 7);
}
INSTANTIATE_TEST_SUITE_P(Sizes, SmallScreenTest,
                         ::testing::Values(RECT{0, 0, 240, 319}, RECT{0, 0, 239, 320},
                                           RECT{0, 0, 320, 240}, RECT{0, 0, 160, 160}));

TEST_F(SmallProgressWindowTest, OnATinyScreenNothingIsDrawnOutsideIt) {
  CloseProgressWindow();
  Restart(ProfileWithScreen(20, 20));
  Start();
  ShowStatus("a line much wider than the screen");
  SetOverallProgress(100);
  Settle();

  EXPECT_EQ(view().overall->total, 0) << "no room for a bar";
}

TEST_F(SmallProgressWindowTest, AProcessKeepsTheSmallLayoutOnALaterLargerScreen) {
  Start();
  CloseProgressWindow();
  Restart(ProfileWithScreen(240, 320));
  Start();

  EXPECT_EQ(view().overall->total, 38) << "the units follow the screen";
  EXPECT_EQ(window_state.line_capacity.get(), 7) << "the line capacity does not";
  EXPECT_TRUE(window_state.small_screen.get());
}

}  // namespace
}  // namespace report
