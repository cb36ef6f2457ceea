// The records of object files and import libraries, for linkers of the device's own tools.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "tools/elf2pe/fields.h"

namespace elf2pe::coff {

inline constexpr std::string_view kArchiveMagic = "!<arch>\n";

// An object file begins with pe::FileHeader and goes on with pe::SectionHeaders.
inline constexpr std::uint32_t kAlign2 = 0x00200000;
inline constexpr std::uint32_t kAlign4 = 0x00300000;
inline constexpr std::uint16_t kMachine32Bits = 0x0100;  ///< characteristics of a file
inline constexpr std::uint16_t kRelocationImageRelative = 2;

enum StorageClass : std::uint8_t { kExternal = 2, kStatic = 3, kSection = 0x68 };

struct Relocation {
  std::uint32_t at = 0;  ///< offset in the section
  std::uint32_t symbol = 0;
  std::uint16_t type = kRelocationImageRelative;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.at);
    io(self.symbol);
    io(self.type);
  }
};
static_assert(SizeInFile<Relocation>() == 10);

struct Symbol {
  std::uint32_t zeros = 0;
  std::uint32_t name = 0;  ///< offset in the texts behind the symbols, their size included
  std::uint32_t value = 0;
  std::uint16_t section = 0;  ///< counts from 1; 0: defined elsewhere
  std::uint16_t type = 0;
  std::uint8_t storage_class = kExternal;
  std::uint8_t auxiliary_count = 0;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.zeros);
    io(self.name);
    io(self.value);
    io(self.section);
    io(self.type);
    io(self.storage_class);
    io(self.auxiliary_count);
  }
};
static_assert(SizeInFile<Symbol>() == 18);

/// A member that stands for one function of a DLL; its name and the DLL's follow.
struct ImportHeader {
  std::uint16_t first_signature = 0;
  std::uint16_t second_signature = 0xFFFF;
  std::uint16_t version = 0;
  std::uint16_t machine = 0;
  std::uint32_t time_stamp = 0;
  std::uint32_t size = 0;  ///< bytes that follow
  std::uint16_t hint = 0;
  std::uint16_t kind = 0;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.first_signature);
    io(self.second_signature);
    io(self.version);
    io(self.machine);
    io(self.time_stamp);
    io(self.size);
    io(self.hint);
    io(self.kind);
  }
};
static_assert(SizeInFile<ImportHeader>() == 20);

/// Code, under the very name that the symbol has.
inline constexpr std::uint16_t kImportCodeByName = 1 << 2;

}  // namespace elf2pe::coff
