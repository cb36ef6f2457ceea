// How a cursor moves.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "xml/xml_test.h"

namespace xml {
namespace {

class CursorWalkTest : public XmlTest {
 protected:
  CursorWalkTest() {
    EXPECT_EQ(Load("<a x='1'><b><c/><d/></b><e>t</e></a>"), XmlParseError::kNone);
  }
};

TEST_F(CursorWalkTest, BeginsAtTheRoot) {
  XmlCursor cursor;
  EXPECT_STREQ(cursor.Name(), "");
  ASSERT_TRUE(cursor.Attach(&document()));
  EXPECT_STREQ(cursor.Name(), "a");
  EXPECT_EQ(cursor.depth(), 0);
}

TEST_F(CursorWalkTest, DoesNotAttachToAnEmptyDocument) {
  XmlCursor cursor = AtRoot();
  XmlDocument empty;
  EXPECT_FALSE(cursor.Attach(&empty));
  EXPECT_FALSE(cursor.Attach(nullptr));
  EXPECT_STREQ(cursor.Name(), "a") << "the cursor stays where it was";
}

TEST_F(CursorWalkTest, IsNowhereAfterAReset) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.FirstChild());
  cursor.Reset();

  EXPECT_EQ(cursor.element(), nullptr);
  EXPECT_EQ(cursor.depth(), 0);
  EXPECT_STREQ(cursor.Name(), "");
  EXPECT_EQ(cursor.Text(), nullptr);
  EXPECT_EQ(cursor.Attribute("x"), nullptr);
  EXPECT_FALSE(cursor.FirstChild());
  EXPECT_FALSE(cursor.Parent());
  EXPECT_FALSE(cursor.BeginChildren());
  EXPECT_EQ(cursor.Next(), XmlStep::kOver);
  EXPECT_EQ(cursor.SetText("t"), nullptr);
  EXPECT_EQ(cursor.SetAttribute("x", "1"), nullptr);
  EXPECT_EQ(cursor.SetAttribute("x", nullptr), nullptr);
  for (int place = 0; place < 6; ++place) {
    EXPECT_FALSE(cursor.AddElement("n", static_cast<Place>(place)));
  }
}

TEST_F(CursorWalkTest, GoesDownAndUpAndCountsTheLevels) {
  XmlCursor cursor = AtRoot();
  EXPECT_FALSE(cursor.Parent()) << "the root has none";
  EXPECT_TRUE(cursor.FirstChild());
  EXPECT_TRUE(cursor.FirstChild());
  EXPECT_STREQ(cursor.Name(), "c");
  EXPECT_EQ(cursor.depth(), 2);
  EXPECT_FALSE(cursor.FirstChild());
  EXPECT_STREQ(cursor.Name(), "c") << "a failed move changes nothing";
  EXPECT_TRUE(cursor.Parent());
  EXPECT_TRUE(cursor.Parent());
  EXPECT_STREQ(cursor.Name(), "a");
  EXPECT_EQ(cursor.depth(), 0);
}

TEST_F(CursorWalkTest, StartsAndEndsEveryElementBelowOnce) {
  EXPECT_EQ(WalkOf(document()), "+b +c -c +d -d -b +e -e ");
}

TEST_F(CursorWalkTest, CoversOnlyWhatIsBelowTheElementWhereItBegan) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.FirstChild());
  ASSERT_TRUE(cursor.BeginChildren());
  EXPECT_STREQ(cursor.Name(), "c");
  EXPECT_EQ(cursor.Next(), XmlStep::kEnd);
  EXPECT_EQ(cursor.Next(), XmlStep::kStart);
  EXPECT_STREQ(cursor.Name(), "d");
  EXPECT_EQ(cursor.Next(), XmlStep::kEnd);
  EXPECT_EQ(cursor.Next(), XmlStep::kOver);
  EXPECT_STREQ(cursor.Name(), "b") << "back where it began";
  EXPECT_EQ(cursor.depth(), 1);
}

TEST_F(CursorWalkTest, WouldBeginAnewBehindItsEnd) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.BeginChildren());
  while (cursor.Next() != XmlStep::kOver) {
  }
  EXPECT_EQ(cursor.Next(), XmlStep::kStart);
  EXPECT_STREQ(cursor.Name(), "b");
}

TEST_F(CursorWalkTest, DoesNotBeginWithoutAChild) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.BeginChildren());   // the walk from a...
  ASSERT_TRUE(cursor.FirstChild());      // ...and by hand down to c
  EXPECT_FALSE(cursor.BeginChildren());  // which must not forget where the walk began

  std::vector<std::string> ends;
  for (XmlStep step = cursor.Next(); step != XmlStep::kOver; step = cursor.Next()) {
    if (step == XmlStep::kEnd) ends.emplace_back(cursor.Name());
  }
  EXPECT_EQ(ends, (std::vector<std::string>{"c", "d", "b", "e"}));
  EXPECT_STREQ(cursor.Name(), "a");
}

