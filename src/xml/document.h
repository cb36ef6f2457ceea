// XML documents: a tree of elements with attributes and texts, made from a text or by calls.
//
// Deliberately small: no namespaces, no document types, no CDATA sections, five entities, and 64
// levels. What the parser accepts stands in docs/formats/xml.md.
#pragma once

#include <cstddef>
#include <cstdint>

#include "device/local_memory.h"
#include "xml/element.h"
#include "xml/storage.h"

namespace xml {

/// Elements that may be open inside one another. The innermost may still hold empty elements.
inline constexpr std::uint32_t kMaxOpenElements = 64;

/// Why a text was refused. The numbers appear in logs; there is no 9.
enum class XmlParseError : std::uint8_t {
  kNone = 0,
  kNoTag = 1,                  ///< the text ends where a tag was expected, or there is no text
  kTooDeep = 2,                ///< more than kMaxOpenElements open elements
  kNoOpenElement = 3,          ///< an end tag, and nothing is open
  kNoRoot = 4,                 ///< kept for its number: a text without a root ends in kNoTag
  kUnclosedTag = 5,            ///< the text ends inside a tag, or an end tag lacks its ">"
  kWrongEndTag = 6,            ///< an end tag with another name than the open element's
  kUnclosedComment = 7,        ///< no "-->"
  kAttributeWithoutValue = 8,  ///< an attribute without "=", or a value that is not closed
  kValueNotQuoted = 10,        ///< an attribute's value does not begin with a quote
  kOutOfMemory = 11,
  kSlashNotClosed = 12,  ///< "/" in a tag, and not directly a ">" behind it
};

/// How a parsed text was laid out; bits of XmlDocument::format_flags().
enum FormatFlag : std::uint8_t {
  kFormatLineFeed = 1,
  kFormatCarriageReturn = 2,  ///< before a line feed
  kFormatTab = 4,             ///< directly behind a line feed
  kFormatBlank = 8,           ///< directly behind a line feed
  kFormatByteOrderMark = 16,  ///< the text begins with UTF-8's
};

class XmlDocument;

/// Takes one piece of a written document. The bytes are only valid during the call.
using XmlSink = void (*)(XmlDocument& document, const char* bytes, std::uint32_t length) noexcept;

/// Where the writer puts its output; see xml/writer.h.
struct XmlOutput {
  XmlSink sink = nullptr;           ///< takes the pieces
  device::LocalBlock<char> buffer;  ///< result of the last Serialize()
  char* position = nullptr;         ///< where CopyingSink puts the next piece
  /// Bytes counted by the last Serialize(). After a failed LoadFromText(): the error's offset.
  std::uint32_t length = 0;
};

/// One document. Owns everything in it: every name, value, text, element and written output lives
/// until the document is cleared, loaded again or destroyed.
///
/// All memory comes from LocalAlloc, in few large blocks. One thread at a time; documents are
/// independent of each other.
class XmlDocument {
 public:
  XmlDocument() noexcept = default;
  ~XmlDocument() = default;
  XmlDocument(const XmlDocument&) = delete;
  XmlDocument& operator=(const XmlDocument&) = delete;

  /// Frees everything. The document is as new; only the sink stays.
  void Clear() noexcept;

  /// Starts a document with a single element; what was there before is cleared, and the name must
  /// not come from there.
  /// @return the document's copy of the name; null, with the document empty, when there is no
  ///   memory or no name.
  const char* NewDocument(const char* root_name) noexcept;

  /// Copies `length` bytes and parses the copy in place, in time proportional to the length. What
  /// was there before is cleared, and the text must not come from there. Any bytes may come; a zero
  /// byte ends the text.
  /// @return false, without a root and with last_error() and error_offset() set, when the text is
  ///   refused or there is no memory.
  bool LoadFromText(const char* text, std::size_t length) noexcept;

  /// Null: the document is empty.
  [[nodiscard]] XmlElement* root() const noexcept { return root_; }

  /// Of the last LoadFromText().
  [[nodiscard]] XmlParseError last_error() const noexcept { return last_error_; }

  /// Where the parser stopped, after a failed LoadFromText() and until the document is written:
  /// bytes from the start of the text.
  ///
  /// KEPT ODDITY: the place of an error is counted in the decoded text, in which every entity
  /// before it is the one byte that it became.
  [[nodiscard]] std::uint32_t error_offset() const noexcept { return output_.length; }

