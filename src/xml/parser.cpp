#include "xml/parser.h"

#include <cstddef>
#include <cstring>

#include "base/text.h"
#include "xml/entities.h"

namespace xml {
namespace {

/// Unsigned: a byte of a multi-byte character is a large number, not one below the blank.
using Byte = unsigned char;

// Which bytes mean something where; a byte may be in several classes. The zero that ends the text
// ends every scan.
enum ByteClass : Byte {
  kNameEnd = 1,
  kBlank = 2,  ///< blanks and controls
  kTextStop = 4,
  kDoubleQuotedStop = 8,
  kSingleQuotedStop = 16,
};

struct ByteClasses {
  Byte of[256];
};

constexpr ByteClasses MakeByteClasses() noexcept {
  ByteClasses classes{};
  for (unsigned byte = 1; byte <= ' '; ++byte) classes.of[byte] = kNameEnd | kBlank;
  classes.of[0] = kNameEnd | kTextStop | kDoubleQuotedStop | kSingleQuotedStop;
  classes.of[Byte{'&'}] = kTextStop | kDoubleQuotedStop | kSingleQuotedStop;
  classes.of[Byte{'/'}] = classes.of[Byte{'>'}] = classes.of[Byte{'='}] = kNameEnd;
  classes.of[Byte{'<'}] = kTextStop;
  classes.of[Byte{'"'}] = kDoubleQuotedStop;
  classes.of[Byte{'\''}] = kSingleQuotedStop;
  return classes;
}

constexpr ByteClasses kClasses = MakeByteClasses();

constexpr bool Is(Byte byte, Byte classes) noexcept {
  return (kClasses.of[byte] & classes) != 0;
}

Byte* AsBytes(char* text) noexcept {
  return static_cast<Byte*>(static_cast<void*>(text));
}
char* AsText(Byte* bytes) noexcept {
  return static_cast<char*>(static_cast<void*>(bytes));
}

/// Whether the text at `at` begins with `start`, which holds no zero: nothing behind the end of the
/// text is read.
bool BeginsWith(const Byte* at, std::string_view start) noexcept {
  for (const char wanted : start) {
    if (*at++ != static_cast<Byte>(wanted)) return false;
  }
  return true;
}

/// The entity at `at`, or null when the "&" there is only an ampersand.
const Entity* FindEntity(const Byte* at) noexcept {
  for (const Entity& entity : kEntities) {
    if (BeginsWith(at, entity.text)) return &entity;
  }
  return nullptr;
}

class Parser {
 public:
  Parser(Byte* text, Storage& storage) noexcept : start_(text), at_(text), storage_(storage) {}

  ParseResult Run() noexcept;

 private:
  XmlParseError ParseTree() noexcept;
  XmlParseError ParseMarkup() noexcept;
  XmlParseError SkipPast(const char* end, XmlParseError error_without) noexcept;
  XmlParseError ParseEndTag() noexcept;
  XmlParseError ParseStartTag() noexcept;
  XmlParseError ParseAttribute(XmlAttribute*** end) noexcept;
  XmlParseError Link(XmlElement* element, bool is_empty) noexcept;

  char* ScanText(Byte delimiter, Byte stops) noexcept;
  char* ScanName() noexcept;
  void SkipBlanks() noexcept;

