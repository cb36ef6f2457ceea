// Pictures of the window, compared pixel by pixel. A picture that differs is written next to the
// test's output as actual-<name>.png; when the change is meant, look at it and put it into golden/.
#include "window_fixture.h"

namespace report {
namespace {

void ExpectPicture(const sim::Image& actual, const std::string& name) {
  const std::filesystem::path golden =
      std::filesystem::path(ORVENIX_TESTS_FOLDER) / "report/window/golden" / (name + ".png");
  sim::Image expected;
  std::string error;
  const bool read = ReadPng(golden, expected, error);
  EXPECT_TRUE(read) << error;
  if (read && actual == expected) return;
  const std::filesystem::path saved = "actual-" + name + ".png";
  EXPECT_TRUE(WritePng(actual, saved, error)) << error;
  ADD_FAILURE() << "the window looks different: compare " << std::filesystem::absolute(saved)
                << " with " << golden;
}

/// What an upgrade says while it runs; the list is full after sixteen of them.
void SayWhatAnUpgradeSays(int lines) {
  static const char* const kLines[] = {
      "Cleaning device...",      "Processing OS files",
      "Processing INF files...", "Getting \\Flash File Store\\Tarnwell\\readme.txt",
      "Processing misc files",   "Validating 24 files",
  };
  for (int i = 0; i < lines; ++i) ShowStatus("%d %s", i + 1, kLines[i % 6]);
}

#define SKIP_WITHOUT_PICTURES()                                    \
  if (!sim::HavePictures()) {                                      \
    GTEST_SKIP() << "this build of the simulator has no pictures"; \
  }                                                                \
  static_assert(true, "")

class GoldenTest : public ProgressWindowTest {};
class SmallGoldenTest : public SmallProgressWindowTest {};

TEST_F(GoldenTest, TheNormalLayoutLooksAsItDid) {
  SKIP_WITHOUT_PICTURES();
  Start();
  SayWhatAnUpgradeSays(6);
  SetOverallProgress(50);
  SetFileProgress(25);
  Settle();

  ExpectPicture(screen().Snapshot(), "normal");
}

TEST_F(GoldenTest, AFullListLooksAsItDid) {
  SKIP_WITHOUT_PICTURES();
  Start();
  SayWhatAnUpgradeSays(17);
  SetOverallProgress(100);
  SetFileProgress(100);
  Settle();

  ExpectPicture(screen().Snapshot(), "full_list");
}

TEST_F(GoldenTest, TheCaptionLooksAsItDid) {
  SKIP_WITHOUT_PICTURES();
  ShowCaption("Corvanta", "MR700123");
  Start();
  SayWhatAnUpgradeSays(3);
  SetOverallProgress(75);
  Settle();

  ExpectPicture(screen().Snapshot(), "caption");
}

TEST_F(SmallGoldenTest, TheSmallLayoutLooksAsItDid) {
  SKIP_WITHOUT_PICTURES();
  Start();
  SayWhatAnUpgradeSays(7);
  SetOverallProgress(50);
  SetFileProgress(25);
  Settle();

  ExpectPicture(screen().Snapshot(), "small");
}

TEST_F(SmallGoldenTest, TheSmallCaptionLooksAsItDid) {
  SKIP_WITHOUT_PICTURES();
  ShowCaption("Corvanta", "MR700123");
  Start();
  SayWhatAnUpgradeSays(8);
  SetOverallProgress(99);
  Settle();

  ExpectPicture(screen().Snapshot(), "small_caption");
}

TEST_F(GoldenTest, BarsThatGrewStepByStepLookLikeBarsDrawnAtOnce) {
  Start();
  for (int percent = 0; percent <= 60; ++percent) {
    SetOverallProgress(percent);
    SetFileProgress(100 - percent);
    Settle();
  }
  const sim::Image grown = screen().Snapshot();

  RepaintWindow();
  Settle();

  EXPECT_EQ(screen().Snapshot(), grown);
}

}  // namespace
}  // namespace report
