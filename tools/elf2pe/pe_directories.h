// What the directories of a PE file name: exports, imports, relocations. Part of the strict reader.
#pragma once

#include <cstdint>

#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_reader.h"

namespace elf2pe {

/// Whether the file has all of the `size` bytes at an RVA in this section.
[[nodiscard]] bool HasBytes(const PeSection& section, std::uint32_t rva, std::uint32_t size);

/// Reads all directories of an image whose sections have been read. Throws Refusal.
void ReadDirectories(const pe::OptionalHeader& header, PeImage& image);

}  // namespace elf2pe
