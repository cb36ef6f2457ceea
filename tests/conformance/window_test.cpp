// Windows, message queues, update areas and drawing tools. Includes nothing but the platform.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <utility>
#include <vector>

#include "conformance/differences.h"
// Last: it renames some of the build machine's names.
#include <coredll.h>

namespace {

using conformance::Difference;
using conformance::Differs;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

constexpr UINT kFirst = WM_USER + 1;
constexpr UINT kSecond = WM_USER + 2;
constexpr UINT kAskBack = WM_USER + 3;
constexpr DWORD kPoison = 0xDEADBEEF;

struct Seen {
  HWND window;
  UINT message;
  WPARAM wparam;
  bool operator==(const Seen& other) const {
    return window == other.window && message == other.message && wparam == other.wparam;
  }
};

// What the window procedure saw and does; a test's windows live on threads that take turns.
std::vector<Seen> seen;
HWND ask_back;
bool refuse_creation;

LRESULT CALLBACK Procedure(HWND window, UINT message, WPARAM wparam, LPARAM lparam) {
  seen.push_back({window, message, wparam});
  switch (message) {
    case WM_CREATE: return refuse_creation ? -1 : 0;
    case kFirst: return static_cast<LRESULT>(wparam) + 1;
    case kAskBack: return SendMessageW(ask_back, kFirst, wparam, 0) + 100;
    default: return DefWindowProcW(window, message, wparam, lparam);
  }
}

/// A window without a brush of its own.
HWND MakeWindow(DWORD style = 0, HBRUSH brush = nullptr, const WCHAR* name = TEXT("Tarnwell")) {
  WNDCLASSW definition = {};
  definition.lpfnWndProc = Procedure;
  definition.lpszClassName = name;
  definition.hbrBackground = brush;
  RegisterClassW(&definition);
  return CreateWindowExW(0, name, TEXT("A Title"), style, CW_USEDEFAULT, CW_USEDEFAULT,
                         CW_USEDEFAULT, CW_USEDEFAULT, nullptr, nullptr, nullptr, nullptr);
}

/// Whether the device has this message at all.
bool IsDevices(UINT message) {
  constexpr UINT kKnown[] = {WM_CREATE, WM_DESTROY, WM_MOVE,       WM_SIZE, WM_ACTIVATE,
                             WM_PAINT,  WM_CLOSE,   WM_ERASEBKGND, WM_QUIT, WM_SHOWWINDOW,
                             kFirst,    kSecond,    kAskBack};
  return std::find(std::begin(kKnown), std::end(kKnown), message) != std::end(kKnown);
}

/// What window procedures saw of the device's messages.
std::vector<Seen> DevicesSeen() {
  std::vector<Seen> left;
  for (const Seen& one : seen) {
    if (!Differs(Difference::kFrameMessages) || IsDevices(one.message)) left.push_back(one);
  }
  return left;
}

/// Numbers of the messages that the window's procedure saw.
std::vector<UINT> MessagesOf(HWND window) {
  std::vector<UINT> numbers;
  for (const Seen& one : DevicesSeen()) {
    if (one.window == window) numbers.push_back(one.message);
  }
  return numbers;
}

void Validate(HWND window) {
  PAINTSTRUCT paint = {};
  BeginPaint(window, &paint);
  EndPaint(window, &paint);
}

DWORD WINAPI RunLoop(void* out) {
  *static_cast<HWND*>(out) = MakeWindow();
  MSG message = {};
  while (GetMessageW(&message, nullptr, 0, 0) > 0) DispatchMessageW(&message);
  return static_cast<DWORD>(message.wParam);
}

/// A thread with a window and a message loop.
class LoopThread {
 public:
  LoopThread() : thread_(CreateThread(nullptr, 0, RunLoop, &window_, 0, nullptr)) {
    while (window_ == nullptr) Sleep(1);
  }
  ~LoopThread() {
    PostMessageW(window_, WM_QUIT, 0, 0);
    WaitForSingleObject(thread_, INFINITE);
    CloseHandle(thread_);
  }
  LoopThread(const LoopThread&) = delete;
  LoopThread& operator=(const LoopThread&) = delete;
  [[nodiscard]] HWND window() const { return window_; }
  [[nodiscard]] HANDLE thread() const { return thread_; }

