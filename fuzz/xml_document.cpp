// Input: the text of a document, any bytes. Checks what users of documents rely on: trees are
// sound, walks end, and what is written is read again as the same tree.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "xml/document.h"
#include "xml/writer.h"

namespace {

using xml::XmlCursor;
using xml::XmlDocument;
using xml::XmlParseError;
using xml::XmlStep;

void Require(bool holds) {
  if (!holds) std::abort();
}

/// Adds an element, without its children, to a list of everything that a tree says.
void Tell(const XmlCursor& at, std::string& story) {
  story.append(at.Name()).push_back('\0');
  const xml::XmlElement& element = *at.element();
  Require(element.text == nullptr || (*element.text != '\0' && element.first_child == nullptr));
  if (element.text != nullptr) story.append("|").append(element.text).push_back('\0');
  for (const auto* attribute = element.first_attribute; attribute != nullptr;
       attribute = attribute->next) {
    story.append("[").append(attribute->name).push_back('\0');
    story.append(attribute->value).push_back('\0');
    // The first attribute of a name is the one that is found.
    Require(at.Attribute(attribute->name) != nullptr);
  }
}

std::string StoryOf(XmlDocument& document) {
  XmlCursor cursor;
  Require(cursor.Attach(&document));
  std::string story;
  Tell(cursor, story);
  if (!cursor.BeginChildren()) return story;
  int open = 0;
  XmlStep step = XmlStep::kStart;
  do {
    Require(cursor.depth() >= 1 && cursor.depth() <= xml::kMaxOpenElements);
    if (step == XmlStep::kStart) {
      ++open;
      Tell(cursor, story);
    } else {
      --open;
      story.push_back(')');
    }
    Require(open >= 0);
    step = cursor.Next();
  } while (step != XmlStep::kOver);
  Require(open == 0 && cursor.element() == document.root() && cursor.depth() == 0);
  return story;
}

bool Load(XmlDocument& document, std::string_view text) {
  const bool loaded = document.LoadFromText(text.data(), text.size());
  const auto error = static_cast<int>(document.last_error());
  Require(loaded == (error == 0) && loaded == (document.root() != nullptr));
  Require(error <= 12 && error != 4 && error != 9 && error != 11);
  Require(document.error_offset() <= text.size());
  return loaded;
}

/// Blanks in front change nothing. They make the copy fill its block to the last byte, so that the
/// address sanitizer sees any reading behind it.
void CheckAtTheEndOfABlock(XmlDocument& document, std::string_view text) {
  const std::size_t length = text.size() + 1;
  const std::string moved = std::string((256 - length % 256) % 256, ' ') + std::string(text);
  const XmlParseError error = document.last_error();
  XmlDocument again;
  Load(again, moved);
  Require(again.last_error() == error);
  if (error == XmlParseError::kNone) Require(StoryOf(again) == StoryOf(document));
}

/// An element with neither name nor content is written as "</>", which is an end tag. Only a text
/// that nobody calls XML has one.
bool HasNothingAtAll(const xml::XmlElement& element) {
  return *element.name == '\0' && element.text == nullptr && element.first_child == nullptr &&
         element.first_attribute == nullptr;
}

bool CanBeReadAgain(XmlDocument& document) {
  XmlCursor cursor;
  Require(cursor.Attach(&document));
  if (!cursor.BeginChildren()) return !HasNothingAtAll(*document.root());
  do {
    if (HasNothingAtAll(*cursor.element())) return false;
  } while (cursor.Next() != XmlStep::kOver);
  return true;
}

void CheckWriting(XmlDocument& document) {
  const std::string story = StoryOf(document);
  std::uint32_t length = 0;
  const char* const written = xml::Serialize(document, &length);
  Require(written != nullptr && std::strlen(written) == length);
  if (!CanBeReadAgain(document)) return;
  XmlDocument again;
  Require(Load(again, {written, length}));
  Require(StoryOf(again) == story);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  XmlDocument document;
  const bool loaded = Load(document, text);
  CheckAtTheEndOfABlock(document, text);
  if (loaded) CheckWriting(document);
  return 0;
}
