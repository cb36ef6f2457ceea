// What a DLL says of itself, as text.
#pragma once

#include <iosfwd>

#include "tools/elf2pe/pe_reader.h"

namespace loader {

/// Sections, exports and imports, one a line; imports that no device here has are marked.
void List(const elf2pe::PeImage& image, std::ostream& out);

}  // namespace loader
