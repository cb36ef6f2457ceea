// A writer of small ELF images, and one image that has some of everything.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/elf_format.h"

namespace elf2pe {

/// Everything stands open, for tests that spoil one thing and see what the converter says.
struct ElfFile {
  struct Section {
    std::string name;
    elf::SectionHeader header;  ///< name, offset and, unless `keep_size`, size are filled in
    std::string bytes;
    bool keep_size = false;
    bool keep_offset = false;
  };
  struct Symbol {
    std::string name;
    elf::Symbol record;
  };
  struct Relocation {
    std::uint32_t address;
    std::uint32_t type;
    std::uint32_t symbol;  ///< index
  };
  struct RelocationTable {
    std::uint32_t section;  ///< index of the relocated one
    std::vector<Relocation> entries;
    std::uint32_t type = elf::kRelocations;
  };

  elf::FileHeader header;  ///< places and numbers of sections are filled in
  std::vector<Section> sections{1};
  std::vector<Symbol> symbols{1};
  std::vector<RelocationTable> relocations;

  /// @return its index
  std::uint32_t AddSection(std::string name, std::uint32_t flags, std::uint32_t address,
                           std::string bytes);
  std::uint32_t AddZeros(std::string name, std::uint32_t address, std::uint32_t size);
  std::uint32_t AddSymbol(std::string name, std::uint32_t section, std::uint32_t value,
                          std::uint8_t binding = elf::kGlobal, std::uint8_t type = elf::kFunction);
  void Relocate(std::uint32_t section, std::uint32_t address, std::uint32_t type,
                std::uint32_t symbol);

  Section& Named(std::string_view name);
  Symbol& SymbolNamed(std::string_view name);

  [[nodiscard]] std::string Bytes() const;
};

/// Words, as bytes.
[[nodiscard]] std::string Words(const std::vector<std::uint32_t>& words);

/// What a linker might leave at `base`: code that calls, reads a constant and goes through two
/// import slots; constants and data with addresses in them; zeros; slots of two DLLs.
///
///     base + 0x1000  .text   +0 entry, +8 Alpha, +16 Beta, +32 words with addresses
///            0x2000  .rdata  +0 address of Alpha, then a text
///            0x3000  .data   +0 address of the end of .bss
///            0x4000  .bss    0x1800 bytes; Counter at its start
///            0x6000  slots of COREDLL.dll: GetTickCount, Sleep
///            0x7000  slot of WS2.dll: send
[[nodiscard]] ElfFile ToyImage(std::uint32_t base = 0x10000000);

}  // namespace elf2pe
