// Random documents as text, of the kind that every XML library accepts.
#pragma once

#include <cstdint>
#include <string>

#include "xml/xml_test.h"

namespace xml {

/// Writes well-formed documents: elements to a depth of 64, attributes in both kinds of quotes, the
/// five entities and others, comments and instructions, all sorts of blanks and multi-byte
/// characters. No document types, CDATA sections, numeric entities or duplicate attributes, which
/// libraries understand and documents here do not.
class TextGenerator {
 public:
  explicit TextGenerator(std::uint32_t seed) : dice_(seed) {}
  std::string Document();

 private:
  void Element(int level, std::string& out);
  void Attributes(std::string& out);
  void Content(int level, std::string& out);
  void Misc(std::string& out);
  std::string Name();
  std::string Text(std::string_view quote);
  std::string Blanks(std::size_t at_least);

  Dice dice_;
  int left_ = 0;  ///< elements that may still be written
};

}  // namespace xml
