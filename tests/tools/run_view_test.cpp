#include "tools/run_view.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "server/scratch_folder.h"
#include "tools/device_table.h"
#include "tools/failure.h"
#include "tools/file_text.h"

namespace tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Lines = std::vector<std::string>;

TEST(NewLinesTest, FindsWhatCameAfterTheLinesThatWereKnown) {
  EXPECT_THAT(NewLines({}, {"a", "b"}), ElementsAre("a", "b"));
  EXPECT_THAT(NewLines({"a", "b"}, {"a", "b"}), IsEmpty());
  EXPECT_THAT(NewLines({"a", "b"}, {"a", "b", "c"}), ElementsAre("c"));
  EXPECT_THAT(NewLines({"a", "b"}, {}), IsEmpty());
}

TEST(NewLinesTest, FollowsAListThatHasMovedOn) {
  EXPECT_THAT(NewLines({"a", "b", "c"}, {"b", "c", "d"}), ElementsAre("d"));
  EXPECT_THAT(NewLines({"a", "b", "c"}, {"c", "d", "e"}), ElementsAre("d", "e"));
  EXPECT_THAT(NewLines({"a", "b", "c"}, {"x", "y", "z"}), ElementsAre("x", "y", "z"));
}

TEST(NewLinesTest, TakesARepeatedLineForANewOneOnlyWhenItMustBeOne) {
  EXPECT_THAT(NewLines({"a", "a"}, {"a", "a", "a"}), ElementsAre("a"));
  EXPECT_THAT(NewLines({"a", "b"}, {"b", "b"}), ElementsAre("b"));
}

TEST(FormatBarTest, FillsTheBarByUnits) {
  EXPECT_EQ(FormatBar({19, 38}, 10), "[#####.....]  50%");
  EXPECT_EQ(FormatBar({38, 38}, 10), "[##########] 100%");
  EXPECT_EQ(FormatBar({0, 48}, 4), "[....]   0%");
}

TEST(FormatBarTest, ShowsAScreenWithoutRoomForABarAsEmpty) {
  EXPECT_EQ(FormatBar({5, 0}, 4), "[....]   0%");
}

TEST(FormatBytesTest, UsesTheUnitThatLeavesAFewDigits) {
  EXPECT_EQ(FormatBytes(0), "0 B");
  EXPECT_EQ(FormatBytes(999), "999 B");
  EXPECT_EQ(FormatBytes(1024), "1.0 KiB");
  EXPECT_EQ(FormatBytes(41'943'040), "40.0 MiB");
  EXPECT_EQ(FormatBytes(std::uint64_t{5} << 30U), "5.0 GiB");
}

TEST(RunViewTest, RecordsEventsWhateverIsShown) {
  const ScratchFolder scratch;
  const auto file = scratch.path() / "events";
  {
    RunView view(RunView::Style::kPlain, file);
    view.ShowEvent({{"event", "started"}});
    sim::ProgressView progress;
    progress.status_lines = {"Validating files"};
    progress.overall = sim::BarView{19, 38};
    view.ShowProgress(progress);
    view.ShowRemark("not an event");
  }

  EXPECT_EQ(ReadWholeFile(file),
            "{\"event\":\"started\"}\n{\"event\":\"status\",\"text\":\"Validating files\"}\n"
            "{\"event\":\"progress\",\"overall\":50}\n");
  EXPECT_THROW(RunView(RunView::Style::kPlain, scratch.path() / "no/folder"), Failure);
}

/// What `show` makes a view of that style print.
std::string Printed(RunView::Style style, const std::function<void(RunView&)>& show) {
  testing::internal::CaptureStdout();
  RunView view(style);
  show(view);
  return testing::internal::GetCapturedStdout();
}

TEST(RunViewTest, PassesNoControlCharacterToTheTerminal) {
  const auto shown = [](const std::string& text) {
    return Printed(RunView::Style::kPlain, [&](RunView& view) { view.ShowRemark(text); });
  };
  EXPECT_EQ(shown("a\x1B[2Jb\x7Fz\r\n"), "a [2Jb z\n");
  EXPECT_EQ(shown("a\xC2\x9B"
                  "2Jb \xC2\x80\xC2\x9F."),
            "a  2Jb     .\n")
      << "those of two bytes, too";
  EXPECT_EQ(shown("\xC2\xA0 \xC3\x9F \xC2"), "\xC2\xA0 \xC3\x9F \xC2\n") << "letters stay";
}

Reception HalfOfAFile() {
  Reception reception;
  reception.file = "\\a.bin";
  reception.blocks = 4;
  reception.held = 2;
  reception.role = mcftp::Role::kNakMaster;
  reception.map = "#.#.";
  reception.under_way = true;
  return reception;
}

TEST(RunViewTest, ShowsTheBlockMapBesideTheUpperBarWhileAFileComes) {
  sim::ProgressView progress;
  progress.overall = sim::BarView{19, 38};
  progress.file = sim::BarView{0, 48};
  const std::string shown = Printed(RunView::Style::kTerminal, [&progress](RunView& view) {
    view.ShowProgress(progress);
    view.ShowBlocks(HalfOfAFile());
    view.ShowBlocks(HalfOfAFile());
    view.ShowBlocks({});
  });

  const std::string overall = "\r\x1b[Koverall [##########..........]  50%   ";
  EXPECT_EQ(shown, overall + "file [....................]   0%" + overall +
                       "nak master [#.#.] 2/4" + overall + "file [....................]   0%");
}

TEST(RunViewTest, TellsOfAMulticastInLinesOrInJson) {
  const auto show = [](RunView& view) {
    view.ShowMulticast({ReceptionStep::kRequested, HalfOfAFile(), {}});
    view.ShowBlocks(HalfOfAFile());
  };

  EXPECT_EQ(Printed(RunView::Style::kPlain, show), "multicast: asked for \\a.bin\n");
  EXPECT_EQ(Printed(RunView::Style::kJson, show),
            "{\"event\":\"multicast\",\"step\":\"requested\",\"file\":\"\\\\a.bin\","
            "\"role\":\"nak master\",\"held\":2,\"blocks\":4,\"twice\":0,\"map\":\"#.#.\"}\n"
            "{\"event\":\"blocks\",\"file\":\"\\\\a.bin\",\"role\":\"nak master\",\"held\":2,"
            "\"blocks\":4,\"map\":\"#.#.\"}\n");
}

TEST(RunViewTest, ShowsNothingOfTheDeviceAfterTheUpgradesEnd) {
  for (const auto style : {RunView::Style::kPlain, RunView::Style::kJson}) {
    EXPECT_EQ(Printed(style,
                      [](RunView& view) {
                        view.EndUpgrade();
                        view.ShowMessage({"TW_CLIENT", "late"});
                        sim::ProgressView progress;
                        progress.status_lines = {"late"};
                        view.ShowProgress(progress);
                        view.ShowMulticast({});
                        view.ShowBlocks(HalfOfAFile());
                      }),
              "");
  }
  EXPECT_THAT(Printed(RunView::Style::kPlain,
                      [](RunView& view) {
                        view.ShowMessage({"TW_CLIENT", "in time"});
                        view.EndUpgrade();
                        view.ShowRemark("the end");
                      }),
              "message to TW_CLIENT: in time\nthe end\n");
}

}  // namespace
}  // namespace tools
