#include "xml/document.h"

#include "xml/parser.h"

namespace xml {

void XmlDocument::Clear() noexcept {
  storage_.Clear();
  root_ = nullptr;
  output_.buffer.Reset();
  output_.position = nullptr;
  output_.length = 0;
  format_flags_ = 0;
  last_error_ = XmlParseError::kNone;
}

XmlElement* XmlDocument::NewElement(const char* name) noexcept {
  if (name == nullptr) return nullptr;
  XmlElement* const element = storage_.TakeElement();
  if (element == nullptr) return nullptr;
  element->name = storage_.Copy(name);
  if (element->name != nullptr) return element;
  storage_.GiveBack(element);
  return nullptr;
}

const char* XmlDocument::NewDocument(const char* root_name) noexcept {
  Clear();
  root_ = NewElement(root_name);
  if (root_ != nullptr) return root_->name;
  Clear();
  return nullptr;
}

bool XmlDocument::LoadFromText(const char* text, std::size_t length) noexcept {
  Clear();
  if (text == nullptr) length = 0;
  char* const copy = storage_.Load({text, length});
  if (copy == nullptr) {
    last_error_ = XmlParseError::kOutOfMemory;
    return false;
  }
  format_flags_ = SniffFormat(copy);
  const ParseResult result = Parse(copy, length, storage_);
  root_ = result.root;
  last_error_ = result.error;
  output_.length = result.error_offset;
  return root_ != nullptr;
}

}  // namespace xml
