#include "window/image.h"

#include <gtest/gtest.h>

#include <fstream>
#include <string>

#include "support/device_test.h"
#include "window/font.h"

namespace sim {
namespace {

constexpr COLORREF kInk = RGB(10, 20, 30);
constexpr COLORREF kPaper = RGB(255, 255, 255);

/// The rectangle around all pixels of the ink.
RECT Inked(const Image& image) {
  RECT found = {};
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (image.At(x, y) == kInk) found = Around(found, {x, y, x + 1, y + 1});
    }
  }
  return found;
}

int CountInked(const Image& image) {
  int count = 0;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) count += image.At(x, y) == kInk ? 1 : 0;
  }
  return count;
}

void ExpectArea(const RECT& actual, const RECT& expected) {
  EXPECT_EQ(actual.left, expected.left);
  EXPECT_EQ(actual.top, expected.top);
  EXPECT_EQ(actual.right, expected.right);
  EXPECT_EQ(actual.bottom, expected.bottom);
}

TEST(ImageTest, KeepsRedGreenAndBlueInThisOrder) {
  const Image image(2, 1, RGB(1, 2, 3));

  EXPECT_EQ(image.rgb, (std::vector<std::uint8_t>{1, 2, 3, 1, 2, 3}));
  EXPECT_EQ(image.At(1, 0), RGB(1, 2, 3));
  EXPECT_EQ(image.At(2, 0), 0U) << "outside";
}

TEST(ImageTest, FillsWithinClipAndPictureOnly) {
  Image image(10, 10, kPaper);

  Fill(image, {2, 2, 20, 20}, {-5, -5, 5, 50}, kInk);

  ExpectArea(Inked(image), {2, 2, 5, 10});
  EXPECT_EQ(CountInked(image), 3 * 8);
}

TEST(ImageTest, AnOutlineIsTheInnerEdge) {
  Image image(10, 10, kPaper);

  Outline(image, image.area(), {1, 1, 6, 5}, kInk);

  ExpectArea(Inked(image), {1, 1, 6, 5});
  EXPECT_EQ(CountInked(image), 2 * 5 + 2 * 2);
  Outline(image, image.area(), {8, 8, 8, 9}, kInk);
  EXPECT_EQ(CountInked(image), 2 * 5 + 2 * 2) << "an empty rectangle has no edge";
}

TEST(ImageTest, AThinLineLeavesItsLastPointOut) {
  Image image(10, 10, kPaper);

  Line(image, image.area(), {2, 3}, {6, 3}, 1, kInk);

  ExpectArea(Inked(image), {2, 3, 6, 4});
}

TEST(ImageTest, AWideLineStandsHalfAPixelUpAndHasFlatEnds) {
  Image image(40, 40, kPaper);

  Line(image, image.area(), {5, 20}, {15, 20}, 8, kInk);

  ExpectArea(Inked(image), {5, 16, 15, 24});
  EXPECT_EQ(CountInked(image), 10 * 8);
}

TEST(ImageTest, ALinesDirectionDoesNotMoveItAcross) {
  Image image(40, 40, kPaper);
  Line(image, image.area(), {15, 20}, {5, 20}, 8, kInk);
  ExpectArea(Inked(image), {6, 16, 16, 24});

  Image upright(40, 40, kPaper);
  Line(upright, upright.area(), {20, 5}, {20, 15}, 8, kInk);
  ExpectArea(Inked(upright), {16, 5, 24, 15});
  Image back(40, 40, kPaper);
  Line(back, back.area(), {20, 15}, {20, 5}, 8, kInk);
  ExpectArea(Inked(back), {16, 6, 24, 16});
}

TEST(ImageTest, LinesFarOutsideTakeNoTimeAndNoMemory) {
  Image image(10, 10, kPaper);

  Line(image, image.area(), {-2000000000, 5}, {2000000000, 5}, 2000000000, kInk);
  Line(image, image.area(), {-2000000000, -2000000000}, {2000000000, 2000000000}, 1, kInk);

  EXPECT_EQ(CountInked(image), 100) << "the wide one covers everything";
}

