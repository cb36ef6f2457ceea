// The contents of the sections of a DLL that the linker knows nothing of.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_reader.h"

namespace elf2pe {

/// Content of .edata.
/// @param rva      of the section
/// @param exports  sorted by the bytes of their names; their ordinals count from 1 in this order
[[nodiscard]] std::string ExportSection(std::uint32_t rva, std::string_view dll_name,
                                        const std::vector<PeExport>& exports);

/// Content of .idata, and what the header says of it.
struct ImportSection {
  std::string bytes;
  pe::DirectoryEntry descriptors;
  pe::DirectoryEntry address_tables;
};

/// @param rva      of the section
/// @param imports  at least one, each of at least one function; receives the slots
[[nodiscard]] ImportSection MakeImportSection(std::uint32_t rva,
                                              std::vector<PeImportedDll>& imports);

/// Content of .reloc.
/// @param words  RVAs of words that hold addresses, ascending
[[nodiscard]] std::string RelocationSection(const std::vector<std::uint32_t>& words);

}  // namespace elf2pe
