#include "xml/writer.h"

#include <coredll.h>

#include <cstddef>
#include <cstring>
#include <string_view>

#include "xml/entities.h"

namespace xml {
namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
constexpr std::string_view kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";
static_assert(kDeclaration.size() == 38, "written as it is, whatever the parsed text began with");

// A line end with its indentation is one piece out of here.
constexpr char kLineWithTabs[] =
    "\r\n"
    "\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t"
    "\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t\t";
constexpr char kLineWithBlanks[] =
    "\r\n"
    "                                "
    "                                ";
static_assert(sizeof kLineWithTabs == 2 + kMaxOpenElements + 1 &&
                  sizeof kLineWithBlanks == sizeof kLineWithTabs,
              "the innermost open element's empty children are at level 64");

/// How line ends and indentation of one document look.
class Layout {
 public:
  explicit Layout(std::uint8_t flags) noexcept
      : characters_((flags & kFormatTab) != 0 ? kLineWithTabs : kLineWithBlanks),
        indents_((flags & (kFormatTab | kFormatBlank)) != 0) {
    if ((flags & kFormatLineFeed) == 0) {
      line_end_ = 0;
    } else {
      line_end_ = (flags & kFormatCarriageReturn) != 0 ? 2 : 1;
    }
  }

  [[nodiscard]] std::string_view Line(std::size_t level) const noexcept {
    const std::size_t indentation = level < kMaxOpenElements ? level : kMaxOpenElements;
    return {characters_ + 2 - line_end_, line_end_ + (indents_ ? indentation : 0)};
  }

 private:
  const char* characters_;
  std::size_t line_end_;
  bool indents_;
};

/// What becomes of a byte of a text or value.
struct EscapeTable {
  unsigned char ends_run[256];  ///< 0: written as it is; else the entity's number from 1, or kEnd
  unsigned char size[256];      ///< as written
};

/// Of the zero that ends a text.
constexpr unsigned char kEnd = std::size(kEntities) + 1;

constexpr EscapeTable MakeEscapeTable() noexcept {
  EscapeTable table{};
  for (unsigned char& size : table.size) size = 1;
  unsigned char number = 0;
  for (const Entity& entity : kEntities) {
    const auto byte = static_cast<unsigned char>(entity.byte);
    table.ends_run[byte] = ++number;
    table.size[byte] = static_cast<unsigned char>(entity.text.size());
  }
  table.ends_run[0] = kEnd;
  table.size[0] = 0;
  return table;
}

constexpr EscapeTable kEscapes = MakeEscapeTable();

constexpr unsigned char EndsRun(char byte) noexcept {
  return kEscapes.ends_run[static_cast<unsigned char>(byte)];
}

constexpr unsigned char SizeOf(char byte) noexcept {
  return kEscapes.size[static_cast<unsigned char>(byte)];
}

constexpr std::string_view EntityFor(char byte) noexcept {
  return kEntities[EndsRun(byte) - 1].text;
}

/// Hands every piece to the document's sink.
class SinkOutput {
 public:
  explicit SinkOutput(XmlDocument& document) noexcept : document_(document) {}

  void Put(std::string_view piece) noexcept {
    if (piece.empty()) return;
    document_.output().sink(document_, piece.data(), static_cast<std::uint32_t>(piece.size()));
  }
  void PutName(const char* name) noexcept { Put(name); }
  void PutEscaped(const char* text) noexcept {
    for (;;) {
      const char* const run = text;
      while (EndsRun(*text) == 0) ++text;
      Put({run, static_cast<std::size_t>(text - run)});
      if (*text == '\0') return;
      Put(EntityFor(*text++));
    }
  }

 private:
  XmlDocument& document_;
};

/// Adds up what would be written; a sum that 32 bits cannot hold stays at their largest value.
class CountingOutput {
 public:
  explicit CountingOutput(std::uint32_t length) noexcept : sum_(length) {}

  void Put(std::string_view piece) noexcept { sum_ += piece.size(); }
  void PutName(const char* name) noexcept { sum_ += std::strlen(name); }
  void PutEscaped(const char* text) noexcept {
    std::uint64_t size = 0;
    for (; *text != '\0'; ++text) size += SizeOf(*text);
    sum_ += size;
  }
  [[nodiscard]] std::uint32_t length() const noexcept {
    return sum_ < UINT32_MAX ? static_cast<std::uint32_t>(sum_) : UINT32_MAX;
  }

 private:
  std::uint64_t sum_;
};

/// Copies into a buffer that has the room.
class CopyingOutput {
 public:
  explicit CopyingOutput(char* position) noexcept : position_(position) {}

