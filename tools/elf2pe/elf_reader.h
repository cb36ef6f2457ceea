// Takes a linked ELF file apart. Knows the format, and nothing of what becomes of the parts.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "tools/elf2pe/elf_format.h"
#include "tools/elf2pe/refusal.h"

namespace elf2pe {

struct ElfSection {
  std::string_view name;
  elf::SectionHeader header;
  std::string_view bytes;  ///< empty for a section without content in the file

  [[nodiscard]] bool allocated() const { return (header.flags & elf::kAllocate) != 0; }
  /// Whether `address` lies in it, or is its end.
  [[nodiscard]] bool Reaches(std::uint32_t address) const {
    return address >= header.address && address - header.address <= header.size;
  }
};

struct ElfSymbol {
  std::string_view name;
  std::uint32_t value = 0;
  std::uint8_t binding = elf::kLocal;
  std::uint8_t type = elf::kNoType;
  std::uint16_t section = elf::kSectionUndefined;
};

struct ElfRelocation {
  std::uint32_t address = 0;
  std::uint8_t type = elf::kArmNone;
  std::uint32_t symbol = 0;  ///< index
};

/// The relocations of one section.
struct ElfRelocations {
  std::size_t section = 0;  ///< index
  std::vector<ElfRelocation> entries;
};

/// A linked image. Views into the bytes that were read, which outlive it.
struct ElfImage {
  std::uint32_t entry = 0;
  std::vector<ElfSection> sections;         ///< by index; the first is empty
  std::vector<ElfSymbol> symbols;           ///< by index; the first is empty
  std::vector<ElfRelocations> relocations;  ///< of allocated sections
};

/// Throws Refusal unless the file is a static 32-bit ARM image whose headers tell the truth.
[[nodiscard]] ElfImage ReadElf(std::string_view bytes);

}  // namespace elf2pe