 private:
  HWND window_ = nullptr;
  HANDLE thread_;
};

class WindowConformance : public ::testing::Test {
 protected:
  void SetUp() override {
    seen.clear();
    ask_back = nullptr;
    refuse_creation = false;
    SetLastError(kPoison);
  }
};

bool operator==(const RECT& a, const RECT& b) {
  return a.left == b.left && a.top == b.top && a.right == b.right && a.bottom == b.bottom;
}

// ---- classes and windows ----

TEST_F(WindowConformance, AClassIsRegisteredOnce) {
  WNDCLASSW definition = {};
  definition.lpfnWndProc = Procedure;
  definition.lpszClassName = TEXT("Once");

  EXPECT_NE(RegisterClassW(&definition), 0);
  definition.lpszClassName = TEXT("ONCE");
  EXPECT_EQ(RegisterClassW(&definition), 0);
  EXPECT_EQ(GetLastError(), ERROR_CLASS_ALREADY_EXISTS);
}

TEST_F(WindowConformance, AWindowNeedsItsClass) {
  HWND window = CreateWindowExW(0, TEXT("Unknown"), TEXT(""), 0, 0, 0, 10, 10, nullptr, nullptr,
                                nullptr, nullptr);

  EXPECT_EQ(window, nullptr);
  constexpr DWORD kNoSuchClass = 1411;  // what the desktop says
  const bool differs = Differs(Difference::kNoClass);
  EXPECT_EQ(GetLastError(), differs ? kNoSuchClass : DWORD{ERROR_CANNOT_FIND_WND_CLASS});
}

TEST_F(WindowConformance, AWindowWithoutAPlaceCoversTheDesktopAndItsBorderIsNotClientArea) {
  HWND window = MakeWindow(WS_BORDER);
  RECT desktop = {};
  RECT frame = {};
  RECT client = {};

  EXPECT_TRUE(GetWindowRect(GetDesktopWindow(), &desktop));
  EXPECT_TRUE(GetWindowRect(window, &frame));
  EXPECT_TRUE(GetClientRect(window, &client));
  EXPECT_TRUE(frame == desktop);
  EXPECT_TRUE(client == (RECT{0, 0, desktop.right - 2, desktop.bottom - 2}));
}

TEST_F(WindowConformance, AWindowThatRefusesItsCreationDoesNotExist) {
  refuse_creation = true;

  HWND window = MakeWindow();

  EXPECT_EQ(window, nullptr);
  EXPECT_FALSE(IsWindow(seen.front().window));
}

TEST_F(WindowConformance, CallsOnAWindowThatIsGoneSayInvalidWindowHandle) {
  HWND window = MakeWindow();
  EXPECT_TRUE(DestroyWindow(window));
  RECT area = {1, 2, 3, 4};

  EXPECT_FALSE(IsWindow(window));
  const auto fails = [](bool success) {
    const DWORD error = GetLastError();
    SetLastError(kPoison);
    return !success && error == ERROR_INVALID_WINDOW_HANDLE;
  };
  SetLastError(kPoison);
  if (!Differs(Difference::kGoneWindow)) {
    EXPECT_TRUE(fails(DestroyWindow(window) != FALSE));
    EXPECT_TRUE(fails(UpdateWindow(window) != FALSE));
  }
  SetLastError(kPoison);
  EXPECT_TRUE(fails(ShowWindow(window, SW_SHOW) != FALSE));
  EXPECT_TRUE(fails(InvalidateRect(window, nullptr, TRUE) != FALSE));
  EXPECT_TRUE(fails(GetClientRect(window, &area) != FALSE));
  EXPECT_TRUE(fails(GetWindowRect(window, &area) != FALSE));
  EXPECT_TRUE(fails(SetForegroundWindow(window) != FALSE));
  EXPECT_TRUE(fails(PostMessageW(window, kFirst, 0, 0) != FALSE));
  EXPECT_TRUE(fails(SendMessageW(window, kFirst, 0, 0) != 0));
  EXPECT_TRUE(fails(GetDC(window) != nullptr));
  MSG message = {};
  EXPECT_EQ(GetMessageW(&message, window, 0, 0), -1);
  EXPECT_TRUE(area == (RECT{1, 2, 3, 4})) << "outputs of failed calls stay";
}

TEST_F(WindowConformance, OnlyItsOwnThreadDestroysAWindow) {
  const LoopThread other;

  EXPECT_FALSE(DestroyWindow(other.window()));
  EXPECT_EQ(GetLastError(), ERROR_ACCESS_DENIED);
  EXPECT_TRUE(IsWindow(other.window()));
}

TEST_F(WindowConformance, TheWindowsOfAThreadEndWithIt) {
  HWND window = nullptr;
  {
    const LoopThread other;
    window = other.window();
    EXPECT_TRUE(IsWindow(window));
  }
  EXPECT_FALSE(IsWindow(window));
}

TEST_F(WindowConformance, FindsWindowsByClassAndTitleWhateverTheLetterCase) {
  HWND window = MakeWindow();

  EXPECT_EQ(FindWindowW(TEXT("TARNWELL"), nullptr), window);
  EXPECT_EQ(FindWindowW(nullptr, TEXT("a title")), window);
  EXPECT_EQ(FindWindowW(TEXT("Tarnwell"), TEXT("A Title")), window);
  EXPECT_EQ(FindWindowW(TEXT("Tarnwell"), TEXT("Another")), nullptr);
  EXPECT_EQ(FindWindowW(TEXT("Tarn"), nullptr), nullptr);
}

TEST_F(WindowConformance, ShowingTellsWhetherTheWindowWasVisible) {
  HWND window = MakeWindow();

  EXPECT_FALSE(IsWindowVisible(window));
  EXPECT_FALSE(ShowWindow(window, SW_SHOWNORMAL));
  EXPECT_TRUE(IsWindowVisible(window));
  EXPECT_TRUE(ShowWindow(window, SW_SHOWNORMAL));
  EXPECT_TRUE(ShowWindow(window, SW_HIDE));
  EXPECT_FALSE(ShowWindow(window, SW_HIDE));
  EXPECT_FALSE(IsWindowVisible(window));
}

TEST_F(WindowConformance, AVisibleWindowIsToldThatItIsShownActiveAndHowLargeItIs) {
  HWND window = MakeWindow(WS_VISIBLE);

  if (Differs(Difference::kFrameMessages)) {  // the same ones, in another order
    EXPECT_THAT(MessagesOf(window), UnorderedElementsAre(WM_CREATE, WM_SHOWWINDOW, WM_SIZE, WM_MOVE,
                                                         WM_ACTIVATE, WM_ERASEBKGND));
  } else {
    EXPECT_THAT(MessagesOf(window),
                ElementsAre(WM_CREATE, WM_SHOWWINDOW, WM_SIZE, WM_MOVE, WM_ACTIVATE));
  }
}

TEST_F(WindowConformance, TheForegroundPassesFromWindowToWindow) {
  HWND first = MakeWindow(WS_VISIBLE);
  HWND second = MakeWindow(WS_VISIBLE);
  EXPECT_EQ(GetForegroundWindow(), second);
  seen.clear();

  EXPECT_TRUE(SetForegroundWindow(first));

  EXPECT_THAT(DevicesSeen(), ElementsAre(Seen{second, WM_ACTIVATE, WA_INACTIVE},
                                         Seen{first, WM_ACTIVATE, WA_ACTIVE}));
  EXPECT_EQ(GetForegroundWindow(), first);
  seen.clear();
  EXPECT_TRUE(SetForegroundWindow(first));
  EXPECT_THAT(seen, IsEmpty()) << "it is in front already";
}

TEST_F(WindowConformance, BringingAHiddenWindowToTheForegroundDoesNotShowIt) {
  HWND window = MakeWindow();

  EXPECT_TRUE(SetForegroundWindow(window));

  EXPECT_FALSE(IsWindowVisible(window));
}

TEST_F(WindowConformance, TheDefaultAnswerToCloseIsToDestroy) {
  HWND window = MakeWindow();
  seen.clear();

  SendMessageW(window, WM_CLOSE, 0, 0);

  EXPECT_THAT(MessagesOf(window), ElementsAre(WM_CLOSE, WM_DESTROY));
  EXPECT_FALSE(IsWindow(window));
}

// ---- messages ----

TEST_F(WindowConformance, PostedMessagesComeInOrderAndBeforePainting) {
  HWND window = MakeWindow(WS_VISIBLE);
  PostMessageW(window, kFirst, 7, 0);
  PostMessageW(window, kSecond, 8, 0);
  MSG message = {};

  EXPECT_TRUE(GetMessageW(&message, nullptr, 0, 0));
  EXPECT_EQ(message.message, kFirst);
  EXPECT_EQ(message.wParam, 7U);
  EXPECT_TRUE(GetMessageW(&message, nullptr, 0, 0));
  EXPECT_EQ(message.message, kSecond);
  EXPECT_TRUE(GetMessageW(&message, nullptr, 0, 0));
  EXPECT_EQ(message.message, WM_PAINT);
  EXPECT_EQ(message.hwnd, window);
}

TEST_F(WindowConformance, QuittingComesAfterWhatWasPostedAndBringsItsCode) {
  HWND window = MakeWindow();
  PostQuitMessage(42);
  PostMessageW(window, kFirst, 0, 0);
  MSG message = {};

  EXPECT_TRUE(GetMessageW(&message, nullptr, 0, 0));
  EXPECT_EQ(message.message, kFirst);
  EXPECT_EQ(GetMessageW(&message, nullptr, 0, 0), FALSE);
  EXPECT_EQ(message.message, WM_QUIT);
  EXPECT_EQ(message.wParam, 42U);
  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) << "it comes once";
}

