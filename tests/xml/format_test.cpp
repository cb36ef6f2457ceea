// The style that a parsed text had.
#include <gtest/gtest.h>

#include <string>

#include "xml/parser.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

struct Style {
  const char* text;
  unsigned flags;
  const char* why;
};

TEST(SniffFormatTest, RecordsLineEndsIndentationAndByteOrderMark) {
  const Style styles[] = {
      {"", 0, "nothing"},
      {"<a><b/></a>", 0, "one line"},
      {"<a>\n<b/></a>", 1, "line feeds"},
      {"<a>\r\n<b/></a>", 1 + 2, "with carriage returns"},
      {"<a>\r<b/></a>", 0, "a carriage return alone is nothing"},
      {"<a>\r \n<b/></a>", 1, "only one directly before the line feed counts"},
      {"\n<a/>", 1, "the first byte has nothing before it"},
      {"<a>\n\t<b/></a>", 1 + 4, "tabs"},
      {"<a>\n <b/></a>", 1 + 8, "blanks"},
      {"<a>\n\n\t\r\n <b/></a>", 1 + 2 + 4 + 8, "all of them together"},
      {"<a>\t<b/> </a>", 0, "a tab or blank anywhere else is nothing"},
      {"\xEF\xBB\xBF<a/>", 16, "a byte-order mark"},
      {"\xEF\xBB", 0, "half a mark"},
      {" \xEF\xBB\xBF<a/>", 0, "only at the beginning"},
      {"\xEF\xBB\xBF\r\n\t", 16 + 1 + 2 + 4, "without an element the whole text is looked at"},
  };
  for (const Style& style : styles) EXPECT_EQ(SniffFormat(style.text), style.flags) << style.why;
}

TEST(SniffFormatTest, LooksOnlyUpToTheThirdElement) {
  const Style styles[] = {
      {"<a><b>\n</b></a>", 1, "behind the second"},
      {"<a><b><c>\n", 0, "behind the third"},
      {"<a></a></a>\n", 0, "end tags count"},
      {"<?x?><!x><!----><a><b>\n", 1, "declarations, comments and the like do not"},
      {"<!-- <a><b><c> -->\n", 0, "what looks like an element in a comment does"},
      {"<a x='<<'>\n", 0, "and in a value"},
  };
  for (const Style& style : styles) EXPECT_EQ(SniffFormat(style.text), style.flags) << style.why;
}

class FormatTest : public XmlTest {};

TEST_F(FormatTest, IsThatOfTheWholeTextEvenIfItIsRefused) {
  EXPECT_EQ(Load("<a>\r\n\t<b>"), XmlParseError::kNoTag);
  EXPECT_EQ(document().format_flags(), 1 + 2 + 4);
}

TEST_F(FormatTest, IsNoneForADocumentMadeByCalls) {
  ASSERT_EQ(Load("<a>\r\n\t<b/></a>"), XmlParseError::kNone);
  document().NewDocument("c");
  EXPECT_EQ(document().format_flags(), 0);
}

}  // namespace
}  // namespace xml
