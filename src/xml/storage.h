// Where the records and texts of one document live.
#pragma once

#include <cstddef>
#include <new>
#include <string_view>

#include "xml/element.h"
#include "xml/pool.h"

namespace xml {

/// The pools of one document: strings in one, records in the other, so that texts of any length do
/// not disturb the alignment of records. Records that were given back are used again first.
class Storage {
 public:
  /// @return a record whose fields are all null, or null when there is no memory.
  [[nodiscard]] XmlElement* TakeElement() noexcept {
    void* const place = free_elements_ == nullptr ? nodes_.Take(sizeof(XmlElement)) : Reuse();
    return place == nullptr ? nullptr : new (place) XmlElement;
  }
  [[nodiscard]] XmlAttribute* TakeAttribute() noexcept {
    void* const place =
        free_attributes_ == nullptr ? nodes_.Take(sizeof(XmlAttribute)) : ReuseAttribute();
    return place == nullptr ? nullptr : new (place) XmlAttribute;
  }

  /// Takes back a record that nothing points at any more; null does nothing.
  void GiveBack(XmlElement* element) noexcept;
  void GiveBack(XmlAttribute* attribute) noexcept;

  /// A copy of the text with a zero behind it, or null when there is no memory.
  [[nodiscard]] const char* Copy(std::string_view text) noexcept;

  /// Makes room for a document's text and for about as many bytes of records, then copies the text,
  /// with a zero behind it.
  /// @return the copy, or null when there is no memory.
  [[nodiscard]] char* Load(std::string_view text) noexcept;

  /// Frees everything; all records and texts are gone.
  void Clear() noexcept;

  /// What the pools take of the heap, in bytes.
  [[nodiscard]] std::size_t MemoryInUse() const noexcept {
    return strings_.MemoryInUse() + nodes_.MemoryInUse();
  }

 private:
  [[nodiscard]] XmlElement* Reuse() noexcept;
  [[nodiscard]] XmlAttribute* ReuseAttribute() noexcept;
  [[nodiscard]] char* Write(std::string_view text) noexcept;

  Pool strings_;
  Pool nodes_;
  XmlElement* free_elements_ = nullptr;      ///< linked by next_sibling
  XmlAttribute* free_attributes_ = nullptr;  ///< linked by next
};

}  // namespace xml
