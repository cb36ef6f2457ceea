// What a cursor changes.
#include <gtest/gtest.h>

#include <string>

#include "faults/faults.h"
#include "memory/memory.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

class CursorEditTest : public XmlTest {
 protected:
  /// A cursor at the root of that text.
  XmlCursor Edit(std::string_view text) {
    EXPECT_EQ(Load(text), XmlParseError::kNone);
    return AtRoot();
  }

  /// The strings that are added next need a block of their own, so that a copy can be seen.
  void FillStrings(XmlCursor cursor) {
    EXPECT_NE(cursor.SetAttribute("filler", std::string(5000, 'x').c_str()), nullptr);
    EXPECT_NE(cursor.SetAttribute("filler", nullptr), nullptr);
  }
};

TEST_F(CursorEditTest, SetsAText) {
  XmlCursor cursor = Edit("<a/>");
  char text[] = "<x>";
  const char* const stored = cursor.SetText(text);
  text[1] = 'y';

  EXPECT_STREQ(stored, "<x>") << "a copy";
  EXPECT_EQ(cursor.Text(), stored);
}

TEST_F(CursorEditTest, ReplacesAText) {
  XmlCursor cursor = Edit("<a>x</a>");
  EXPECT_STREQ(cursor.SetText("longer than before"), "longer than before");
  EXPECT_STREQ(cursor.Text(), "longer than before");
}

TEST_F(CursorEditTest, TakesATextAway) {
  XmlCursor cursor = Edit("<a>x</a>");
  EXPECT_STREQ(cursor.SetText(""), "");
  EXPECT_EQ(cursor.Text(), nullptr);
  ASSERT_NE(cursor.SetText("y"), nullptr);
  EXPECT_STREQ(cursor.SetText(nullptr), "");
  EXPECT_EQ(cursor.Text(), nullptr);
}

TEST_F(CursorEditTest, LeavesTheSameTextAlone) {
  XmlCursor cursor = Edit("<a>x</a>");
  const char* const before = cursor.Text();
  EXPECT_EQ(cursor.SetText("x"), before);
  EXPECT_EQ(cursor.Text(), before);
}

TEST_F(CursorEditTest, GivesNoTextToAnElementWithChildren) {
  XmlCursor cursor = Edit("<a><b/></a>");
  EXPECT_EQ(cursor.SetText("x"), nullptr);
  EXPECT_EQ(cursor.SetText(nullptr), nullptr);
  EXPECT_EQ(Shape(document()), "a{b}");
}

TEST_F(CursorEditTest, AddsAnAttributeBehindTheOthers) {
  XmlCursor cursor = Edit("<a x='1'/>");
  char name[] = "y";
  char value[] = "2";
  const char* const stored = cursor.SetAttribute(name, value);
  name[0] = value[0] = '!';

  EXPECT_STREQ(stored, "2");
  EXPECT_EQ(cursor.Attribute("y"), stored);
  EXPECT_STREQ(cursor.SetAttribute("z", ""), "") << "an empty value is one";
  EXPECT_STREQ(cursor.SetAttribute("", "4"), "4");
  EXPECT_EQ(Shape(document()), "a[x=1][y=2][z=][=4]");
}

TEST_F(CursorEditTest, ReplacesAValueInItsPlace) {
  XmlCursor cursor = Edit("<a x='1' y='2' x='3'/>");
  EXPECT_STREQ(cursor.SetAttribute("x", "9"), "9");
  EXPECT_EQ(Shape(document()), "a[x=9][y=2][x=3]") << "the first of the same name";
  EXPECT_STREQ(cursor.SetAttribute("X", "8"), "8");
  EXPECT_EQ(Shape(document()), "a[x=9][y=2][x=3][X=8]") << "letter case counts";
}

TEST_F(CursorEditTest, LeavesTheSameValueAlone) {
  XmlCursor cursor = Edit("<a x='1'/>");
  const char* const before = cursor.Attribute("x");
  EXPECT_EQ(cursor.SetAttribute("x", "1"), before);
  EXPECT_EQ(cursor.Attribute("x"), before);
}