TEST_F(WindowConformance, PeekingLeavesTheMessageUnlessToldToRemoveIt) {
  HWND window = MakeWindow();
  MSG message = {};
  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  PostMessageW(window, kFirst, 0, 0);

  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_NOREMOVE));
  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
}

TEST_F(WindowConformance, TakesOnlyTheMessagesAskedFor) {
  HWND first = MakeWindow();
  HWND second = MakeWindow();
  PostMessageW(first, kFirst, 0, 0);
  PostMessageW(second, kSecond, 0, 0);
  MSG message = {};

  EXPECT_TRUE(PeekMessageW(&message, second, 0, 0, PM_REMOVE));
  EXPECT_EQ(message.message, kSecond);
  EXPECT_FALSE(PeekMessageW(&message, nullptr, kSecond, kSecond, PM_REMOVE));
  EXPECT_TRUE(PeekMessageW(&message, nullptr, kFirst, kSecond, PM_REMOVE));
  EXPECT_EQ(message.hwnd, first);
}

TEST_F(WindowConformance, SendingToAWindowOfTheOwnThreadCallsItAtOnce) {
  HWND window = MakeWindow();
  PostMessageW(window, kSecond, 0, 0);
  seen.clear();

  EXPECT_EQ(SendMessageW(window, kFirst, 6, 0), 7);

  EXPECT_THAT(MessagesOf(window), ElementsAre(kFirst)) << "what is posted waits";
}

