// What the window shows: where everything stands, its lines, its bars and its caption.
#include "window_fixture.h"

namespace report {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::SizeIs;

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
