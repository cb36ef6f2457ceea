// Documents beside those of a well-known library, which nobody here wrote: pugixml.
#include <gtest/gtest.h>

#include <pugixml.hpp>
#include <sstream>
#include <string>

#include "xml/generated_text.h"
#include "xml/writer.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

constexpr std::uint32_t kTexts = 1500;

// Everything is kept as it stands, and nodes that documents here do not have are kept too: they
// divide a text where a comment stood.
constexpr unsigned kOptions =
    pugi::parse_escapes | pugi::parse_ws_pcdata | pugi::parse_comments | pugi::parse_pi;

std::string Shape(const pugi::xml_node& node) {
  std::string shape = node.name();
  for (const pugi::xml_attribute& attribute : node.attributes()) {
    shape += std::string("[") + attribute.name() + "=" + attribute.value() + "]";
  }
  std::string children;
  for (const pugi::xml_node& child : node.children()) {
    if (child.type() != pugi::node_element) continue;
    children += (children.empty() ? "" : " ") + Shape(child);
  }
  if (!children.empty()) return shape + "{" + children + "}";
  const pugi::xml_node first = node.first_child();
  if (first.type() == pugi::node_pcdata && *first.value() != '\0') {
    shape += std::string("|") + first.value() + "|";
  }
  return shape;
}

std::string JudgedShape(std::string_view text) {
  pugi::xml_document judge;
  const pugi::xml_parse_result result =
      judge.load_buffer(text.data(), text.size(), kOptions, pugi::encoding_utf8);
  return result ? Shape(judge.document_element()) : result.description();
}

class JudgeTest : public XmlTest {};

TEST_F(JudgeTest, FindsTheSameTreeInEveryText) {
  for (std::uint32_t seed = 1; seed <= kTexts; ++seed) {
    const std::string text = TextGenerator(seed).Document();
    ASSERT_EQ(ShapeOf(text), JudgedShape(text)) << "seed " << seed << "\n" << text;
  }
}

TEST_F(JudgeTest, FindsTheSameTreeInWhatIsWritten) {
  for (std::uint32_t seed = 1; seed <= kTexts; ++seed) {
    const std::string text = TextGenerator(seed).Document();
    const std::string shape = ShapeOf(text);
    std::uint32_t length = 0;
    const char* const written = Serialize(document(), &length);
    ASSERT_NE(written, nullptr);
    ASSERT_EQ(JudgedShape({written, length}), shape) << "seed " << seed << "\n" << written;
  }
}

TEST_F(JudgeTest, WritesTextsThatAreReadHereAsTheSameTree) {
  for (std::uint32_t seed = 1; seed <= kTexts; ++seed) {
    std::string text = TextGenerator(seed).Document();
    // It writes controls as numbers, which are no entities here.
    for (char& byte : text) byte = byte > 0 && byte < ' ' ? ' ' : byte;
    pugi::xml_document judge;
    ASSERT_TRUE(
        judge.load_string(text.c_str(), pugi::parse_escapes | pugi::parse_ws_pcdata_single));
    // As it stands between tags: an indented text would become another one.
    std::ostringstream written;
    judge.save(written, "", pugi::format_raw);
    ASSERT_EQ(ShapeOf(written.str()), JudgedShape(written.str())) << "seed " << seed;
  }
}

/// Does the same random edits to both, and finds the same trees.
class EditedTwice {
 public:
  EditedTwice(XmlDocument& document, std::uint32_t seed) : dice_(seed) {
    document.NewDocument("root");
    cursor_.Attach(&document);
    node_ = judge_.append_child("root");
  }

  void Step() {
    switch (dice_.Roll(8)) {
      case 0: Both(cursor_.FirstChild(), FirstElement(node_)); break;
      case 1: Both(cursor_.Parent(), node_ == Root() ? pugi::xml_node() : node_.parent()); break;
      case 2: SetText(); break;
      case 3:
      case 4: SetAttribute(); break;
      default: AddElement(); break;
    }
  }

  [[nodiscard]] pugi::xml_node Root() const { return judge_.first_child(); }

 private:
  static pugi::xml_node FirstElement(const pugi::xml_node& node) {
    return node.find_child([](const pugi::xml_node& n) { return n.type() == pugi::node_element; });
  }

  void Both(bool moved, const pugi::xml_node& there) {
    ASSERT_EQ(moved, !there.empty());
    if (moved) node_ = there;
    ASSERT_STREQ(cursor_.Name(), node_.name());
  }

  void SetText() {
    const std::string text = dice_.Word("t <&> it's  x y");
    const bool allowed = FirstElement(node_).empty();
    ASSERT_EQ(cursor_.SetText(text.c_str()) != nullptr, allowed);
    if (!allowed) return;
    node_.remove_children();
    if (!text.empty()) node_.append_child(pugi::node_pcdata).set_value(text.c_str());
  }

  void SetAttribute() {
    const std::string name = dice_.Word("x y z w v");
    const std::string value = dice_.Word("1 2 <&>\"'  long-long-long-long-value");
    if (dice_.Roll(4) == 0) {
      ASSERT_STREQ(cursor_.SetAttribute(name.c_str(), nullptr), "");
      node_.remove_attribute(name.c_str());
      return;
    }
    ASSERT_EQ(cursor_.SetAttribute(name.c_str(), value.c_str()), value);
    if (node_.attribute(name.c_str()).empty()) node_.append_attribute(name.c_str());
    node_.attribute(name.c_str()).set_value(value.c_str());
  }

  void AddElement() {
    const auto place = static_cast<Place>(dice_.Roll(5));
    const std::string name = "e" + std::to_string(++names_);
    const bool sibling = place != Place::kFirstChild && place != Place::kLastChild;
    const bool allowed = !sibling || node_ != Root();
    ASSERT_EQ(cursor_.AddElement(name.c_str(), place), allowed);
    if (!allowed) return;
    if (!sibling && FirstElement(node_).empty()) node_.remove_children();
    switch (place) {
      case Place::kAfter: node_ = node_.parent().insert_child_after(name.c_str(), node_); break;
      case Place::kFirstSibling: node_ = node_.parent().prepend_child(name.c_str()); break;
      case Place::kLastSibling: node_ = node_.parent().append_child(name.c_str()); break;
      case Place::kFirstChild: node_ = node_.prepend_child(name.c_str()); break;
      case Place::kLastChild: node_ = node_.append_child(name.c_str()); break;
    }
  }

  Dice dice_;
  XmlCursor cursor_;
  pugi::xml_document judge_;
  pugi::xml_node node_;
  int names_ = 0;
};

TEST_F(JudgeTest, AgreesAboutEveryEdit) {
  for (std::uint32_t seed = 1; seed <= 40; ++seed) {
    EditedTwice both(document(), seed);
    for (int step = 0; step < 500; ++step) {
      both.Step();
      ASSERT_FALSE(HasFatalFailure()) << "seed " << seed << ", step " << step;
    }
    ASSERT_EQ(xml::Shape(document()), Shape(both.Root())) << "seed " << seed;
    std::uint32_t length = 0;
    const char* const written = Serialize(document(), &length);
    ASSERT_EQ(JudgedShape({written, length}), Shape(both.Root())) << "seed " << seed;
  }
}

}  // namespace
}  // namespace xml