TEST_F(WindowConformance, SendingToAnotherThreadWaitsForItsAnswer) {
  const LoopThread other;

  EXPECT_EQ(SendMessageW(other.window(), kFirst, 20, 0), 21);
}

TEST_F(WindowConformance, AThreadThatWaitsForAnAnswerAnswersWhatIsSentToIt) {
  ask_back = MakeWindow();
  const LoopThread other;

  // The other thread's procedure sends to this thread's window before it answers.
  EXPECT_EQ(SendMessageW(other.window(), kAskBack, 5, 0), 106);
}

TEST_F(WindowConformance, ASenderIsReleasedWhenTheReceiverEnds) {
  // The other thread has a window but never looks at its messages.
  static HWND deaf;
  deaf = nullptr;
  const auto make_and_sleep = [](void*) -> DWORD {
    deaf = MakeWindow();
    Sleep(50);
    return 0;
  };
  HANDLE thread = CreateThread(nullptr, 0, make_and_sleep, nullptr, 0, nullptr);
  while (deaf == nullptr) Sleep(1);

  EXPECT_EQ(SendMessageW(deaf, kFirst, 1, 0), 0);

  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  CloseHandle(thread);
}

TEST_F(WindowConformance, ThreadMessagesHaveNoWindow) {
  EXPECT_TRUE(PostMessageW(nullptr, kFirst, 3, 0));
  MSG message = {};

  EXPECT_TRUE(GetMessageW(&message, nullptr, 0, 0));
  EXPECT_EQ(message.hwnd, nullptr);
  EXPECT_EQ(message.wParam, 3U);
  EXPECT_EQ(DispatchMessageW(&message), 0);
}

