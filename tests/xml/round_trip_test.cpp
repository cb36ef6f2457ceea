// A text in one of the writer's styles comes back byte for byte.
#include <gtest/gtest.h>

#include <string>

#include "xml/generated_text.h"
#include "xml/writer.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

struct Style {
  std::string mark;
  std::string line_end;
  std::string indentation;
};

/// An independent writer of trees with texts that need no escaping.
class StyledText {
 public:
  StyledText(Style style, std::uint32_t seed) : style_(std::move(style)), dice_(seed) {}

  std::string Document() {
    left_ = 60;
    std::string text = style_.mark + R"(<?xml version="1.0" encoding="UTF-8"?>)" + style_.line_end;
    // The style is recognised by its first lines: the root has a child.
    text += "<root>" + Line(1) + "<first/>";
    while (left_ > 0) text += Line(1) + Element(1);
    return text + Line(0) + "</root>";
  }

 private:
  [[nodiscard]] std::string Line(int level) const {
    std::string line = style_.line_end;
    for (int i = 0; i < level; ++i) line += style_.indentation;
    return line;
  }

  std::string Element(int level) {
    --left_;
    const std::string name = dice_.Word("Group Field Item");
    std::string text = "<" + name;
    for (std::size_t i = dice_.Roll(3); i > 0; --i) {
      text += " " + dice_.Word("x y z") + "=\"" + dice_.Word("1 &amp;2 &quot;&apos;") + "\"";
    }
    const std::size_t children = level < 64 && left_ > 0 ? dice_.Roll(4) : 0;
    if (children == 0) {
      const std::string inner = dice_.Word(" text &lt;b&gt; two\nlines");
      return text + (inner.empty() ? "/>" : ">" + inner + "</" + name + ">");
    }
    text += ">";
    for (std::size_t i = 0; i < children; ++i) text += Line(level + 1) + Element(level + 1);
    return text + Line(level) + "</" + name + ">";
  }

  const Style style_;
  Dice dice_;
  int left_ = 0;
};

class RoundTripTest : public XmlTest {
 protected:
  std::string Rewritten(std::string_view text) {
    EXPECT_EQ(Load(text), XmlParseError::kNone);
    std::uint32_t length = 0;
    const char* const written = Serialize(document(), &length);
    return written == nullptr ? "" : std::string(written, length);
  }
};

TEST_F(RoundTripTest, BringsEveryStyleBack) {
  const Style styles[] = {{"", "", ""},     {"", "\n", ""},     {"", "\n", "\t"}, {"", "\n", " "},
                          {"", "\r\n", ""}, {"", "\r\n", "\t"}, {"", "\r\n", " "}};
  for (Style style : styles) {
    for (const char* mark : {"", "\xEF\xBB\xBF"}) {
      style.mark = mark;
      for (std::uint32_t seed = 1; seed <= 50; ++seed) {
        const std::string text = StyledText(style, seed).Document();
        ASSERT_EQ(Rewritten(text), text);
      }
    }
  }
}

TEST_F(RoundTripTest, KeepsTheTreeOfAnyText) {
  for (std::uint32_t seed = 1; seed <= 300; ++seed) {
    const std::string shape = ShapeOf(TextGenerator(seed).Document());
    std::uint32_t length = 0;
    const char* const written = Serialize(document(), &length);
    const std::string once(written, length);
    ASSERT_EQ(ShapeOf(once), shape) << once;
    ASSERT_EQ(ShapeOf(Rewritten(once)), shape) << "seed " << seed;
  }
}

}  // namespace
}  // namespace xml
