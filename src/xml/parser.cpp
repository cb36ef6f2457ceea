#include "xml/parser.h"

#include <cstddef>
#include <cstring>
#include <string_view>

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
  kSniffStop = 32,  ///< "<" and line feed
};

struct ByteClasses {
  Byte of[256];
};

constexpr ByteClasses MakeByteClasses() noexcept {
  ByteClasses classes{};
  for (unsigned byte = 1; byte <= ' '; ++byte) classes.of[byte] = kNameEnd | kBlank;
  classes.of[0] = kNameEnd | kTextStop | kDoubleQuotedStop | kSingleQuotedStop | kSniffStop;
  classes.of[Byte{'\n'}] |= kSniffStop;
  classes.of[Byte{'&'}] = kTextStop | kDoubleQuotedStop | kSingleQuotedStop;
  classes.of[Byte{'/'}] = classes.of[Byte{'>'}] = classes.of[Byte{'='}] = kNameEnd;
  classes.of[Byte{'<'}] = kTextStop | kSniffStop;
  classes.of[Byte{'"'}] = kDoubleQuotedStop;
  classes.of[Byte{'\''}] = kSingleQuotedStop;
  return classes;
}

constexpr ByteClasses kClasses = MakeByteClasses();

constexpr bool Is(Byte byte, Byte classes) noexcept {
  return (kClasses.of[byte] & classes) != 0;
}

/// The first byte from `at` on that is in one of the classes. Four at a time: most of a document is
/// passed here, and the loop's own work is as much as a byte's.
template <Byte kStops, typename AnyByte>
AnyByte* SkipUntil(AnyByte* at) noexcept {
  for (;; at += 4) {
    if (Is(at[0], kStops)) return at;
    if (Is(at[1], kStops)) return at + 1;
    if (Is(at[2], kStops)) return at + 2;
    if (Is(at[3], kStops)) return at + 3;
  }
}

