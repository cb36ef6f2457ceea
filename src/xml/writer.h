// Documents as text.
#pragma once

#include <cstdint>

#include "xml/document.h"

namespace xml {

/// Hands the document, piece by piece, to its output's sink. A parsed document is laid out in the
/// style of its text (byte-order mark, line ends, one tab or blank per level); one made by calls is
/// a single line. A document without a root is its declaration alone; without a sink nothing
/// happens. No recursion, no memory.
///
/// Names are written as they are. One that is empty, or has characters that a name cannot have,
/// makes a text that LoadFromText() refuses or understands in another way.
///
/// Levels beyond kMaxOpenElements, which only calls can make, are not indented any further.
void WriteToSink(XmlDocument& document) noexcept;

/// A sink that adds the length of every piece to the output's length. A sum that 32 bits cannot
/// hold stays at their largest value.
void CountingSink(XmlDocument& document, const char* bytes, std::uint32_t length) noexcept;

/// A sink that copies every piece to the output's position, which has the room, and moves it on.
/// WriteToSink() writes nothing without a position.
void CopyingSink(XmlDocument& document, const char* bytes, std::uint32_t length) noexcept;

/// The document as text, with a zero behind it, in one block of exactly its size. The output's sink
/// and position stay as they are.
///
/// @param length  when given, receives the bytes without the zero, even if there is no memory
/// @return null when there is no memory, or the text would be larger than any memory. The text
///   belongs to the document and lives until it is serialised again or cleared.
const char* Serialize(XmlDocument& document, std::uint32_t* length = nullptr) noexcept;

}  // namespace xml
