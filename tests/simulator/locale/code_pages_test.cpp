#include "locale/code_pages.h"

#include <gtest/gtest.h>

#include <string>

namespace {

TEST(AnsiTest, EveryByteComesBackFromUtf16) {
  std::string all;
  for (int byte = 0; byte < 256; ++byte) all += static_cast<char>(byte);
  bool substituted = true;

  EXPECT_EQ(sim::ToAnsi(sim::FromAnsi(all), '?', substituted), all);
  EXPECT_FALSE(substituted);
}

TEST(AnsiTest, OnlyTheKnownUnitsHaveAByte) {
  int known = 0;
  for (char32_t unit = 0; unit < 0x10000; ++unit) {
    bool substituted = false;
    static_cast<void>(
        sim::ToAnsi(std::u16string(1, static_cast<char16_t>(unit)), '?', substituted));
    known += substituted ? 0 : 1;
  }
  EXPECT_EQ(known, 256);
}

TEST(Utf8Test, EveryCodePointComesBack) {
  for (char32_t point = 0; point < 0x110000; ++point) {
    if (point >= 0xD800 && point <= 0xDFFF) continue;
    std::u16string wide;
    if (point < 0x10000) {
      wide = static_cast<char16_t>(point);
    } else {
      wide = {static_cast<char16_t>(0xD800 + ((point - 0x10000) >> 10)),
              static_cast<char16_t>(0xDC00 + ((point - 0x10000) & 0x3FF))};
    }
    bool malformed = true;
    ASSERT_EQ(sim::FromUtf8(sim::ToUtf8(wide), malformed), wide) << std::hex << unsigned{point};
    ASSERT_FALSE(malformed);
  }
}

TEST(Utf8Test, ReplacesWhatIsMalformed) {
  struct Case {
    const char* text;
    const char16_t* wide;
    const char* why;
  };
  static constexpr Case kCases[] = {
      {"a\x80z", u"a\uFFFDz", "a following byte alone"},
      {"\xC0\x80", u"\uFFFD\uFFFD", "longer than needed"},
      {"\xE0\x80\x80", u"\uFFFD\uFFFD\uFFFD", "longer than needed"},
      {"\xED\xA0\x80", u"\uFFFD\uFFFD\uFFFD", "a surrogate"},
      {"\xF5\x80\x80\x80", u"\uFFFD\uFFFD\uFFFD\uFFFD", "beyond the last code point"},
      {"\xE2\x82", u"\uFFFD\uFFFD", "cut short"},
      {"\xE2z", u"\uFFFDz", "the next character is not swallowed"},
  };
  for (const Case& c : kCases) {
    bool malformed = false;
    EXPECT_EQ(sim::FromUtf8(c.text, malformed), c.wide) << c.why;
    EXPECT_TRUE(malformed) << c.why;
  }
}

TEST(Utf8Test, ReplacesLonelySurrogates) {
  EXPECT_EQ(sim::ToUtf8(std::u16string{0xD800, u'a'}),
            "\xEF\xBF\xBD"
            "a");
  EXPECT_EQ(sim::ToUtf8(std::u16string(1, 0xDFFF)), "\xEF\xBF\xBD");
  EXPECT_EQ(sim::ToUtf8(std::u16string(1, 0xD83D)), "\xEF\xBF\xBD");
}

}  // namespace
