#include <cstring>

#include "xml/document.h"

namespace xml {
namespace {

bool SameText(const char* a, const char* b) noexcept {
  return std::strcmp(a, b) == 0;
}

/// The link that holds the first attribute of that name, or the empty one at the list's end.
XmlAttribute** FindLink(XmlElement& element, const char* name) noexcept {
  XmlAttribute** link = &element.first_attribute;
  while (*link != nullptr && !SameText((*link)->name, name)) link = &(*link)->next;
  return link;
}

/// The empty link behind the last element of a list.
XmlElement** EndOf(XmlElement** link) noexcept {
  while (*link != nullptr) link = &(*link)->next_sibling;
  return link;
}

/// The link at which an element enters the list of its siblings-to-be; null for an unknown place
/// and for siblings of the root.
XmlElement** LinkAt(XmlElement& at, Place place) noexcept {
  const bool has_siblings = at.parent != nullptr;
  switch (place) {
    case Place::kAfter: return has_siblings ? &at.next_sibling : nullptr;
    case Place::kFirstSibling: return has_siblings ? &at.parent->first_child : nullptr;
    case Place::kLastSibling: return has_siblings ? EndOf(&at.next_sibling) : nullptr;
    case Place::kFirstChild: return &at.first_child;
    case Place::kLastChild: return EndOf(&at.first_child);
  }
  return nullptr;
}

}  // namespace

bool XmlCursor::Attach(XmlDocument* document) noexcept {
  if (document == nullptr || document->root() == nullptr) return false;
  Reset();
  document_ = document;
  element_ = document->root();
  return true;
}

bool XmlCursor::FirstChild() noexcept {
  if (element_ == nullptr || element_->first_child == nullptr) return false;
  element_ = element_->first_child;
  ++depth_;
  return true;
}

bool XmlCursor::Parent() noexcept {
  if (element_ == nullptr || element_->parent == nullptr) return false;
  element_ = element_->parent;
  --depth_;
  return true;
}

bool XmlCursor::BeginChildren() noexcept {
  const std::uint16_t began = depth_;
  if (!FirstChild()) return false;
  saved_depth_ = began;
  entered_ = true;
  return true;
}

XmlStep XmlCursor::Next() noexcept {
  if (element_ == nullptr) return XmlStep::kOver;
  if (entered_) {
    if (FirstChild()) return XmlStep::kStart;
    entered_ = false;
    return XmlStep::kEnd;
  }
  if (element_->next_sibling != nullptr) {
    element_ = element_->next_sibling;
    entered_ = true;
    return XmlStep::kStart;
  }
  if (!Parent()) return XmlStep::kOver;
  if (depth_ != saved_depth_) return XmlStep::kEnd;
  entered_ = true;
  return XmlStep::kOver;
}

const char* XmlCursor::Name() const noexcept {
  return element_ == nullptr ? "" : element_->name;
}

const char* XmlCursor::Text() const noexcept {
  return element_ == nullptr ? nullptr : element_->text;
}

const char* XmlCursor::Attribute(const char* name) const noexcept {
  if (element_ == nullptr || name == nullptr) return nullptr;
  const XmlAttribute* const attribute = *FindLink(*element_, name);
  return attribute == nullptr ? nullptr : attribute->value;
}

const char* XmlCursor::SetText(const char* text) noexcept {
  if (element_ == nullptr || element_->first_child != nullptr) return nullptr;
  if (text == nullptr || *text == '\0') {
    element_->text = nullptr;
    return "";
  }
  if (element_->text != nullptr && SameText(element_->text, text)) return element_->text;
  const char* const copy = document_->storage_.Copy(text);
  if (copy != nullptr) element_->text = copy;
  return copy;
}

const char* XmlCursor::SetAttribute(const char* name, const char* value) noexcept {
  if (element_ == nullptr || name == nullptr) return nullptr;
  XmlAttribute** const link = FindLink(*element_, name);
  XmlAttribute* const found = *link;
  if (value == nullptr) {
    if (found != nullptr) *link = found->next;
    document_->storage_.GiveBack(found);
    return "";
  }
  if (found == nullptr) {
    *link = NewAttribute(name, value);
    return *link == nullptr ? nullptr : (*link)->value;
  }
  if (SameText(found->value, value)) return found->value;
  const char* const copy = document_->storage_.Copy(value);
  if (copy != nullptr) found->value = copy;
  return copy;
}

XmlAttribute* XmlCursor::NewAttribute(const char* name, const char* value) noexcept {
  Storage& storage = document_->storage_;
  XmlAttribute* const attribute = storage.TakeAttribute();
  if (attribute == nullptr) return nullptr;
  attribute->name = storage.Copy(name);
  attribute->value = attribute->name == nullptr ? nullptr : storage.Copy(value);
  if (attribute->value != nullptr) return attribute;
  storage.GiveBack(attribute);
  return nullptr;
}

bool XmlCursor::AddElement(const char* name, Place place) noexcept {
  XmlElement** const link = element_ == nullptr ? nullptr : LinkAt(*element_, place);
  if (link == nullptr) return false;
  XmlElement* const added = document_->NewElement(name);
  if (added == nullptr) return false;
  const bool below = place == Place::kFirstChild || place == Place::kLastChild;
  added->parent = below ? element_ : element_->parent;
  added->parent->text = nullptr;
  added->next_sibling = *link;
  *link = added;
  element_ = added;
  if (below) ++depth_;
  return true;
}

}  // namespace xml
