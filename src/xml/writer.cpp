#include "xml/writer.h"

#include <cstddef>
#include <cstring>

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

class Writer {
 public:
  explicit Writer(XmlDocument& document) noexcept
      : document_(document), layout_(document.format_flags()) {}

  void Run();

 private:
  void Emit(std::string_view piece) {
    if (!piece.empty()) {
      document_.output().sink(document_, piece.data(), static_cast<std::uint32_t>(piece.size()));
    }
  }
  void EmitEscaped(const char* text);
  void WriteStart(const XmlElement& element);
  void WriteEnd(const XmlElement& element);
  void WriteTree(const XmlElement* element);

  XmlDocument& document_;
  const Layout layout_;
};

const Entity* EntityFor(char byte) noexcept {
  for (const Entity& entity : kEntities) {
    if (entity.byte == byte) return &entity;
  }
  return nullptr;
}

void Writer::EmitEscaped(const char* text) {
  const char* run = text;
  for (const char* at = text;; ++at) {
    const Entity* const entity = EntityFor(*at);
    if (entity == nullptr && *at != '\0') continue;
    Emit({run, static_cast<std::size_t>(at - run)});
    if (entity == nullptr) return;
    Emit(entity->text);
    run = at + 1;
  }
}

void Writer::WriteStart(const XmlElement& element) {
  Emit("<");
  Emit(element.name);
  for (const XmlAttribute* at = element.first_attribute; at != nullptr; at = at->next) {
    Emit(" ");
    Emit(at->name);
    Emit("=\"");
    EmitEscaped(at->value);
    Emit("\"");
  }
}

void Writer::WriteEnd(const XmlElement& element) {
  Emit("</");
  Emit(element.name);
  Emit(">");
}

/// Depth first, back up along the links to the parents.
void Writer::WriteTree(const XmlElement* element) {
  std::size_t level = 0;
  for (;;) {
    WriteStart(*element);
    if (element->first_child != nullptr) {
      Emit(">");
      Emit(layout_.Line(++level));
      element = element->first_child;
      continue;
    }
    if (element->text == nullptr || *element->text == '\0') {
      Emit("/>");
    } else {
      Emit(">");
      EmitEscaped(element->text);
      WriteEnd(*element);
    }
    while (level > 0 && element->next_sibling == nullptr) {
      element = element->parent;
      Emit(layout_.Line(--level));
      WriteEnd(*element);
    }
    if (level == 0) return;
    Emit(layout_.Line(level));
    element = element->next_sibling;
  }
}

void Writer::Run() {
  if ((document_.format_flags() & kFormatByteOrderMark) != 0) Emit(kByteOrderMark);
  Emit(kDeclaration);
  Emit(layout_.Line(0));
  if (document_.root() != nullptr) WriteTree(document_.root());
}

/// Adds up; a sum that 32 bits cannot hold stays at their largest value.
void Count(XmlDocument& document, const char* /*bytes*/, std::uint32_t length) {
  std::uint32_t& sum = document.output().length;
  sum = length < UINT32_MAX - sum ? sum + length : UINT32_MAX;
}

void Copy(XmlDocument& document, const char* bytes, std::uint32_t length) {
  char*& position = document.output().position;
  std::memcpy(position, bytes, length);
  position += length;
}

}  // namespace

void WriteToSink(XmlDocument& document) {
  if (document.output().sink != nullptr) Writer(document).Run();
}

const char* Serialize(XmlDocument& document, std::uint32_t* length) {
  XmlOutput& output = document.output();
  output.buffer.Reset();
  output.length = 0;
  output.sink = Count;
  WriteToSink(document);
  if (length != nullptr) *length = output.length;
  if (output.length != UINT32_MAX) {
    output.buffer = device::LocalBlock<char>(
        static_cast<char*>(LocalAlloc(LMEM_FIXED, std::size_t{output.length} + 1)));
  }
  if (!output.buffer) return nullptr;
  output.position = output.buffer.get();
  output.sink = Copy;
  WriteToSink(document);
  *output.position = '\0';
  return output.buffer.get();
}

}  // namespace xml