TEST_F(CursorEditTest, NeedsNoMemoryWhereNothingChanges) {
  XmlCursor cursor = Edit("<a x='1'>t</a>");
  FillStrings(cursor);
  const std::size_t before = document().MemoryInUse();
  device().faults().Add({"LocalAlloc", 1, 0, 0});
  for (int i = 0; i < 1000; ++i) {
    EXPECT_STREQ(cursor.SetText("t"), "t");
    EXPECT_STREQ(cursor.SetAttribute("x", "1"), "1");
    EXPECT_STREQ(cursor.SetAttribute("y", nullptr), "");
  }
  EXPECT_EQ(document().MemoryInUse(), before);
}

TEST_F(CursorEditTest, TakesAnAttributeAway) {
  XmlCursor cursor = Edit("<a x='1' y='2' z='3' x='4'/>");
  EXPECT_STREQ(cursor.SetAttribute("y", nullptr), "");
  EXPECT_EQ(Shape(document()), "a[x=1][z=3][x=4]") << "from the middle";
  EXPECT_STREQ(cursor.SetAttribute("x", nullptr), "");
  EXPECT_EQ(Shape(document()), "a[z=3][x=4]") << "from the front, one at a time";
  EXPECT_STREQ(cursor.SetAttribute("x", nullptr), "");
  EXPECT_EQ(Shape(document()), "a[z=3]") << "from the end";
  EXPECT_STREQ(cursor.SetAttribute("none", nullptr), "");
  EXPECT_STREQ(cursor.SetAttribute("z", nullptr), "");
  EXPECT_EQ(Shape(document()), "a");
  EXPECT_STREQ(cursor.SetAttribute("x", "5"), "5");
  EXPECT_EQ(Shape(document()), "a[x=5]");
}

TEST_F(CursorEditTest, UsesAnAttributesRecordAgain) {
  XmlCursor cursor = Edit("<a x='1'/>");
  const XmlAttribute* const record = document().root()->first_attribute;
  cursor.SetAttribute("x", nullptr);
  cursor.SetAttribute("y", "2");
  EXPECT_EQ(document().root()->first_attribute, record);
}

TEST_F(CursorEditTest, TakesNoNameThatIsNull) {
  XmlCursor cursor = Edit("<a/>");
  EXPECT_EQ(cursor.SetAttribute(nullptr, "1"), nullptr);
  EXPECT_EQ(cursor.SetAttribute(nullptr, nullptr), nullptr);
  EXPECT_FALSE(cursor.AddElement(nullptr, Place::kLastChild));
  EXPECT_EQ(Shape(document()), "a");
}

TEST_F(CursorEditTest, AddsAnElementAtFivePlaces) {
  struct Case {
    Place place;
    const char* shape;
    std::uint16_t depth;
  };
  const Case cases[] = {
      {Place::kAfter, "a{b c{d} new e}", 1},       {Place::kFirstSibling, "a{new b c{d} e}", 1},
      {Place::kLastSibling, "a{b c{d} e new}", 1}, {Place::kFirstChild, "a{b c{new d} e}", 2},
      {Place::kLastChild, "a{b c{d new} e}", 2},
  };
  for (const Case& c : cases) {
    XmlCursor cursor = Edit("<a><b/><c><d/></c><e/></a>");
    ASSERT_TRUE(cursor.BeginChildren());
    while (std::string(cursor.Name()) != "c") ASSERT_NE(cursor.Next(), XmlStep::kOver);
    ASSERT_TRUE(cursor.AddElement("new", c.place));
    EXPECT_EQ(Shape(document()), c.shape);
    EXPECT_STREQ(cursor.Name(), "new") << "the cursor moves to it";
    EXPECT_EQ(cursor.depth(), c.depth);
  }
}

TEST_F(CursorEditTest, AddsTheFirstChildAtEitherPlace) {
  for (const Place place : {Place::kFirstChild, Place::kLastChild}) {
    XmlCursor cursor = Edit("<a>text</a>");
    ASSERT_TRUE(cursor.AddElement("new", place));
    EXPECT_EQ(Shape(document()), "a{new}") << "its parent's text is dropped";
    EXPECT_EQ(cursor.depth(), 1);
  }
}