Byte* AsBytes(char* text) noexcept {
  return static_cast<Byte*>(static_cast<void*>(text));
}
const Byte* AsBytes(const char* text) noexcept {
  return static_cast<const Byte*>(static_cast<const void*>(text));
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

/// @param kWhich  in kEntities; a constant, so that a few bytes are compared at once
template <std::size_t kWhich>
const Entity* IfEntity(const Byte* at, std::size_t left) noexcept {
  constexpr const Entity& kEntity = kEntities[kWhich];
  const bool is =
      left >= kEntity.text.size() && std::memcmp(at, kEntity.text.data(), kEntity.text.size()) == 0;
  return is ? &kEntity : nullptr;
}

/// The entity at `at`, with `left` bytes from there on, or null when the "&" there is only an
/// ampersand. The letter behind it leaves one candidate, or two.
const Entity* FindEntity(const Byte* at, std::size_t left) noexcept {
  switch (at[1]) {
    case 'a': return at[2] == 'm' ? IfEntity<0>(at, left) : IfEntity<4>(at, left);
    case 'l': return IfEntity<1>(at, left);
    case 'g': return IfEntity<2>(at, left);
    case 'q': return IfEntity<3>(at, left);
    default: return nullptr;
  }
}

class Parser {
 public:
  /// @param root  null, and where the root goes
  Parser(Byte* text, std::size_t length, Storage& storage, XmlElement** root) noexcept
      : start_(text), end_(text + length), at_(text), storage_(storage), root_(root), link_(root) {}

  XmlParseError ParseTree() noexcept;

  /// Gives back what was in hand. @return where parsing stopped, in the decoded text.
  std::size_t Finish() noexcept;

 private:
  XmlParseError ParseMarkup() noexcept;
  XmlParseError SkipPast(const char* end, XmlParseError error_without) noexcept;
  XmlParseError ParseEndTag() noexcept;
  bool SkipExpectedEnd() noexcept;
  XmlParseError ParseStartTag() noexcept;
  XmlParseError ParseAttribute(XmlAttribute*** end) noexcept;

  template <char kDelimiter, Byte kStops>
  char* ScanText() noexcept;
  std::string_view ScanName() noexcept;
  void SkipBlanks() noexcept;

  Byte* const start_;
  const Byte* const end_;
  /// Next byte to read. What it was is in `next_` after a name, whose zero may stand there now.
  Byte* at_;
  Byte next_ = 0;
  std::size_t removed_ = 0;  ///< bytes by which decoding has shortened the text so far
  Storage& storage_;
  XmlElement** const root_;
  // One record of each kind is always in hand, so that a tag finds no lack of memory half-way.
  XmlElement* spare_element_ = nullptr;
  XmlAttribute* spare_attribute_ = nullptr;
  XmlElement* open_ = nullptr;                  ///< the innermost open element
  XmlElement** link_;                           ///< where the next element is hung up
  XmlElement* started_ = nullptr;               ///< the element whose text comes next, if one does
  std::size_t depth_ = 0;                       ///< open elements
  std::size_t name_lengths_[kMaxOpenElements];  ///< of the open elements, outermost first
};

/// Scans up to `kDelimiter` and behind it, decoding entities on the way. Reading runs ahead of
/// writing by what the entities were longer, so that each byte is moved once however many there
/// are.
/// @return the text, which ends with a zero; null when the document ends before.
template <char kDelimiter, Byte kStops>
char* Parser::ScanText() noexcept {
  Byte* const text = at_;
  Byte* read = SkipUntil<kStops>(text);
  Byte* write = read;
  while (*read != Byte{kDelimiter} && *read != 0) {
    const Entity* const entity = FindEntity(read, static_cast<std::size_t>(end_ - read));
    *write++ = entity == nullptr ? Byte{'&'} : static_cast<Byte>(entity->byte);
    read += entity == nullptr ? 1 : entity->text.size();
    const Byte* const run = read;
    read = SkipUntil<kStops>(read);
    std::memmove(write, run, static_cast<std::size_t>(read - run));
    write += read - run;
  }
  removed_ += static_cast<std::size_t>(read - write);
  const bool found = *read == Byte{kDelimiter};
  at_ = found ? read + 1 : read;
  *write = 0;
  return found ? AsText(text) : nullptr;
}

/// Scans a name and the blanks behind it. Leaves `next_`, the byte after them, where `at_` is. In
/// line, so that the compiler keeps the parser's state in registers.
/// @return the name, with a zero behind it.
[[gnu::always_inline]] inline std::string_view Parser::ScanName() noexcept {
  Byte* const name = at_;
  at_ = SkipUntil<kNameEnd>(name);
  const auto length = static_cast<std::size_t>(at_ - name);
  next_ = *at_;
  *at_ = 0;
  if (Is(next_, kBlank)) {
    ++at_;
    SkipBlanks();
  }
  return {AsText(name), length};
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
  // Quotes do not count there: an instruction with a ">" in a value ends early.
  if (*at_ == '?') return SkipPast(">", XmlParseError::kUnclosedTag);
  if (BeginsWith(at_, "!--")) {
    at_ += 3;
    return SkipPast("-->", XmlParseError::kUnclosedComment);
  }
  return ParseStartTag();
}

XmlParseError Parser::ParseEndTag() noexcept {
  if (!SkipExpectedEnd()) {
    const std::string_view name = ScanName();
    if (next_ != '>') return XmlParseError::kUnclosedTag;
    ++at_;
    if (open_ == nullptr) return XmlParseError::kNoOpenElement;
    if (name != open_->name) return XmlParseError::kWrongEndTag;
  }
  if (open_->first_child != nullptr || *open_->text == '\0') open_->text = nullptr;
  link_ = &open_->next_sibling;
  open_ = open_->parent;
  --depth_;
  return XmlParseError::kNone;
}

/// The end tag that is nearly always there: the open element's name and ">" directly behind it.
bool Parser::SkipExpectedEnd() noexcept {
  if (open_ == nullptr) return false;
  const std::size_t length = name_lengths_[depth_ - 1];
  if (static_cast<std::size_t>(end_ - at_) <= length || at_[length] != '>') return false;
  if (std::memcmp(at_, open_->name, length) != 0) return false;
  at_ += length + 1;
  return true;
}

XmlParseError Parser::ParseStartTag() noexcept {
  XmlElement* const element = spare_element_;
  const std::string_view name = ScanName();
  element->name = name.data();
  XmlAttribute** end = &element->first_attribute;
  while (next_ != '>' && next_ != '/' && next_ != 0) {
    const XmlParseError error = ParseAttribute(&end);
    if (error != XmlParseError::kNone) return error;
  }
  if (next_ == 0) return XmlParseError::kUnclosedTag;
  ++at_;
  element->parent = open_;
  *link_ = element;
  link_ = &element->next_sibling;
  if (next_ == '>') {
    if (depth_ == kMaxOpenElements) return XmlParseError::kTooDeep;
    open_ = started_ = element;
    link_ = &element->first_child;
    name_lengths_[depth_++] = name.size();
  } else {
    if (*at_ != '>') return XmlParseError::kSlashNotClosed;
    ++at_;
  }
  spare_element_ = storage_.TakeElement();
  return spare_element_ == nullptr ? XmlParseError::kOutOfMemory : XmlParseError::kNone;
}

/// @param end  the link behind the element's last attribute; moved on
XmlParseError Parser::ParseAttribute(XmlAttribute*** end) noexcept {
  XmlAttribute* const attribute = spare_attribute_;
  // A "=" directly behind another name has that name's zero upon it.
  if (next_ == '=') *at_ = '=';
  attribute->name = ScanName().data();
  if (next_ != '=') return XmlParseError::kAttributeWithoutValue;
  ++at_;
  SkipBlanks();
  const Byte quote = next_;
  if (quote != '"' && quote != '\'') return XmlParseError::kValueNotQuoted;
  ++at_;
  attribute->value =
      quote == '"' ? ScanText<'"', kDoubleQuotedStop>() : ScanText<'\'', kSingleQuotedStop>();
  if (attribute->value == nullptr) return XmlParseError::kAttributeWithoutValue;
  **end = attribute;
  *end = &attribute->next;
  spare_attribute_ = storage_.TakeAttribute();
  if (spare_attribute_ == nullptr) return XmlParseError::kOutOfMemory;
  SkipBlanks();
  return XmlParseError::kNone;
}

XmlParseError Parser::ParseTree() noexcept {
  spare_element_ = storage_.TakeElement();
  spare_attribute_ = storage_.TakeAttribute();
  if (spare_element_ == nullptr || spare_attribute_ == nullptr) return XmlParseError::kOutOfMemory;
  do {
    const char* const text = ScanText<'<', kTextStop>();
    if (text == nullptr) return XmlParseError::kNoTag;
    // Only what directly follows a start tag is a text; what follows anything else is dropped.
    if (started_ != nullptr) started_->text = text;
    started_ = nullptr;
    const XmlParseError error = ParseMarkup();
    if (error != XmlParseError::kNone) return error;
  } while (open_ != nullptr || *root_ == nullptr);
  return XmlParseError::kNone;
}

std::size_t Parser::Finish() noexcept {
  storage_.GiveBack(spare_element_);
  storage_.GiveBack(spare_attribute_);
  return static_cast<std::size_t>(at_ - start_) - removed_;
}

}  // namespace

