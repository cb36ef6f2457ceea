// What the window computes without a window.
#include <gtest/gtest.h>

#include <string>

#include "report/window/layout.h"
#include "report/window/status_text.h"

namespace report {
namespace {

std::string Shortened(std::string text, int characters_per_line) {
  char work[kStatusWorkSize] = {};
  text.copy(work, text.size());
  const std::size_t length = ShortenForScreen(work, text.size(), characters_per_line);
  return {work, length};
}

TEST(StatusTextTest, BeforeTheFirstPaintThirtyEightCharactersAndDotsAreShown) {
  const std::string fifty(50, 'x');

  EXPECT_EQ(Shortened(fifty, 0), std::string(38, 'x') + "...");
}

TEST(StatusTextTest, ATextThatJustFillsTheRoomGetsTheDotsToo) {
  EXPECT_EQ(Shortened(std::string(37, 'x'), 0), std::string(37, 'x'));
  EXPECT_EQ(Shortened(std::string(38, 'x'), 0), std::string(38, 'x') + "...");
  EXPECT_EQ(Shortened(std::string(40, 'x'), 0), std::string(38, 'x') + "...");
  EXPECT_EQ(Shortened(std::string(41, 'x'), 0), std::string(38, 'x') + "...");
}

TEST(StatusTextTest, WithTheCharactersPerLineKnownTheDotsEndTwoBeforeThem) {
  EXPECT_EQ(Shortened(std::string(28, 'x'), 34), std::string(28, 'x'));
  EXPECT_EQ(Shortened(std::string(29, 'x'), 34), std::string(29, 'x') + "...");
  EXPECT_EQ(Shortened(std::string(100, 'x'), 34).size(), 32U);
}

TEST(StatusTextTest, AScreenOfFiveCharactersShowsTheDotsAloneANarrowerOneTheWholeText) {
  EXPECT_EQ(Shortened("abcdefgh", 5), "...");
  EXPECT_EQ(Shortened("", 5), "...");
  EXPECT_EQ(Shortened("abcdefgh", 4), "abcdefgh");
  EXPECT_EQ(Shortened("abcdefgh", 1), "abcdefgh");
}

TEST(StatusTextTest, TheDotsMayStandBehindTheLongestText) {
  const std::string longest(kStatusSize - 1, 'x');

  EXPECT_EQ(Shortened(longest, 172), longest + "...") << "positions 167 to 169, the zero at 170";
  EXPECT_EQ(Shortened(longest, 173), longest);
  EXPECT_EQ(Shortened(longest, 100000), longest);
}

TEST(BarValueTest, IsTheWholePartOfTheProduct) {
  EXPECT_EQ(BarValue(0, 38), 0);
  EXPECT_EQ(BarValue(2, 38), 0) << "the first step of an upgrade";
  EXPECT_EQ(BarValue(3, 38), 1);
  EXPECT_EQ(BarValue(25, 38), 9);
  EXPECT_EQ(BarValue(50, 38), 19);
  EXPECT_EQ(BarValue(75, 38), 28);
  EXPECT_EQ(BarValue(99, 38), 37);
  EXPECT_EQ(BarValue(100, 38), 38);
  EXPECT_EQ(BarValue(25, 48), 12);
  EXPECT_EQ(BarValue(50, 48), 24);
  EXPECT_EQ(BarValue(75, 48), 36);
  EXPECT_EQ(BarValue(100, 48), 48);
}

TEST(BarValueTest, EqualsTheSinglePrecisionProductForEveryPercent) {
  for (const int units : {38, 48}) {
    for (int percent = 0; percent <= 100; ++percent) {
      volatile float share = static_cast<float>(percent) * 0.01F;
      volatile float product = share * static_cast<float>(units);
      EXPECT_EQ(BarValue(percent, units), static_cast<int>(product)) << percent << " of " << units;
    }
  }
}

TEST(BarValueTest, HoldsThePercentBetweenNothingAndAll) {
  EXPECT_EQ(BarValue(150, 38), 38);
  EXPECT_EQ(BarValue(-5, 38), 0);
  EXPECT_EQ(BarValue(INT32_MAX, 48), 48);
  EXPECT_EQ(BarValue(INT32_MIN, 48), 0);
}

TEST(LayoutTest, AClientAreaNarrowerThanTheUnitsHasBarsWithoutWidth) {
  const FontSize font = {13, 2, 0, 6};
  const Layout layout({0, 0, 40, 318}, font, {16, 38, false});

  const Bar bar = layout.BarIn(kOverallRow);

  EXPECT_EQ(bar.step, 0);
  EXPECT_EQ(bar.outline.right - bar.outline.left, 2);
}

TEST(LayoutTest, LeadingMovesTheLinesApartAndDown) {
  const FontSize font = {12, 3, 2, 6};
  const Layout layout({0, 0, 238, 318}, font, {16, 38, false});

  EXPECT_EQ(layout.Line(0).x, 0 + 3 + 3);
  EXPECT_EQ(layout.Line(0).y, 2 + 3 + 2);
  EXPECT_EQ(layout.Line(1).y, 2 + 3 + 2 + 14);
  EXPECT_EQ(layout.Frame().bottom, 2 + 14 * 19 + 2);
  EXPECT_EQ(layout.BarIn(kOverallRow).outline.top, 14 * 17 + 2 + 2);
  EXPECT_EQ(layout.BarIn(kSecondRow).outline.top, 14 * 18 + 2 + 2);
  EXPECT_EQ(layout.Caption().y, 14 * 18);
  EXPECT_EQ(layout.BarArea().top, 14 * 17 + 2);
}

}  // namespace
}  // namespace report
