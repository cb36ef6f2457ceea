#include "base/text.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace {

using base::FixedText;

TEST(CopyTextTest, TerminatesAndCutsAtTheCapacity) {
  char out[5] = {'#', '#', '#', '#', '#'};
  EXPECT_TRUE(base::CopyText<char>(out, 4, "abc"));
  EXPECT_STREQ(out, "abc");
  EXPECT_FALSE(base::CopyText<char>(out, 4, "abcd"));
  EXPECT_STREQ(out, "abc");
  EXPECT_EQ(out[4], '#');
}

TEST(CopyTextTest, WritesNothingIntoNoRoom) {
  char out = '#';
  EXPECT_FALSE(base::CopyText<char>(&out, 0, "a"));
  EXPECT_EQ(out, '#');
}

TEST(CopyTextTest, TakesATextThatOverlapsTheBuffer) {
  char out[8] = "abcdef";
  EXPECT_TRUE(base::CopyText<char>(out, sizeof out, std::string_view(out + 2)));
  EXPECT_STREQ(out, "cdef");
}

TEST(CopyTextTest, TakesAnEmptyViewWithoutAnAddress) {
  char out[3] = "ab";
  EXPECT_TRUE(base::CopyText<char>(out, sizeof out, std::string_view{}));
  EXPECT_STREQ(out, "");
}

TEST(CopyTextTest, KnowsTheSizeOfAnArray) {
  char out[3];
  EXPECT_FALSE(base::CopyText(out, "abc"));
  EXPECT_STREQ(out, "ab");
}

TEST(ViewTest, ReadsANullPointerAsAnEmptyText) {
  EXPECT_TRUE(base::View(nullptr).empty());
  EXPECT_EQ(base::View("ab"), "ab");
}

TEST(FieldViewTest, StopsAtTheTerminatorOrAtTheEndOfTheField) {
  const char terminated[4] = {'a', 0, 'b', 0};
  const char full[2] = {'a', 'b'};
  EXPECT_EQ(base::FieldView(terminated), "a");
  EXPECT_EQ(base::FieldView(full), "ab");
}

TEST(EqualIgnoringCaseTest, FoldsAsciiLettersOnly) {
  EXPECT_TRUE(base::EqualIgnoringCase("BaseURL", "bASEurl"));
  EXPECT_FALSE(base::EqualIgnoringCase("a", "ab"));
  EXPECT_FALSE(base::EqualIgnoringCase("@[", "`{")) << "neighbours of the letters are no letters";
  EXPECT_FALSE(base::EqualIgnoringCase("\xC4", "\xE4")) << "no letter of any code page";
}

TEST(StartsWithTest, ComparesCaseAndNeverReadsBehindTheText) {
  EXPECT_TRUE(base::StartsWith("RAM:os.bin", "RAM:"));
  EXPECT_FALSE(base::StartsWith("ram:os.bin", "RAM:"));
  EXPECT_FALSE(base::StartsWith("RA", "RAM:"));
  EXPECT_TRUE(base::StartsWith("", ""));
}

TEST(EndsWithTest, ComparesTheLastCharacters) {
  EXPECT_TRUE(base::EndsWith("a.rename", ".rename"));
  EXPECT_FALSE(base::EndsWith("rename", ".rename"));
  EXPECT_FALSE(base::EndsWith("a.RENAME", ".rename"));
}

TEST(FixedTextTest, KeepsWhatFitsAndSaysWhenItWasCut) {
  FixedText<4> text;
  EXPECT_TRUE(text.Assign("abc"));
  EXPECT_FALSE(text.Assign("defg"));
  EXPECT_EQ(text.view(), "def");
}

TEST(FixedTextTest, AppendsWithTheSameRule) {
  FixedText<6> text("ab");
  EXPECT_TRUE(text.Append("cd"));
  EXPECT_FALSE(text.Append("ef"));
  EXPECT_EQ(text.view(), "abcde");
  EXPECT_FALSE(text.Append("g"));
  EXPECT_TRUE(text.Append(""));
  EXPECT_EQ(text.size(), 5U);
}

TEST(FixedTextTest, StaysWithinItselfWhenItsStorageWasFilledWithoutATerminator) {
  FixedText<4> text;
  std::memset(text.data(), 'x', text.capacity());
  EXPECT_EQ(text.size(), 3U);
  EXPECT_EQ(text.view(), "xxx");
}

TEST(FixedTextTest, IsEmptyAtFirstAndWhenCleared) {
  FixedText<4> text;
  EXPECT_TRUE(text.empty());
  text.Assign("a");
  EXPECT_FALSE(text.empty());
  text.Clear();
  EXPECT_STREQ(text.c_str(), "");
}

TEST(FixedTextTest, HoldsWideTexts) {
  const base::WideChar name[] = {'a', 'b', 'c', 0};
  base::WideFixedText<3> text;
  EXPECT_FALSE(text.Assign(name));
  EXPECT_EQ(text.size(), 2U);
  EXPECT_EQ(text.c_str()[2], 0);
}

}  // namespace
