#include "xml/storage.h"

#include <cstring>
#include <utility>

namespace xml {

XmlElement* Storage::Reuse() noexcept {
  return std::exchange(free_elements_, free_elements_->next_sibling);
}

XmlAttribute* Storage::ReuseAttribute() noexcept {
  return std::exchange(free_attributes_, free_attributes_->next);
}

void Storage::GiveBack(XmlElement* element) noexcept {
  if (element == nullptr) return;
  element->next_sibling = free_elements_;
  free_elements_ = element;
}

void Storage::GiveBack(XmlAttribute* attribute) noexcept {
  if (attribute == nullptr) return;
  attribute->next = free_attributes_;
  free_attributes_ = attribute;
}

char* Storage::Write(std::string_view text) noexcept {
  if (text.size() >= Pool::kMaxCapacity) return nullptr;
  auto* const copy = static_cast<char*>(strings_.Take(text.size() + 1));
  if (copy == nullptr) return nullptr;
  if (!text.empty()) std::memcpy(copy, text.data(), text.size());
  copy[text.size()] = '\0';
  return copy;
}

const char* Storage::Copy(std::string_view text) noexcept {
  return Write(text);
}

char* Storage::Load(std::string_view text) noexcept {
  char* const copy = Write(text);
  return copy != nullptr && nodes_.AddBlock(text.size()) ? copy : nullptr;
}

void Storage::Clear() noexcept {
  strings_.Clear();
  nodes_.Clear();
  free_elements_ = nullptr;
  free_attributes_ = nullptr;
}

}  // namespace xml