TEST_F(CursorEditTest, GivesTheRootNoSiblings) {
  XmlCursor cursor = Edit("<a>text</a>");
  for (const Place place : {Place::kAfter, Place::kFirstSibling, Place::kLastSibling}) {
    EXPECT_FALSE(cursor.AddElement("new", place));
  }
  EXPECT_EQ(Shape(document()), "a|text|");
  EXPECT_STREQ(cursor.Name(), "a");
}

TEST_F(CursorEditTest, KnowsNoOtherPlaces) {
  XmlCursor cursor = Edit("<a><b/></a>");
  ASSERT_TRUE(cursor.FirstChild());
  EXPECT_FALSE(cursor.AddElement("new", static_cast<Place>(5)));
  EXPECT_FALSE(cursor.AddElement("new", static_cast<Place>(255)));
  EXPECT_EQ(Shape(document()), "a{b}");
}

TEST_F(CursorEditTest, BuildsADocumentByCalls) {
  ASSERT_NE(document().NewDocument("a"), nullptr);
  XmlCursor cursor = AtRoot();
  ASSERT_NE(cursor.SetAttribute("x", "1"), nullptr);
  ASSERT_TRUE(cursor.AddElement("b", Place::kLastChild));
  ASSERT_TRUE(cursor.AddElement("c", Place::kFirstChild));
  ASSERT_NE(cursor.SetText("t"), nullptr);
  ASSERT_TRUE(cursor.Parent());
  ASSERT_TRUE(cursor.AddElement("d", Place::kAfter));
  EXPECT_EQ(Shape(document()), "a[x=1]{b{c|t|} d}");
  EXPECT_EQ(WalkOf(document()), "+b +c -c -b +d -d ");
}

TEST_F(CursorEditTest, HangsElementsDeeperThanAnyTextMay) {
  ASSERT_NE(document().NewDocument("a"), nullptr);
  XmlCursor cursor = AtRoot();
  for (int level = 1; level <= 1000; ++level) {
    ASSERT_TRUE(cursor.AddElement("b", Place::kLastChild));
    EXPECT_EQ(cursor.depth(), level);
  }
}

TEST_F(CursorEditTest, ChangesNothingWithoutMemory) {
  XmlCursor cursor = Edit("<a x='1'>t</a>");
  const std::string large(100000, 'l');
  device().faults().Add({"LocalAlloc", 1, 0, 0});
  EXPECT_EQ(cursor.SetText(large.c_str()), nullptr);
  EXPECT_EQ(cursor.SetAttribute("x", large.c_str()), nullptr);
  EXPECT_EQ(cursor.SetAttribute("y", large.c_str()), nullptr);
  EXPECT_EQ(cursor.SetAttribute(large.c_str(), "1"), nullptr);
  EXPECT_FALSE(cursor.AddElement(large.c_str(), Place::kLastChild));
  EXPECT_STREQ(cursor.Name(), "a");
  EXPECT_EQ(cursor.depth(), 0);
  EXPECT_EQ(Shape(document()), "a[x=1]|t|") << "the text stays while there is no child";
}

TEST_F(CursorEditTest, ReportsEveryAllocationThatFailsWhileADocumentIsBuilt) {
  for (std::uint64_t nth = 1;; ++nth) {
    device().faults().Add({"LocalAlloc", nth, 1, 0});
    const std::uint64_t fired = device().faults().fired();
    bool built = document().NewDocument("a") != nullptr;
    XmlCursor cursor;
    built = cursor.Attach(&document()) && built;
    for (int i = 0; i < 40; ++i) {
      built = cursor.AddElement("element", Place::kLastChild) && built;
      built = cursor.SetAttribute("name", "value") != nullptr && built;
      built = cursor.SetText("text") != nullptr && built;
      cursor.Parent();
    }
    const bool failed = device().faults().fired() > fired;
    device().faults().Clear();
    EXPECT_EQ(built, !failed) << "allocation " << nth;
    EXPECT_EQ(Shape(document()).front(), document().root() == nullptr ? '-' : 'a');
    document().Clear();
    EXPECT_EQ(device().memory().live_blocks(), 0U);
    if (!failed) break;
  }
}

}  // namespace
}  // namespace xml