TEST_F(CursorWalkTest, IsOverAtTheRootWhenNoneWasBegun) {
  XmlCursor cursor = AtRoot();
  EXPECT_EQ(cursor.Next(), XmlStep::kOver) << "no sibling and no parent";
  EXPECT_STREQ(cursor.Name(), "a");
}

TEST_F(CursorWalkTest, ForgetsItsWalkWhenItIsAttachedAgain) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.FirstChild());
  ASSERT_TRUE(cursor.BeginChildren());
  ASSERT_TRUE(cursor.Attach(&document()));
  EXPECT_EQ(cursor.depth(), 0);
  EXPECT_EQ(cursor.Next(), XmlStep::kOver) << "nothing has been entered";
}

TEST_F(CursorWalkTest, IsAPlainValueThatRemembersAPlace) {
  XmlCursor cursor = AtRoot();
  const XmlCursor root = cursor;
  ASSERT_TRUE(cursor.FirstChild());
  EXPECT_STREQ(root.Name(), "a");
  cursor = root;
  EXPECT_STREQ(cursor.Name(), "a");
}

TEST_F(CursorWalkTest, ReadsTextsAndAttributes) {
  XmlCursor cursor = AtRoot();
  EXPECT_STREQ(cursor.Attribute("x"), "1");
  EXPECT_EQ(cursor.Attribute("X"), nullptr) << "letter case counts";
  EXPECT_EQ(cursor.Attribute(""), nullptr);
  EXPECT_EQ(cursor.Attribute(nullptr), nullptr);
  EXPECT_EQ(cursor.Text(), nullptr) << "it has children";
  ASSERT_EQ(Load("<a x='1' x='2'>t</a>"), XmlParseError::kNone);
  cursor = AtRoot();
  EXPECT_STREQ(cursor.Text(), "t");
  EXPECT_STREQ(cursor.Attribute("x"), "1") << "the first of the same name";
}

TEST_F(CursorWalkTest, WalksTheDeepestDocument) {
  ASSERT_EQ(Load(Nested(64, "<e/>")), XmlParseError::kNone);
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.BeginChildren());
  int starts = 1;
  int ends = 0;
  for (XmlStep step = cursor.Next(); step != XmlStep::kOver; step = cursor.Next()) {
    ++(step == XmlStep::kStart ? starts : ends);
  }
  EXPECT_EQ(starts, 64) << "63 below the root, and the empty one";
  EXPECT_EQ(ends, 64);
  EXPECT_EQ(cursor.depth(), 0);
}

TEST_F(CursorWalkTest, MeetsWhatIsAddedAheadOfItAndNothingBehind) {
  XmlCursor walk = AtRoot();
  std::string met;
  ASSERT_TRUE(walk.BeginChildren());
  for (XmlStep step = XmlStep::kStart; step != XmlStep::kOver; step = walk.Next()) {
    ASSERT_LT(met.size(), 100U);
    met += step == XmlStep::kStart ? "+" : "-";
    met += walk.Name();
    if (step != XmlStep::kStart) continue;
    XmlCursor edit = walk;  // the walk itself stays where it is
    const std::string name = walk.Name();
    if (name == "b") {
      EXPECT_TRUE(edit.AddElement("child", Place::kLastChild));
    } else if (name == "c") {
      EXPECT_TRUE(edit.AddElement("before", Place::kFirstSibling));
      EXPECT_TRUE(edit.AddElement("after", Place::kLastSibling));
    } else if (name == "e") {
      EXPECT_STREQ(edit.SetText("changed"), "changed");
      EXPECT_STREQ(walk.Text(), "changed");
      EXPECT_TRUE(edit.AddElement("next", Place::kAfter));
    }
  }
  EXPECT_EQ(met, "+b+c-c+d-d+child-child+after-after-b+e-e+next-next");
  EXPECT_EQ(Shape(document()), "a[x=1]{b{before c d child after} e|changed| next}");
}

TEST_F(CursorWalkTest, GoesOnFromAnElementThatItAdded) {
  XmlCursor cursor = AtRoot();
  ASSERT_TRUE(cursor.BeginChildren());
  ASSERT_TRUE(cursor.AddElement("new", Place::kAfter));  // b has started; now "new" has
  EXPECT_EQ(cursor.Next(), XmlStep::kEnd);
  EXPECT_STREQ(cursor.Name(), "new");
  EXPECT_EQ(cursor.Next(), XmlStep::kStart);
  EXPECT_STREQ(cursor.Name(), "e");
}

}  // namespace
}  // namespace xml
