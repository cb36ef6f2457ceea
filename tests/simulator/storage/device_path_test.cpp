#include "storage/device_path.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "text/names.h"

namespace {

using Names = std::vector<std::u16string>;

Names NamesOf(const WCHAR* text) {
  sim::DevicePath path;
  EXPECT_EQ(sim::ParsePath(text, false, path), DWORD{ERROR_SUCCESS});
  return path.names;
}

TEST(ParsePathTest, TakesSeveralBackslashesForOneAndNeedsNoLeadingOne) {
  EXPECT_EQ(NamesOf(u"\\a\\b"), (Names{u"a", u"b"}));
  EXPECT_EQ(NamesOf(u"\\\\a\\\\\\b"), (Names{u"a", u"b"}));
  EXPECT_EQ(NamesOf(u"a\\b"), (Names{u"a", u"b"}));
  EXPECT_EQ(NamesOf(u"\\"), Names{});
  EXPECT_EQ(NamesOf(u"\\a b.c. "), (Names{u"a b.c. "}));
}

TEST(ParsePathTest, RemembersAClosingBackslash) {
  sim::DevicePath path;
  ASSERT_EQ(sim::ParsePath(u"\\a\\", false, path), DWORD{ERROR_SUCCESS});
  EXPECT_TRUE(path.closed);
  ASSERT_EQ(sim::ParsePath(u"\\a", false, path), DWORD{ERROR_SUCCESS});
  EXPECT_FALSE(path.closed);
}

TEST(ParsePathTest, RefusesWhatCannotBeAName) {
  sim::DevicePath path;
  EXPECT_EQ(sim::ParsePath(nullptr, false, path), DWORD{ERROR_INVALID_PARAMETER});
  EXPECT_EQ(sim::ParsePath(u"", false, path), DWORD{ERROR_PATH_NOT_FOUND});
  for (const WCHAR* text :
       {u"\\.", u"\\..", u"\\a\\..\\b", u"..\\..\\etc", u"\\a/b", u"/etc/passwd", u"\\a:b",
        u"C:\\a", u"\\a\"", u"\\a<", u"\\a>", u"\\a|", u"\\a*", u"\\a?", u"\\a\x01", u"\\a\n"}) {
    EXPECT_EQ(sim::ParsePath(text, false, path), DWORD{ERROR_INVALID_NAME})
        << sim::ToHostText(text);
  }
}

TEST(ParsePathTest, RefusesAPathThatIsTooLongWithoutReadingItToItsEnd) {
  sim::DevicePath path;
  const std::vector<WCHAR> endless(MAX_PATH, u'a');  // no zero anywhere

  EXPECT_EQ(sim::ParsePath(endless.data(), false, path), DWORD{ERROR_FILENAME_EXCED_RANGE});

  const std::u16string longest(MAX_PATH - 1, u'a');
  EXPECT_EQ(sim::ParsePath(longest.c_str(), false, path), DWORD{ERROR_SUCCESS});
}

TEST(ParsePathTest, AllowsWildCardsInTheLastNameOnlyAndWhenAskedTo) {
  sim::DevicePath path;
  EXPECT_EQ(sim::ParsePath(u"\\a\\*.?", true, path), DWORD{ERROR_SUCCESS});
  EXPECT_EQ(sim::ParsePath(u"\\*\\a", true, path), DWORD{ERROR_INVALID_NAME});
  EXPECT_EQ(sim::ParsePath(u"\\..", true, path), DWORD{ERROR_INVALID_NAME});
}

TEST(MatchesWildCardsTest, MatchesAsTheDeviceDoes) {
  const struct {
    const char16_t* name;
    const char16_t* pattern;
    bool matches;
    const char* why;
  } kCases[] = {
      {u"a.txt", u"*.*", true, "all names"},
      {u"a", u"*.*", true, "also without a dot"},
      {u"a", u"*", true, "all names"},
      {u"A.TXT", u"a.txt", true, "case does not count"},
      {u"a.txt", u"*.txt", true, "a star takes what is in front"},
      {u"a.txt.bak", u"*.txt", false, "and the rest must fit"},
      {u"a.txt.txt", u"*.txt", true, "the last dot counts"},
      {u"a.txt", u"?.txt", true, "a question mark takes one"},
      {u".txt", u"?.txt", false, "and not none"},
      {u"abc", u"a*c*", true, "a star may take nothing"},
      {u"abc", u"", false, "nothing matches only nothing"},
      {u"aaaaaaaaab", u"*a*a*a*a*c", false, "and comes to an end soon"},
  };
  for (const auto& c : kCases) {
    EXPECT_EQ(sim::MatchesWildCards(c.name, c.pattern), c.matches)
        << sim::ToHostText(c.name) << " on " << sim::ToHostText(c.pattern) << ": " << c.why;
  }
}

TEST(MatchesWildCardsTest, IsQuickOnAHostilePattern) {
  std::u16string pattern;
  for (int i = 0; i < 100; ++i) pattern += u"*a";

  EXPECT_FALSE(sim::MatchesWildCards(std::u16string(255, u'a') + u"b", pattern + u"c"));
}

TEST(ToHostTextTest, GivesEveryTextOneSpellingThatComesBack) {
  for (const std::u16string& text :
       {std::u16string(u"plain"), std::u16string(u"\xE4\x20AC"), std::u16string(u"\xD83D\xDE00"),
        std::u16string(u"\xD800"), std::u16string(u"\xDC00\xD800"), std::u16string(u"x\xD800y")}) {
    std::u16string back;
    ASSERT_TRUE(sim::FromHostText(sim::ToHostText(text), back));
    EXPECT_EQ(back, text);
  }
}

TEST(FromHostTextTest, RefusesBytesThatHaveAnotherSpelling) {
  std::u16string text;
  for (const std::string& bytes :
       {std::string("\xFF"), std::string("\xC0\xAF"), std::string("\xE0\x80\xAF"),
        std::string("\xF4\x90\x80\x80"), std::string("\xE2\x82"), std::string("\x80"),
        std::string("\xED\xA0\xBD\xED\xB8\x80")}) {  // a pair in six bytes
    EXPECT_FALSE(sim::FromHostText(bytes, text));
  }
}

TEST(SameNameTest, FoldsLettersBeyondAsciiToo) {
  EXPECT_TRUE(sim::SameName(u"\xC4\xD6\xDC", u"\xE4\xF6\xFC"));
  EXPECT_TRUE(sim::SameName(u"\x391\x3A9", u"\x3B1\x3C9"));
  EXPECT_TRUE(sim::SameName(u"\x410\x401", u"\x430\x451"));
  EXPECT_TRUE(sim::SameName(u"\x141", u"\x142"));
  EXPECT_FALSE(sim::SameName(u"\xD7", u"\xF7")) << "two signs, no letters";
  EXPECT_FALSE(sim::SameName(u"a", u"ab"));
}

}  // namespace
