// Documents as text.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "faults/faults.h"
#include "memory/memory.h"
#include "xml/writer.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

const std::string kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";

class WriterTest : public XmlTest {
 protected:
  std::string Written() {
    std::uint32_t length = 0;
    const char* const text = Serialize(document(), &length);
    EXPECT_NE(text, nullptr);
    if (text == nullptr) return "";
    EXPECT_EQ(std::strlen(text), length);
    return {text, length};
  }

  /// What is written of a text, behind the declaration.
  std::string Rewritten(std::string_view text) {
    EXPECT_EQ(Load(text), XmlParseError::kNone) << text;
    const std::string written = Written();
    EXPECT_EQ(written.substr(0, kDeclaration.size()), kDeclaration);
    return written.substr(kDeclaration.size());
  }
};

TEST_F(WriterTest, WritesADocumentMadeByCallsOnOneLine) {
  ASSERT_NE(document().NewDocument("a"), nullptr);
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.AddElement("b", Place::kLastChild));
  ASSERT_NE(cursor.SetText("t"), nullptr);
  ASSERT_TRUE(cursor.AddElement("c", Place::kAfter));
  ASSERT_NE(cursor.SetAttribute("x", "1"), nullptr);
  EXPECT_EQ(Written(), R"(<?xml version="1.0" encoding="UTF-8"?><a><b>t</b><c x="1"/></a>)");
}

TEST_F(WriterTest, AlwaysWritesItsOwnDeclaration) {
  EXPECT_EQ(Rewritten("<a/>"), "<a/>");
  EXPECT_EQ(Rewritten("<?xml version='1.1' encoding='latin1'?><?more?><a/>"), "<a/>");
  EXPECT_EQ(kDeclaration.size(), 38U);
}

TEST_F(WriterTest, WritesTheDeclarationAloneOfADocumentWithoutARoot) {
  EXPECT_EQ(Written(), kDeclaration);
  ASSERT_EQ(Load("\xEF\xBB\xBF\r\n\t"), XmlParseError::kNoTag);
  EXPECT_EQ(Written(), "\xEF\xBB\xBF" + kDeclaration + "\r\n");
}

TEST_F(WriterTest, EscapesTheFiveCharactersInTextsAndValues) {
  EXPECT_EQ(Rewritten("<a x='&amp;&lt;&gt;&quot;&apos;'>&amp;&lt;&gt;\"'</a>"),
            "<a x=\"&amp;&lt;&gt;&quot;&apos;\">&amp;&lt;&gt;&quot;&apos;</a>");
  EXPECT_EQ(Rewritten("<a>it's</a>"), "<a>it&apos;s</a>");
  EXPECT_EQ(Rewritten("<a x='\"q\"'/>"), "<a x=\"&quot;q&quot;\"/>");
  EXPECT_EQ(Rewritten("<a>&#65;</a>"), "<a>&amp;#65;</a>") << "what was not decoded is a text";
  EXPECT_EQ(Rewritten("<a>\xE4\x01\xFF]]&gt;\t\r</a>"), "<a>\xE4\x01\xFF]]&gt;\t\r</a>");
}

TEST_F(WriterTest, WritesNamesAsTheyAre) {
  EXPECT_EQ(Rewritten("<a&'\" b&<='1'></a&'\">"), "<a&'\" b&<=\"1\"/>");
}

TEST_F(WriterTest, ClosesAnElementWithoutTextInItsTag) {
  EXPECT_EQ(Rewritten("<a x='1'></a>"), "<a x=\"1\"/>");
  XmlCursor cursor = AtRoot();
  ASSERT_NE(cursor.SetText("t"), nullptr);
  ASSERT_NE(cursor.SetText(""), nullptr);
  EXPECT_EQ(Written(), kDeclaration + "<a x=\"1\"/>");
  document().root()->text = "";
  EXPECT_EQ(Written(), kDeclaration + "<a x=\"1\"/>") << "an empty one is none";
}

TEST_F(WriterTest, WritesNoTextOfAnElementWithChildren) {
  ASSERT_EQ(Load("<a><b/></a>"), XmlParseError::kNone);
  document().root()->text = "text";
  EXPECT_EQ(Written(), kDeclaration + "<a><b/></a>");
}