std::uint8_t SniffFormat(const char* text) noexcept {
  const Byte* const start = AsBytes(text);
  unsigned flags = BeginsWith(start, "\xEF\xBB\xBF") ? unsigned{kFormatByteOrderMark} : 0;
  int elements = 0;
  for (const Byte* at = SkipUntil<kSniffStop>(start); *at != 0;
       at = SkipUntil<kSniffStop>(at + 1)) {
    if (*at == '<') {
      if (at[1] != '?' && at[1] != '!' && ++elements == 3) break;
      continue;
    }
    flags |= kFormatLineFeed;
    if (at > start && at[-1] == '\r') flags |= kFormatCarriageReturn;
    if (at[1] == '\t') flags |= kFormatTab;
    if (at[1] == ' ') flags |= kFormatBlank;
  }
  return static_cast<std::uint8_t>(flags);
}

ParseResult Parse(char* text, std::size_t length, Storage& storage) noexcept {
  ParseResult result;
  XmlElement* root = nullptr;
  Parser parser(AsBytes(text), length, storage, &root);
  result.error = parser.ParseTree();
  const std::size_t stopped_at = parser.Finish();
  if (result.error == XmlParseError::kNone) {
    result.root = root;
  } else {
    result.error_offset = static_cast<std::uint32_t>(stopped_at);
  }
  return result;
}

}  // namespace xml
