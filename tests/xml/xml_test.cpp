#include "xml/xml_test.h"

#include <vector>

#include "device/device.h"
#include "faults/faults.h"
#include "memory/memory.h"

namespace xml {

std::string Shape(const XmlElement* element) {
  std::string shape = element->name;
  for (const XmlAttribute* at = element->first_attribute; at != nullptr; at = at->next) {
    shape += std::string("[") + at->name + "=" + at->value + "]";
  }
  if (element->text != nullptr) shape += std::string("|") + element->text + "|";
  if (element->first_child == nullptr) return shape;
  shape += "{";
  for (const XmlElement* child = element->first_child; child != nullptr;
       child = child->next_sibling) {
    EXPECT_EQ(child->parent, element) << child->name;
    shape += Shape(child) + (child->next_sibling == nullptr ? "" : " ");
  }
  return shape + "}";
}

std::string Shape(const XmlDocument& document) {
  if (document.root() == nullptr) return "-";
  EXPECT_EQ(document.root()->parent, nullptr);
  EXPECT_EQ(document.root()->next_sibling, nullptr);
  return Shape(document.root());
}

std::string WalkOf(XmlDocument& document) {
  XmlCursor cursor;
  if (!cursor.Attach(&document) || !cursor.BeginChildren()) return "";
  std::string steps;
  XmlStep step = XmlStep::kStart;
  do {
    steps += std::string(step == XmlStep::kStart ? "+" : "-") + cursor.Name() + " ";
    step = cursor.Next();
  } while (step != XmlStep::kOver);
  return steps;
}

std::string Nested(int depth, std::string_view innermost) {
  std::string text;
  for (int level = 0; level < depth; ++level) text += "<n>";
  text += innermost;
  for (int level = 0; level < depth; ++level) text += "</n>";
  return text;
}

std::string Dice::Word(std::string_view words) {
  std::vector<std::string_view> all;
  while (!words.empty()) {
    const std::size_t end = words.find(' ');
    all.push_back(words.substr(0, end));
    words.remove_prefix(end == std::string_view::npos ? words.size() : end + 1);
  }
  return std::string(all[Roll(all.size())]);
}

void XmlTest::TearDown() {
  document_.Clear();
  EXPECT_EQ(device().memory().live_blocks(), 0U);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

std::string XmlTest::ShapeOf(std::string_view text) {
  const XmlParseError error = Load(text);
  if (error == XmlParseError::kNone) return Shape(document_);
  EXPECT_EQ(document_.root(), nullptr);
  return "error " + std::to_string(static_cast<int>(error));
}

XmlCursor XmlTest::AtRoot() {
  XmlCursor cursor;
  EXPECT_TRUE(cursor.Attach(&document_));
  return cursor;
}

}  // namespace xml