TEST_F(WriterTest, WritesEveryStyleThatWasSeen) {
  struct Style {
    const char* before;  ///< how the parsed text was laid out
    const char* written;
    const char* why;
  };
  const Style styles[] = {
      {"<a><b>t</b><c/></a>", "<a><b>t</b><c/></a>", "one line"},
      {"<a>\n<b>t</b><c/></a>", "\n<a>\n<b>t</b>\n<c/>\n</a>", "line feeds without indentation"},
      {"<a>\r\n<b>t</b><c/></a>", "\r\n<a>\r\n<b>t</b>\r\n<c/>\r\n</a>", "CR LF"},
      {"<a>\n\t<b>t</b><c/></a>", "\n<a>\n\t<b>t</b>\n\t<c/>\n</a>", "tabs"},
      {"<a>\r\n\t\t<b>t</b><c/></a>", "\r\n<a>\r\n\t<b>t</b>\r\n\t<c/>\r\n</a>",
       "one tab a level, whatever there was"},
      {"<a>\n    <b>t</b><c/></a>", "\n<a>\n <b>t</b>\n <c/>\n</a>",
       "one blank a level, whatever there was"},
      {"\n <a>\n\t<b>t</b><c/></a>", "\n<a>\n\t<b>t</b>\n\t<c/>\n</a>",
       "tabs win where both were seen"},
  };
  for (const Style& style : styles) EXPECT_EQ(Rewritten(style.before), style.written) << style.why;
}

TEST_F(WriterTest, WritesAByteOrderMarkOnlyWhereOneWas) {
  ASSERT_EQ(Load("\xEF\xBB\xBF<a/>"), XmlParseError::kNone);
  EXPECT_EQ(Written(), "\xEF\xBB\xBF" + kDeclaration + "<a/>");
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  EXPECT_EQ(Written(), kDeclaration + "<a/>");
}

TEST_F(WriterTest, IndentsEveryLevelByOne) {
  EXPECT_EQ(Rewritten("\n\t<a><b><c><d/></c></b><e/></a>"),
            "\n<a>\n\t<b>\n\t\t<c>\n\t\t\t<d/>\n\t\t</c>\n\t</b>\n\t<e/>\n</a>");
}

TEST_F(WriterTest, IndentsTheDeepestDocumentThatCanBeParsed) {
  for (const char indentation : {'\t', ' '}) {
    const std::string written = Rewritten("\n" + std::string(1, indentation) + Nested(64, "<e/>"));
    EXPECT_NE(written.find("\n" + std::string(64, indentation) + "<e/>"), std::string::npos);
    EXPECT_NE(written.find("\n" + std::string(63, indentation) + "</n>"), std::string::npos);
  }
}

TEST_F(WriterTest, IndentsNoFurtherThanThat) {
  ASSERT_EQ(Load("\r\n\t" + Nested(64, "<e/>")), XmlParseError::kNone);
  XmlCursor cursor = AtRoot();
  while (cursor.FirstChild()) {
  }
  for (int level = 65; level < 100; ++level) ASSERT_TRUE(cursor.AddElement("f", Place::kLastChild));
  const std::string written = Written();
  EXPECT_NE(written.find("\r\n" + std::string(64, '\t') + "<f/>"), std::string::npos);
  EXPECT_EQ(written.find(std::string(65, '\t')), std::string::npos);
}

TEST_F(WriterTest, EndsWithTheRootsEndTag) {
  const std::string written = Rewritten("<a>\r\n<b/>\r\n</a>\r\n\r\n");
  EXPECT_EQ(written.substr(written.size() - 4), "</a>");
}

TEST_F(WriterTest, AllocatesOnceAndExactly) {
  ASSERT_EQ(Load("<a x='&lt;'>" + std::string(3000, '\'') + "</a>"), XmlParseError::kNone);
  const std::uint64_t allocations = Allocations();
  const std::uint64_t before = device().memory().live_bytes();
  const std::string written = Written();

  EXPECT_EQ(written.size(), kDeclaration.size() + 3000 * 6 + 16);
  EXPECT_EQ(Allocations() - allocations, 1U);
  EXPECT_EQ(device().memory().live_bytes() - before, written.size() + 1);
}

TEST_F(WriterTest, FreesTheEarlierOutputFirst) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  const std::size_t blocks = device().memory().live_blocks();
  const std::string first = Written();
  EXPECT_EQ(Written(), first);
  EXPECT_EQ(device().memory().live_blocks(), blocks + 1);
}

TEST_F(WriterTest, SaysTheLengthEvenWithoutMemory) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  ASSERT_NE(Serialize(document()), nullptr);
  device().faults().Add({"LocalAlloc", 1, 1, 0});
  std::uint32_t length = 0;
  EXPECT_EQ(Serialize(document(), &length), nullptr);
  EXPECT_EQ(length, 42U);
  EXPECT_EQ(document().output().length, 42U);
  EXPECT_EQ(device().memory().live_blocks(), 2U) << "the earlier output is gone all the same";
  EXPECT_EQ(Written().size(), 42U);
}

