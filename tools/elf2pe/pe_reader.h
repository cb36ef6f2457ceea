// A strict reader of DLLs of the one kind that the converter writes.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/refusal.h"

namespace elf2pe {

struct PeSection {
  std::string name;
  std::uint32_t rva = 0;
  std::uint32_t virtual_size = 0;  ///< bytes in memory: those of the file, then zeros
  std::uint32_t characteristics = 0;
  std::string_view bytes;  ///< of the file that was read; at most `virtual_size`
};

struct PeExport {
  std::string name;
  std::uint32_t rva = 0;
};

struct PeImport {
  std::string name;
  std::uint32_t slot = 0;  ///< RVA of the word that the function's address goes into
};

struct PeImportedDll {
  std::string name;
  std::vector<PeImport> functions;
};

/// What a DLL says, checked. Views into the bytes that were read, which outlive it.
struct PeImage {
  std::uint16_t machine = 0;
  std::uint32_t image_base = 0;
  std::uint32_t image_size = 0;  ///< in memory, whole pages; all RVAs below lie within
  std::uint32_t entry = 0;       ///< RVA of a whole instruction in code
  std::string dll_name;          ///< that it gives itself; empty without exports
  std::string_view headers;      ///< what stands in front of the sections
  std::vector<PeSection> sections;
  std::vector<PeExport> exports;           ///< sorted by the bytes of their names
  std::vector<PeImportedDll> imports;      ///< in the order of the file
  std::vector<std::uint32_t> relocations;  ///< RVAs, ascending, of aligned words of the file
};

/// Throws Refusal for a file that is damaged, or of another kind in any respect: what this system
/// does not write need not be understood, only noticed.
[[nodiscard]] PeImage ReadPe(std::string_view bytes);

/// The image as it stands in memory at `base`: headers, sections, zeros, words relocated. Import
/// slots still hold what the file has in them.
[[nodiscard]] std::string MemoryImage(const PeImage& image, std::uint32_t base);

}  // namespace elf2pe