TEST(ImageTest, TextIsWrittenFromItsUpperLeftCornerAndClipped) {
  Image image(30, 20, kPaper);
  const auto font = MakeBitmapFont();

  const int width = Text(image, image.area(), *font, {{2, 3}, u"Il", nullptr, kInk});

  EXPECT_EQ(width, 2 * 6);
  // The letters' first row is 3 below the line's top: an ascent of 10, 7 of them inked.
  ExpectArea(Inked(image), {3, 6, 12, 13});
  Image clipped(30, 20, kPaper);
  Text(clipped, {0, 0, 5, 8}, *font, {{2, 3}, u"Il", nullptr, kInk});
  ExpectArea(Inked(clipped), {3, 6, 5, 8});
}

TEST(ImageTest, SpacingReplacesTheFontsAdvance) {
  Image image(60, 20, kPaper);
  const auto font = MakeBitmapFont();
  const INT spacing[] = {30, 4};

  EXPECT_EQ(Text(image, image.area(), *font, {{0, 0}, u"II", spacing, kInk}), 34);
  EXPECT_EQ(image.At(2 + 30, 5), kInk);
}

TEST(BitmapFontTest, HasEveryAsciiCharacterAndABoxForTheRest) {
  const auto font = MakeBitmapFont();

  for (char16_t unit = u'!'; unit <= u'~'; ++unit) {
    const Glyph& glyph = font->GlyphOf(unit);
    int pixels = 0;
    for (const std::uint8_t coverage : glyph.coverage) pixels += coverage != 0 ? 1 : 0;
    EXPECT_GT(pixels, 0) << "character " << static_cast<int>(unit);
    EXPECT_EQ(glyph.advance, 6);
  }
  EXPECT_EQ(font->GlyphOf(u'\u00e4').coverage, font->GlyphOf(u'\x01').coverage);
  EXPECT_NE(font->GlyphOf(u'\u00e4').coverage, font->GlyphOf(u'a').coverage);
}

TEST(SystemFontTest, LeavesRoomForSixteenLinesAndTwoBarsOnASmallScreen) {
  const auto font = MakeSystemFont();
  const FontMetrics& metrics = font->metrics();

  EXPECT_EQ(metrics.height, 13);
  EXPECT_EQ(metrics.ascent + metrics.descent, metrics.height);
  EXPECT_EQ(metrics.internal_leading, 2);
  EXPECT_EQ(metrics.external_leading, 0);
  EXPECT_EQ(metrics.average_width, 6);
  EXPECT_LE((metrics.height + metrics.external_leading) * 19, 320);
}

TEST(SystemFontTest, IsInkOrNothing) {
  const auto font = MakeSystemFont();

  for (const char16_t unit : std::u16string_view(u"Orvenix 0123 %\u00e4\u20ac")) {
    for (const std::uint8_t coverage : font->GlyphOf(unit).coverage) {
      EXPECT_TRUE(coverage == 0 || coverage == 255);
    }
  }
}

TEST(PngTest, GivesBackThePictureThatWasSaved) {
  if (!HavePictures()) GTEST_SKIP() << "this build of the simulator has no pictures";
  const test::TemporaryFolder folder;
  Image image(7, 5, RGB(200, 100, 50));
  Fill(image, image.area(), {1, 1, 3, 4}, kInk);
  std::string error;

  ASSERT_TRUE(WritePng(image, folder.path() / "a.png", error)) << error;
  Image read;
  ASSERT_TRUE(ReadPng(folder.path() / "a.png", read, error)) << error;

  EXPECT_EQ(read, image);
}

TEST(PngTest, SaysWhichFileIsAtFault) {
  const test::TemporaryFolder folder;
  const auto text = folder.path() / "text.png";
  std::ofstream(text) << "no picture";
  Image image(3, 3, kPaper);
  std::string error;

  EXPECT_FALSE(ReadPng(text, image, error));
  EXPECT_NE(error.find("text.png"), std::string::npos) << error;
  EXPECT_FALSE(ReadPng(folder.path() / "missing.png", image, error));
  EXPECT_NE(error.find("missing.png"), std::string::npos) << error;
  EXPECT_EQ(image, Image(3, 3, kPaper)) << "the picture stays";
  EXPECT_FALSE(WritePng(image, folder.path() / "no folder" / "a.png", error));
  EXPECT_NE(error.find("no folder"), std::string::npos) << error;
}

}  // namespace
}  // namespace sim