TEST_F(WindowConformance, MessagesOfADestroyedWindowAreDropped) {
  HWND window = MakeWindow();
  PostMessageW(window, kFirst, 0, 0);
  DestroyWindow(window);
  MSG message = {};

  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
}

// ---- update areas ----

TEST_F(WindowConformance, AskingForPaintGoesOnUntilTheAreaIsValid) {
  HWND window = MakeWindow(WS_VISIBLE);
  MSG message = {};

  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  EXPECT_EQ(message.message, WM_PAINT);
  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) << "nobody has painted yet";
  Validate(window);
  if (Differs(Difference::kPaintOnce)) return;
  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
}

TEST_F(WindowConformance, TheDefaultAnswerToPaintMakesTheAreaValid) {
  HWND window = MakeWindow(WS_VISIBLE);

  DefWindowProcW(window, WM_PAINT, 0, 0);

  EXPECT_FALSE(GetUpdateRect(window, nullptr, FALSE));
}

TEST_F(WindowConformance, InvalidAreasAddUpAndSoDoesErasing) {
  HWND window = MakeWindow(WS_VISIBLE);
  Validate(window);
  const RECT upper = {10, 20, 30, 40};
  const RECT lower = {5, 100, 20, 110};
  PAINTSTRUCT paint = {};
  RECT update = {};

  EXPECT_FALSE(GetUpdateRect(window, &update, FALSE));
  InvalidateRect(window, &upper, TRUE);
  InvalidateRect(window, &lower, FALSE);
  EXPECT_TRUE(GetUpdateRect(window, &update, FALSE));
  EXPECT_TRUE(update == (RECT{5, 20, 30, 110}));

  EXPECT_NE(BeginPaint(window, &paint), nullptr);
  EXPECT_TRUE(paint.rcPaint == update);
  EXPECT_TRUE(paint.fErase) << "without a brush the background is left to the window";
  EndPaint(window, &paint);
  EXPECT_FALSE(GetUpdateRect(window, &update, FALSE));
}

TEST_F(WindowConformance, NothingOutsideTheClientAreaBecomesInvalid) {
  HWND window = MakeWindow(WS_VISIBLE);
  Validate(window);
  const RECT outside = {-10, -10, 0, 0};
  const RECT partly = {-5, -5, 10, 10};
  RECT update = {};

  InvalidateRect(window, &outside, TRUE);
  EXPECT_FALSE(GetUpdateRect(window, &update, FALSE));
  InvalidateRect(window, &partly, TRUE);
  EXPECT_TRUE(GetUpdateRect(window, &update, FALSE));
  EXPECT_TRUE(update == (RECT{0, 0, 10, 10}));
}