  Byte* const start_;
  /// Next byte to read. What it was is in `next_` after a name, whose zero may stand there now.
  Byte* at_;
  Byte next_ = 0;
  std::size_t removed_ = 0;  ///< bytes by which decoding has shortened the text so far
  Storage& storage_;
  // One record of each kind is always in hand, so that a tag finds no lack of memory half-way.
  XmlElement* spare_element_ = nullptr;
  XmlAttribute* spare_attribute_ = nullptr;
  XmlElement* root_ = nullptr;
  XmlElement* open_ = nullptr;     ///< the innermost open element
  XmlElement* started_ = nullptr;  ///< the element whose text comes next, if one does
  std::size_t depth_ = 0;          ///< open elements
  /// The last element of each level: below every open element, and of the root's level.
  XmlElement* last_[kMaxOpenElements + 1] = {};
};

/// Scans up to `delimiter` and behind it, decoding entities on the way; `stops` is the class of the
/// delimiter, "&" and zero. Reading runs ahead of writing by what the entities were longer, so that
/// each byte is moved once however many there are.
/// @return the text, which ends with a zero; null when the document ends before.
char* Parser::ScanText(Byte delimiter, Byte stops) noexcept {
  Byte* const text = at_;
  Byte* read = text;
  while (!Is(*read, stops)) ++read;
  Byte* write = read;
  while (*read != delimiter && *read != 0) {
    const Entity* const entity = FindEntity(read);
    *write++ = entity == nullptr ? Byte{'&'} : static_cast<Byte>(entity->byte);
    read += entity == nullptr ? 1 : entity->text.size();
    while (!Is(*read, stops)) *write++ = *read++;
  }
  removed_ += static_cast<std::size_t>(read - write);
  const bool found = *read == delimiter;
  at_ = found ? read + 1 : read;
  *write = 0;
  return found ? AsText(text) : nullptr;
}

/// Scans a name and the blanks behind it. Leaves `next_`, the byte after them, where `at_` is.
char* Parser::ScanName() noexcept {
  Byte* const name = at_;
  while (!Is(*at_, kNameEnd)) ++at_;
  next_ = *at_;
  *at_ = 0;
  if (Is(next_, kBlank)) {
    ++at_;
    SkipBlanks();
  }
  return AsText(name);
}

void Parser::SkipBlanks() noexcept {
  while (Is(*at_, kBlank)) ++at_;
  next_ = *at_;
}

XmlParseError Parser::SkipPast(const char* end, XmlParseError error_without) noexcept {
  char* const found = std::strstr(AsText(at_), end);
  at_ = found == nullptr ? at_ + std::strlen(AsText(at_)) : AsBytes(found) + std::strlen(end);
  return found == nullptr ? error_without : XmlParseError::kNone;
}

/// What stands behind a "<". Whatever is neither a comment, nor "?", nor an end tag is an element:
/// document types and CDATA sections get no other treatment.
XmlParseError Parser::ParseMarkup() noexcept {
  if (*at_ == '/') {
    ++at_;
    return ParseEndTag();
  }
  if (*at_ == '?') return SkipPast(">", XmlParseError::kUnclosedTag);
  if (BeginsWith(at_, "!--")) {
    at_ += 3;
    return SkipPast("-->", XmlParseError::kUnclosedComment);
  }
  return ParseStartTag();
}

XmlParseError Parser::ParseEndTag() noexcept {
  const char* const name = ScanName();
  if (next_ != '>') return XmlParseError::kUnclosedTag;
  ++at_;
  if (open_ == nullptr) return XmlParseError::kNoOpenElement;
  if (std::strcmp(open_->name, name) != 0) return XmlParseError::kWrongEndTag;
  if (open_->first_child != nullptr || *open_->text == '\0') open_->text = nullptr;
  open_ = open_->parent;
  --depth_;
  return XmlParseError::kNone;
}

XmlParseError Parser::ParseStartTag() noexcept {
  XmlElement* const element = spare_element_;
  element->name = ScanName();
  XmlAttribute** end = &element->first_attribute;
  while (next_ != '>' && next_ != '/' && next_ != 0) {
    const XmlParseError error = ParseAttribute(&end);
    if (error != XmlParseError::kNone) return error;
  }
  if (next_ == 0) return XmlParseError::kUnclosedTag;
  ++at_;
  const bool is_empty = next_ == '/';
  if (is_empty && *at_++ != '>') return XmlParseError::kSlashNotClosed;
  return Link(element, is_empty);
}

/// @param end  the link behind the element's last attribute; moved on
XmlParseError Parser::ParseAttribute(XmlAttribute*** end) noexcept {
  XmlAttribute* const attribute = spare_attribute_;
  // A "=" directly behind another name has that name's zero upon it.
  if (next_ == '=') *at_ = '=';
  attribute->name = ScanName();
  if (next_ != '=') return XmlParseError::kAttributeWithoutValue;
  ++at_;
  SkipBlanks();
  const Byte quote = next_;
  if (quote != '"' && quote != '\'') return XmlParseError::kValueNotQuoted;
  ++at_;
  attribute->value = ScanText(quote, quote == '"' ? kDoubleQuotedStop : kSingleQuotedStop);
  if (attribute->value == nullptr) return XmlParseError::kAttributeWithoutValue;
  **end = attribute;
  *end = &attribute->next;
  spare_attribute_ = storage_.TakeAttribute();
  if (spare_attribute_ == nullptr) return XmlParseError::kOutOfMemory;
  SkipBlanks();
  return XmlParseError::kNone;
}

XmlParseError Parser::Link(XmlElement* element, bool is_empty) noexcept {
  element->parent = open_;
  XmlElement* const last = last_[depth_];
  XmlElement*& first = open_ == nullptr ? root_ : open_->first_child;
  (last == nullptr ? first : last->next_sibling) = element;
  last_[depth_] = element;
  if (!is_empty) {
    if (depth_ == kMaxOpenElements) return XmlParseError::kTooDeep;
    open_ = started_ = element;
    last_[++depth_] = nullptr;
  }
  spare_element_ = storage_.TakeElement();
  return spare_element_ == nullptr ? XmlParseError::kOutOfMemory : XmlParseError::kNone;
}

XmlParseError Parser::ParseTree() noexcept {
  spare_element_ = storage_.TakeElement();
  spare_attribute_ = storage_.TakeAttribute();
  if (spare_element_ == nullptr || spare_attribute_ == nullptr) return XmlParseError::kOutOfMemory;
  do {
    const char* const text = ScanText('<', kTextStop);
    if (text == nullptr) return XmlParseError::kNoTag;
    // Only what directly follows a start tag is a text; what follows anything else is dropped.
    if (started_ != nullptr) started_->text = text;
    started_ = nullptr;
    const XmlParseError error = ParseMarkup();
    if (error != XmlParseError::kNone) return error;
  } while (open_ != nullptr || root_ == nullptr);
  return XmlParseError::kNone;
}

ParseResult Parser::Run() noexcept {
  ParseResult result;
  result.error = ParseTree();
  storage_.GiveBack(spare_element_);
  storage_.GiveBack(spare_attribute_);
  if (result.error == XmlParseError::kNone) {
    result.root = root_;
  } else {
    const auto stopped_at = static_cast<std::size_t>(at_ - start_);
    result.error_offset = static_cast<std::uint32_t>(stopped_at - removed_);
  }
  return result;
}

}  // namespace

std::uint8_t SniffFormat(const char* text) noexcept {
  unsigned flags = 0;
  if (std::strncmp(text, "\xEF\xBB\xBF", 3) == 0) flags |= kFormatByteOrderMark;
  int starts = 0;
  char before = '\0';
  for (const char* at = text; *at != '\0' && starts < 3; before = *at++) {
    if (*at == '<' && at[1] != '?' && at[1] != '!') ++starts;
    if (*at != '\n') continue;
    flags |= kFormatLineFeed;
    if (before == '\r') flags |= kFormatCarriageReturn;
    if (at[1] == '\t') flags |= kFormatTab;
    if (at[1] == ' ') flags |= kFormatBlank;
  }
  return static_cast<std::uint8_t>(flags);
}

ParseResult Parse(char* text, Storage& storage) noexcept {
  return Parser(AsBytes(text), storage).Run();
}

}  // namespace xml
