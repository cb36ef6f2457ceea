// What the judge sees and what it passes over, and how a walk's lines are read.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "targets/host/walk_line.h"
#include "targets/judge/comparable.h"
#include "targets/judge/compare.h"

namespace targets {
namespace {

TEST(JudgeTest, FindsNoDifferenceBetweenEqualRecords) {
  const Record record = {{"storage/a.txt", "one\ntwo\n"}, {"storage/Data/", ""}};
  EXPECT_EQ(Differences(record, record), "");
}

TEST(JudgeTest, ShowsTheFirstLineThatDiffersFromBothSides) {
  const std::string text = Differences({{"wire/requests-1", "GET a\nHost: x\n"}},
                                       {{"wire/requests-1", "GET a\nHost: y\n"}});
  EXPECT_EQ(text,
            "wire/requests-1, line 2, byte 12 (14 and 14 bytes)\n"
            "  linux: Host: x\\x0a\n  here:  Host: y\\x0a\n");
}

TEST(JudgeTest, ShowsWhereALongerPieceGoesOn) {
  EXPECT_EQ(Differences({{"a", "x"}}, {{"a", "xy"}}),
            "a, line 1, byte 1 (1 and 2 bytes)\n  linux: x\n  here:  xy\n");
}

TEST(JudgeTest, NamesPiecesThatOnlyOneSideHas) {
  EXPECT_EQ(Differences({{"a", ""}}, {{"b", "new"}}), "a is missing\nb is here only: new\n");
}

TEST(JudgeTest, TakesAllTimesOfDayForOne) {
  EXPECT_EQ(Comparable("at 2026/11/22:02:12:08, and 2026-11-22 02:12:09 again"),
            "at 20##/##/##:##:##:##, and 20##-##-## ##:##:## again");
  EXPECT_EQ(Comparable("200000 2026/11/22 20"), "200000 2026/11/22 20") << "no times";
}

host::WalkLine Read(const std::string& text) {
  host::WalkLine line;
  EXPECT_TRUE(host::ReadWalkLine(text, line)) << text;
  return line;
}

TEST(WalkLineTest, HasAVerbArgumentsAndWhatIsExpected) {
  const host::WalkLine line = Read("set \"Source\" \"a b.txt\" = ok \"\"  # remark");
  EXPECT_EQ(line.verb, "set");
  ASSERT_EQ(line.arguments.size(), 2U);
  EXPECT_EQ(line.arguments[1].text, "a b.txt");
  ASSERT_TRUE(line.expected.has_value());
  EXPECT_EQ(*line.expected, (std::vector<std::string>{"ok", ""}));
}

TEST(WalkLineTest, MayExpectNothingOrThatNothingCame) {
  EXPECT_FALSE(Read("log").expected.has_value());
  EXPECT_TRUE(Read("log =").expected.has_value());
  EXPECT_EQ(Read("").verb, "");
  EXPECT_EQ(Read("  # only a remark").verb, "");
}

TEST(WalkLineTest, RepeatsATextAndPassesNoText) {
  const host::WalkLine line = Read("set null \"ab\"*3");
  EXPECT_EQ(line.arguments[0].c_str(), nullptr);
  EXPECT_EQ(line.arguments[1].text, "ababab");
  EXPECT_FALSE(Read("begin \"null\"").arguments[0].is_null) << "a quoted one is a text";
  EXPECT_EQ(Read("set \"=\" \"=\"").arguments.size(), 2U);
}

TEST(WalkLineTest, IsRefusedWhenAQuotationOrACountDoesNotEnd) {
  host::WalkLine line;
  for (const char* text : {"begin \"a", "set \"a\"*", "set \"a\"*x", "set \"a\"*9999999"}) {
    EXPECT_FALSE(host::ReadWalkLine(text, line)) << text;
  }
}

}  // namespace
}  // namespace targets