TEST_F(WindowConformance, WithoutAskingForItNothingIsErased) {
  HWND window =
      MakeWindow(WS_VISIBLE, static_cast<HBRUSH>(GetStockObject(WHITE_BRUSH)), TEXT("Brushed"));
  Validate(window);
  PAINTSTRUCT paint = {};
  seen.clear();

  InvalidateRect(window, nullptr, FALSE);
  BeginPaint(window, &paint);
  EndPaint(window, &paint);
  EXPECT_FALSE(paint.fErase);
  EXPECT_THAT(MessagesOf(window), IsEmpty());

  InvalidateRect(window, nullptr, TRUE);
  BeginPaint(window, &paint);
  EndPaint(window, &paint);
  EXPECT_FALSE(paint.fErase) << "the class's brush has done it";
  EXPECT_THAT(MessagesOf(window), ElementsAre(WM_ERASEBKGND));
}

TEST_F(WindowConformance, HiddenWindowsAreNotPainted) {
  HWND window = MakeWindow();
  MSG message = {};

  InvalidateRect(window, nullptr, TRUE);

  EXPECT_FALSE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  ShowWindow(window, SW_SHOWNORMAL);
  EXPECT_TRUE(PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) << "shown, it is all to be painted";
  EXPECT_EQ(message.message, WM_PAINT);
}

TEST_F(WindowConformance, UpdatingPaintsAtOnceAndOnlyWhatIsInvalid) {
  HWND window = MakeWindow(WS_VISIBLE);
  seen.clear();

  UpdateWindow(window);
  EXPECT_THAT(MessagesOf(window), ElementsAre(WM_PAINT));

  UpdateWindow(window);
  EXPECT_THAT(MessagesOf(window), ElementsAre(WM_PAINT)) << "nothing is invalid any more";
}

// ---- drawing tools ----

TEST_F(WindowConformance, SelectingAToolGivesBackTheOneBefore) {
  HDC dc = GetDC(MakeWindow(WS_VISIBLE));
  HPEN pen = CreatePen(PS_SOLID, 8, RGB(1, 2, 3));

  EXPECT_EQ(SelectObject(dc, pen), GetStockObject(BLACK_PEN));
  EXPECT_EQ(SelectObject(dc, GetStockObject(WHITE_PEN)), pen);
  EXPECT_EQ(SelectObject(dc, GetStockObject(NULL_BRUSH)), GetStockObject(WHITE_BRUSH));
  EXPECT_TRUE(DeleteObject(pen));
}

TEST_F(WindowConformance, AToolInUseIsNotDeleted) {
  HWND window = MakeWindow(WS_VISIBLE);
  HDC dc = GetDC(window);
  HPEN pen = CreatePen(PS_SOLID, 1, 0);
  SelectObject(dc, pen);

  if (!Differs(Difference::kStockPens)) {
    EXPECT_FALSE(DeleteObject(pen));
    ReleaseDC(window, dc);
    EXPECT_TRUE(DeleteObject(pen));
    EXPECT_FALSE(DeleteObject(pen)) << "gone";
  }
  EXPECT_TRUE(DeleteObject(GetStockObject(BLACK_PEN))) << "accepted, without effect";
  EXPECT_NE(GetStockObject(BLACK_PEN), nullptr);
}

TEST_F(WindowConformance, AContextEndsWithItsPaintOrRelease) {
  HWND window = MakeWindow(WS_VISIBLE);
  PAINTSTRUCT paint = {};
  HDC dc = BeginPaint(window, &paint);
  EXPECT_EQ(dc, paint.hdc);
  if (!Differs(Difference::kPaintContext)) {
    EXPECT_EQ(ReleaseDC(window, dc), 0) << "a paint's context is not released";
  }
  EXPECT_TRUE(EndPaint(window, &paint));

  SetLastError(kPoison);
  EXPECT_FALSE(Rectangle(dc, 0, 0, 10, 10));
  if (Differs(Difference::kPaintContext)) return;
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  EXPECT_FALSE(EndPaint(window, &paint));
}

