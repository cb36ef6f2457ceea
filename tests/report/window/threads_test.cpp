// Several real threads feed the window while it paints.
#include <atomic>

#include "window_fixture.h"

namespace report {
namespace {

constexpr int kFeeders = 4;
constexpr int kLinesEach = 60;

std::atomic<int> feeders_started;

DWORD WINAPI FeedLines(void*) {
  const int self = feeders_started.fetch_add(1);
  for (int i = 0; i < kLinesEach; ++i) {
    ShowStatus("feeder %d, line %d of a text that is long enough to be cut", self, i);
    SetOverallProgress(i * 100 / kLinesEach);
    SetFileProgress(100 - i);
    if (i % 16 == 0) ShowCaption("Corvanta", i % 32 == 0 ? "MR700123" : "MR700124");
  }
  return 0;
}

class ProgressWindowThreadsTest : public ProgressWindowTest {
 protected:
  ProgressWindowThreadsTest() : ProgressWindowTest({}, test::WorldKind::kReal) {}

  static void Feed() {
    feeders_started = 0;
    HANDLE feeders[kFeeders] = {};
    for (HANDLE& feeder : feeders)
      feeder = CreateThread(nullptr, 0, FeedLines, nullptr, 0, nullptr);
    for (HANDLE feeder : feeders) {
      EXPECT_EQ(WaitForSingleObject(feeder, INFINITE), WAIT_OBJECT_0);
      CloseHandle(feeder);
    }
  }
};

TEST_F(ProgressWindowThreadsTest, TakesLinesAndValuesFromSeveralThreadsWhileItPaints) {
  const GuiStart start = {nullptr, SW_SHOWNORMAL};
  StartGUI(&start);

  Feed();
  CloseProgressWindow();

  EXPECT_GT(screen().finished_paints(), 0U);
  EXPECT_EQ(device().memory().live_blocks(), 0U);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_EQ(screen().gdi_objects(), 0U);
}

TEST_F(ProgressWindowThreadsTest, LosesNoLineOfTheLastOnes) {
  const GuiStart start = {nullptr, SW_SHOWNORMAL};
  StartGUI(&start);

  Feed();

  int lines = 0;
  LineList::Line line;
  while (window_state.lines.Copy(lines, line)) {
    EXPECT_EQ(base::WideView(line.view()).substr(0, 7), TEXT("feeder "));
    ++lines;
  }
  EXPECT_EQ(lines, 16);
}

TEST_F(ProgressWindowThreadsTest, CanBeClosedWhileItIsFed) {
  const GuiStart start = {nullptr, SW_SHOWNORMAL};
  StartGUI(&start);
  feeders_started = 0;
  HANDLE feeder = CreateThread(nullptr, 0, FeedLines, nullptr, 0, nullptr);
  while (feeders_started.load() == 0) Sleep(1);

  CloseProgressWindow();

  EXPECT_EQ(WaitForSingleObject(feeder, INFINITE), WAIT_OBJECT_0);
  CloseHandle(feeder);
  EXPECT_THAT(screen().Windows(), ::testing::IsEmpty());
}

}  // namespace
}  // namespace report