  /// FormatFlag bits; 0 for a document made by calls.
  [[nodiscard]] std::uint8_t format_flags() const noexcept { return format_flags_; }

  /// Bytes of an element on the device, wherever this runs.
  [[nodiscard]] std::uint16_t element_size() const noexcept { return element_size_; }

  /// What the tree takes of the heap, in bytes; written output is not counted.
  [[nodiscard]] std::size_t MemoryInUse() const noexcept { return storage_.MemoryInUse(); }

  [[nodiscard]] XmlOutput& output() noexcept { return output_; }

 private:
  friend class XmlCursor;  // edits the tree

  [[nodiscard]] XmlElement* NewElement(const char* name) noexcept;

  XmlOutput output_;
  XmlElement* root_ = nullptr;
  Storage storage_;
  std::uint16_t element_size_ = 24;
  std::uint8_t format_flags_ = 0;
  XmlParseError last_error_ = XmlParseError::kNone;
};

/// What XmlCursor::Next() found.
enum class XmlStep : std::uint8_t {
  kOver = 0,   ///< the walk is over; the cursor is back where it began
  kStart = 1,  ///< the cursor stands at the start of an element
  kEnd = 2,    ///< the cursor stands at the end of an element
};

/// Where XmlCursor::AddElement() puts the new element, seen from the current one.
enum class Place : std::uint8_t {
  kAfter = 0,
  kFirstSibling = 1,
  kLastSibling = 2,
  kFirstChild = 3,
  kLastChild = 4,
};

/// A position in a document, from which the tree is walked and edited. A plain value: copy it to
/// remember a place. It must not outlive its document, and dies with its contents.
///
/// Moves answer true, or false where there is nothing to move to; the cursor then stays as it is.
///
/// A walk over everything below an element:
///
///     if (cursor.BeginChildren()) {
///       do {
///         // the current element starts, or ends for the second answer
///       } while ((step = cursor.Next()) != XmlStep::kOver);
///     }
class XmlCursor {
 public:
  /// Back to nowhere.
  void Reset() noexcept { *this = XmlCursor(); }

  /// To the root of `document`; false when it has none.
  bool Attach(XmlDocument* document) noexcept;
  bool FirstChild() noexcept;
  bool Parent() noexcept;

  /// Begins a walk over all that is below the current element, which Next() continues. The cursor
  /// moves to the first child, which starts; false when there is none.
  bool BeginChildren() noexcept;

  /// The walk's next stop, depth first: every element starts and ends once, one without children
  /// too. kOver is given when the element where the walk began is reached again; a further call
  /// would begin anew, so every loop stops there.
  XmlStep Next() noexcept;

  /// Of the current element; empty when there is none.
  [[nodiscard]] const char* Name() const noexcept;
  /// Of the current element; null when it has none.
  [[nodiscard]] const char* Text() const noexcept;
  /// The value of the current element's first attribute of that name, in exactly these letters;
  /// null when there is none.
  [[nodiscard]] const char* Attribute(const char* name) const noexcept;

  /// Gives the current element a copy of the text; null or an empty text takes its text away. A
  /// text that the element has already is left alone.
  /// @return the stored text, or an empty one when it was taken away. Null, with nothing changed,
  ///   when the element has children, there is no current element or no memory.
  const char* SetText(const char* text) noexcept;

  /// Replaces the first attribute of that name or adds one behind the others; a null value takes
  /// it away. A value that the attribute has already is left alone.
  /// @return the stored value, or an empty text when it was taken away. Null, with nothing
  ///   changed, when there is no current element, no name or no memory.
  const char* SetAttribute(const char* name, const char* value) noexcept;

  /// Adds an element and moves to it. A parent's text is dropped: it has a child now.
  /// @return false, with nothing changed, for a sibling of the root, an unknown place, no current
  ///   element, no name or no memory.
  bool AddElement(const char* name, Place place) noexcept;

  /// Null: the cursor is nowhere.
  [[nodiscard]] XmlElement* element() const noexcept { return element_; }
  /// Levels below the root.
  [[nodiscard]] std::uint16_t depth() const noexcept { return depth_; }

 private:
  [[nodiscard]] XmlAttribute* NewAttribute(const char* name, const char* value) noexcept;

  XmlDocument* document_ = nullptr;
  XmlElement* element_ = nullptr;
  std::uint16_t depth_ = 0;
  std::uint16_t saved_depth_ = 0;  ///< of the element where the walk began
  bool entered_ = false;           ///< the current element has started, its children come next
};

}  // namespace xml
