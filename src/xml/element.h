// The records of a document's tree.
#pragma once

namespace xml {

/// One attribute of an element. The texts end with a zero and live as long as the document.
struct XmlAttribute {
  const char* name = nullptr;
  const char* value = nullptr;
  XmlAttribute* next = nullptr;  ///< in document order
};

/// One element. An element has a text or children, never both.
///
/// The texts end with a zero and live as long as the document; nothing is freed one by one. All
/// pointers look, none owns.
struct XmlElement {
  const char* name = nullptr;
  const char* text = nullptr;  ///< null without text and with children, never empty
  XmlAttribute* first_attribute = nullptr;
  XmlElement* first_child = nullptr;
  XmlElement* next_sibling = nullptr;
  XmlElement* parent = nullptr;  ///< null for the root
};

static_assert(sizeof(XmlElement) == 6 * sizeof(void*) && sizeof(XmlAttribute) == 3 * sizeof(void*),
              "nothing but pointers, so that records lie side by side in a pool block");
static_assert(sizeof(void*) != 4 || sizeof(XmlElement) == 24,
              "what XmlDocument::element_size() says");

}  // namespace xml