/// Collects the pieces that the writer hands out.
std::vector<std::string>& Pieces() {
  static std::vector<std::string> pieces;
  return pieces;
}
void Collect(XmlDocument& /*document*/, const char* bytes, std::uint32_t length) noexcept {
  Pieces().emplace_back(bytes, length);
}

TEST_F(WriterTest, HandsTheSamePiecesToAnySink) {
  ASSERT_EQ(Load("<a x='1&amp;2'>\r\n\t<b>some text without anything special</b></a>"),
            XmlParseError::kNone);
  Pieces().clear();
  document().output().sink = Collect;
  WriteToSink(document());

  std::string whole;
  for (const std::string& piece : Pieces()) whole += piece;
  EXPECT_NE(std::find(Pieces().begin(), Pieces().end(), "some text without anything special"),
            Pieces().end())
      << "a run without special characters is one piece";
  for (const std::string& piece : Pieces()) EXPECT_FALSE(piece.empty());
  EXPECT_EQ(Written(), whole);
}

/// Another sink that hands on what it gets, so that the sinks of the library see every piece.
XmlSink handed_on_to = nullptr;
void HandOn(XmlDocument& document, const char* bytes, std::uint32_t length) noexcept {
  handed_on_to(document, bytes, length);
}

TEST_F(WriterTest, CountsAndCopiesTheSameInOnePieceOrMany) {
  ASSERT_EQ(Load("\xEF\xBB\xBF<a x='&lt;'>\r\n\t<b>it's</b></a>"), XmlParseError::kNone);
  const std::string written = Written();
  XmlOutput& output = document().output();
  for (const bool one_by_one : {false, true}) {
    handed_on_to = CountingSink;
    output.sink = one_by_one ? HandOn : CountingSink;
    output.length = 5;
    WriteToSink(document());
    EXPECT_EQ(output.length, 5 + written.size()) << "it adds to what is there";

    std::string copy(written.size() + 1, '#');
    handed_on_to = CopyingSink;
    output.sink = one_by_one ? HandOn : CopyingSink;
    output.position = copy.data();
    WriteToSink(document());
    EXPECT_EQ(copy, written + "#") << "nothing behind it";
    EXPECT_EQ(output.position, copy.data() + written.size());
  }
}

TEST_F(WriterTest, CountsNoFurtherThanThirtyTwoBits) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  for (const XmlSink sink : {XmlSink{CountingSink}, XmlSink{HandOn}}) {
    handed_on_to = CountingSink;
    document().output().sink = sink;
    document().output().length = UINT32_MAX - 10;
    WriteToSink(document());
    EXPECT_EQ(document().output().length, UINT32_MAX);
  }
}

TEST_F(WriterTest, WritesNothingWithoutASink) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  WriteToSink(document());
  EXPECT_EQ(document().output().length, 0U);
}

TEST_F(WriterTest, LeavesTheSinkToItsOwner) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  const std::string written = Written();
  WriteToSink(document());  // no sink: nothing may follow the text that was serialised
  EXPECT_EQ(document().output().sink, nullptr);
  EXPECT_EQ(document().output().position, nullptr);

  document().output().sink = Collect;
  EXPECT_EQ(Written(), written);
  Pieces().clear();
  WriteToSink(document());
  EXPECT_FALSE(Pieces().empty());

  document().Clear();
  Pieces().clear();
  WriteToSink(document());
  EXPECT_EQ(Pieces(), std::vector<std::string>{kDeclaration}) << "the sink outlives the document";
}

TEST_F(WriterTest, CopiesNothingToNowhere) {
  ASSERT_EQ(Load("<a/>"), XmlParseError::kNone);
  XmlOutput& output = document().output();
  std::string copy(42, '#');
  output.sink = CopyingSink;
  output.position = copy.data();
  const std::string written = Written();
  EXPECT_EQ(output.position, copy.data()) << "serialising has a place of its own";
  WriteToSink(document());
  EXPECT_EQ(copy, written);

  ASSERT_NE(document().NewDocument("b"), nullptr);
  EXPECT_EQ(output.sink, CopyingSink);
  WriteToSink(document());
  EXPECT_EQ(output.position, nullptr);
}

TEST_F(WriterTest, CountsWhereTheErrorsPlaceWas) {
  ASSERT_EQ(Load("<a>"), XmlParseError::kNoTag);
  EXPECT_EQ(document().error_offset(), 3U);
  ASSERT_NE(Serialize(document()), nullptr);
  EXPECT_EQ(document().error_offset(), 38U) << "the declaration's length";
}

TEST_F(WriterTest, WritesEmptyNamesThatCannotBeReadAgain) {
  EXPECT_EQ(Rewritten("<a><></></a>"), "<a></></a>");
  EXPECT_EQ(Load("<a></></a>"), XmlParseError::kWrongEndTag);
}

}  // namespace
}  // namespace xml