TEST_F(WindowConformance, TheFontsSizesBelongTogether) {
  HDC dc = GetDC(nullptr);
  TEXTMETRICW metrics = {};

  ASSERT_TRUE(GetTextMetricsW(dc, &metrics));

  EXPECT_EQ(metrics.tmHeight, metrics.tmAscent + metrics.tmDescent);
  EXPECT_LT(metrics.tmInternalLeading, metrics.tmHeight);
  EXPECT_GE(metrics.tmInternalLeading, 0);
  EXPECT_GE(metrics.tmExternalLeading, 0);
  EXPECT_GT(metrics.tmAveCharWidth, 0);
  EXPECT_GE(metrics.tmMaxCharWidth, metrics.tmAveCharWidth);
  EXPECT_EQ(ReleaseDC(nullptr, dc), 1);
}

TEST_F(WindowConformance, TheDevicesResolutionIsTheDesktops) {
  RECT desktop = {};
  GetWindowRect(GetDesktopWindow(), &desktop);
  HDC dc = GetDC(nullptr);

  EXPECT_EQ(GetDeviceCaps(dc, HORZRES), desktop.right);
  EXPECT_EQ(GetDeviceCaps(dc, VERTRES), desktop.bottom);
  ReleaseDC(nullptr, dc);
}

TEST_F(WindowConformance, DrawingNeedsAContextAndALineTwoPoints) {
  HWND window = MakeWindow(WS_VISIBLE);
  HDC dc = GetDC(window);
  const POINT points[] = {{1, 1}, {5, 1}};

  EXPECT_TRUE(Polyline(dc, points, 2));
  if (!Differs(Difference::kPaintContext)) {
    EXPECT_FALSE(Polyline(dc, points, 1));
  }
  EXPECT_TRUE(ExtTextOutW(dc, 1, 1, 0, nullptr, TEXT("text"), 4, nullptr));
  EXPECT_TRUE(ExtTextOutW(dc, 1, 1, 0, nullptr, TEXT(""), 0, nullptr));
  ReleaseDC(window, dc);
  EXPECT_FALSE(Polyline(dc, points, 2));
  EXPECT_FALSE(ExtTextOutW(dc, 1, 1, 0, nullptr, TEXT("text"), 4, nullptr));
  if (Differs(Difference::kPaintContext)) return;
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
}

TEST_F(WindowConformance, AMessageBoxTellsWhichButtonWasPressed) {
  if (Differs(Difference::kMessageBox)) GTEST_SKIP() << "nobody is there to press one";
  EXPECT_EQ(MessageBoxW(nullptr, TEXT("Text"), TEXT("Caption"), MB_OK), IDOK);
}

TEST_F(WindowConformance, OnlyKeysAreTranslated) {
  MSG message = {};
  message.message = WM_PAINT;

  EXPECT_FALSE(TranslateMessage(&message));
}

TEST_F(WindowConformance, ModesAndColoursGiveBackTheOnesBefore) {
  HDC dc = GetDC(MakeWindow(WS_VISIBLE));

  EXPECT_EQ(SetBkMode(dc, TRANSPARENT), OPAQUE);
  EXPECT_EQ(SetBkMode(dc, OPAQUE), TRANSPARENT);
  EXPECT_EQ(SetTextColor(dc, RGB(9, 8, 7)), RGB(0, 0, 0));
  EXPECT_EQ(SetTextColor(dc, 0), RGB(9, 8, 7));
}

TEST_F(WindowConformance, AnExchangeGivesBackWhatWasThere) {
  LONG value = 5;

  EXPECT_EQ(InterlockedExchange(&value, 9), 5);
  EXPECT_EQ(value, 9);
}

}  // namespace