  void Put(std::string_view piece) noexcept {
    std::memcpy(position_, piece.data(), piece.size());
    position_ += piece.size();
  }
  /// Names are short: a loop is faster than measuring and copying.
  void PutName(const char* name) noexcept {
    char* out = position_;
    while (*name != '\0') *out++ = *name++;
    position_ = out;
  }
  void PutEscaped(const char* text) noexcept {
    char* out = position_;
    for (;;) {
      while (EndsRun(*text) == 0) *out++ = *text++;
      if (*text == '\0') break;
      const std::string_view entity = EntityFor(*text++);
      std::memcpy(out, entity.data(), entity.size());
      out += entity.size();
    }
    position_ = out;
  }
  [[nodiscard]] char* position() const noexcept { return position_; }

 private:
  char* position_;
};

template <typename Output>
[[gnu::always_inline]] inline void WriteStart(const XmlElement& element, Output& out) noexcept {
  out.Put("<");
  out.PutName(element.name);
  for (const XmlAttribute* at = element.first_attribute; at != nullptr; at = at->next) {
    out.Put(" ");
    out.PutName(at->name);
    out.Put("=\"");
    out.PutEscaped(at->value);
    out.Put("\"");
  }
}

template <typename Output>
[[gnu::always_inline]] inline void WriteEnd(const XmlElement& element, Output& out) noexcept {
  out.Put("</");
  out.PutName(element.name);
  out.Put(">");
}

/// Depth first, back up along the links to the parents.
template <typename Output>
[[gnu::always_inline]] inline void WriteTree(const XmlElement* element, const Layout& layout,
                                             Output& out) noexcept {
  std::size_t level = 0;
  for (;;) {
    WriteStart(*element, out);
    if (element->first_child != nullptr) {
      out.Put(">");
      out.Put(layout.Line(++level));
      element = element->first_child;
      continue;
    }
    if (element->text == nullptr || *element->text == '\0') {
      out.Put("/>");
    } else {
      out.Put(">");
      out.PutEscaped(element->text);
      WriteEnd(*element, out);
    }
    while (level > 0 && element->next_sibling == nullptr) {
      element = element->parent;
      out.Put(layout.Line(--level));
      WriteEnd(*element, out);
    }
    if (level == 0) return;
    out.Put(layout.Line(level));
    element = element->next_sibling;
  }
}

/// @param out  a copy, so that its state stays in registers
/// @return the output as it is then
template <typename Output>
Output Write(const XmlDocument& document, Output out) noexcept {
  const Layout layout(document.format_flags());
  if ((document.format_flags() & kFormatByteOrderMark) != 0) out.Put(kByteOrderMark);
  out.Put(kDeclaration);
  out.Put(layout.Line(0));
  if (document.root() != nullptr) WriteTree(document.root(), layout, out);
  return out;
}

}  // namespace

void CountingSink(XmlDocument& document, const char* /*bytes*/, std::uint32_t length) noexcept {
  std::uint32_t& sum = document.output().length;
  sum = length < UINT32_MAX - sum ? sum + length : UINT32_MAX;
}

void CopyingSink(XmlDocument& document, const char* bytes, std::uint32_t length) noexcept {
  char*& position = document.output().position;
  std::memcpy(position, bytes, length);
  position += length;
}

// The two sinks of this file are taken in line: a call for each piece would cost more than its
// bytes.
void WriteToSink(XmlDocument& document) noexcept {
  XmlOutput& output = document.output();
  if (output.sink == CountingSink) {
    output.length = Write(document, CountingOutput(output.length)).length();
  } else if (output.sink == CopyingSink) {
    if (output.position == nullptr) return;
    output.position = Write(document, CopyingOutput(output.position)).position();
  } else if (output.sink != nullptr) {
    Write(document, SinkOutput(document));
  }
}

// Sink and position are the caller's and stay as they are: a position left in the buffer would let
// the next WriteToSink() write behind its end.
const char* Serialize(XmlDocument& document, std::uint32_t* length) noexcept {
  XmlOutput& output = document.output();
  output.buffer.Reset();
  output.length = Write(document, CountingOutput(0)).length();
  if (length != nullptr) *length = output.length;
  if (output.length == UINT32_MAX) return nullptr;
  output.buffer = device::LocalBlock<char>(
      static_cast<char*>(LocalAlloc(LMEM_FIXED, std::size_t{output.length} + 1)));
  if (!output.buffer) return nullptr;
  *Write(document, CopyingOutput(output.buffer.get())).position() = '\0';
  return output.buffer.get();
}

}  // namespace xml
