// From the window's start to its end, seen or unseen, and with calls that fail.
#include "window_fixture.h"
// Behind the fixture, which brings the platform's header last.
#include "report/window/gui_thread.h"

namespace report {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

/// A visible window of another program's kind, which takes the foreground.
HWND MakeOtherWindow() {
  WNDCLASSW definition = {};
  definition.lpfnWndProc = DefWindowProcW;
  definition.lpszClassName = TEXT("Other");
  RegisterClassW(&definition);
  return CreateWindowExW(0, TEXT("Other"), TEXT(""), WS_VISIBLE, 0, 0, 9, 9, nullptr, nullptr,
                         nullptr, nullptr);
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
  HWND other = MakeOtherWindow();
  ASSERT_EQ(GetForegroundWindow(), other);

  StartGUI(nullptr);

  EXPECT_EQ(GetForegroundWindow(), window_state.window.get());
  EXPECT_EQ(device().debug().OutputText(), "GUI Creating thread\r\n") << "no second thread";
  DestroyWindow(other);
}

TEST_F(ProgressWindowTest, LooksForThePackageInstallersWindowWhenItLosesTheForeground) {
  Start();
  const auto looked = device().faults().Count("FindWindowW");

  HWND other = MakeOtherWindow();

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

}  // namespace
}  // namespace report
