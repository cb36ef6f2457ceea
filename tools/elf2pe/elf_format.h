// The records of a 32-bit ELF file for ARM, as far as a linked image has them.
#pragma once

#include <array>
#include <cstdint>
#include <string_view>

#include "tools/elf2pe/fields.h"

namespace elf2pe::elf {

inline constexpr std::string_view kMagic =
    "\x7f"
    "ELF";
inline constexpr char kClass32 = 1;
inline constexpr char kLittleEndian = 1;
inline constexpr std::uint32_t kVersion = 1;
inline constexpr std::uint16_t kExecutable = 2;
inline constexpr std::uint16_t kMachineArm = 40;

inline constexpr std::uint32_t kFlagsEabi5 = 0x05000000;
inline constexpr std::uint32_t kFlagSoftFloat = 0x00000200;

enum SectionType : std::uint32_t {
  kNull = 0,
  kProgramBits = 1,
  kSymbolTable = 2,
  kStringTable = 3,
  kRelocationsWithAddend = 4,
  kNoBits = 8,
  kRelocations = 9,
};

inline constexpr std::uint32_t kWrite = 0x1;
inline constexpr std::uint32_t kAllocate = 0x2;
inline constexpr std::uint32_t kExecute = 0x4;
inline constexpr std::uint32_t kMerge = 0x10;
inline constexpr std::uint32_t kStrings = 0x20;
inline constexpr std::uint32_t kInfoLink = 0x40;
inline constexpr std::uint32_t kLinkOrder = 0x80;

inline constexpr std::uint16_t kSectionUndefined = 0;
inline constexpr std::uint16_t kSectionAbsolute = 0xFFF1;

enum Binding : std::uint8_t { kLocal = 0, kGlobal = 1, kWeak = 2 };

enum SymbolType : std::uint8_t {
  kNoType = 0,
  kObject = 1,
  kFunction = 2,
  kSection = 3,
  kFile = 4,
};

enum RelocationType : std::uint8_t {
  kArmNone = 0,
  kArmPc24 = 1,
  kArmAbs32 = 2,
  kArmRel32 = 3,
  kArmCall = 28,
  kArmJump24 = 29,
  kArmTarget1 = 38,
  kArmV4Bx = 40,
  kArmTarget2 = 41,
  kArmPrel31 = 42,
};

struct FileHeader {
  std::array<char, 4> magic{'\x7f', 'E', 'L', 'F'};
  std::array<char, 12> identity{kClass32, kLittleEndian, 1};
  std::uint16_t type = kExecutable;
  std::uint16_t machine = kMachineArm;
  std::uint32_t version = kVersion;
  std::uint32_t entry = 0;
  std::uint32_t segments_offset = 0;
  std::uint32_t sections_offset = 0;
  std::uint32_t flags = kFlagsEabi5 | kFlagSoftFloat;
  std::uint16_t header_size = 52;
  std::uint16_t segment_size = 32;
  std::uint16_t segment_count = 0;
  std::uint16_t section_size = 40;
  std::uint16_t section_count = 0;
  std::uint16_t names_section = 0;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.magic);
    io(self.identity);
    io(self.type);
    io(self.machine);
    io(self.version);
    io(self.entry);
    io(self.segments_offset);
    io(self.sections_offset);
    io(self.flags);
    io(self.header_size);
    io(self.segment_size);
    io(self.segment_count);
    io(self.section_size);
    io(self.section_count);
    io(self.names_section);
  }
};
static_assert(SizeInFile<FileHeader>() == 52);

struct SectionHeader {
  std::uint32_t name = 0;
  std::uint32_t type = kNull;
  std::uint32_t flags = 0;
  std::uint32_t address = 0;
  std::uint32_t offset = 0;
  std::uint32_t size = 0;
  std::uint32_t link = 0;
  std::uint32_t info = 0;
  std::uint32_t alignment = 0;
  std::uint32_t entry_size = 0;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.name);
    io(self.type);
    io(self.flags);
    io(self.address);
    io(self.offset);
    io(self.size);
    io(self.link);
    io(self.info);
    io(self.alignment);
    io(self.entry_size);
  }
};
static_assert(SizeInFile<SectionHeader>() == 40);

struct Symbol {
  std::uint32_t name = 0;
  std::uint32_t value = 0;
  std::uint32_t size = 0;
  std::uint8_t info = 0;  ///< binding in the upper four bits, type in the others
  std::uint8_t other = 0;
  std::uint16_t section = kSectionUndefined;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.name);
    io(self.value);
    io(self.size);
    io(self.info);
    io(self.other);
    io(self.section);
  }
};
static_assert(SizeInFile<Symbol>() == 16);

struct Relocation {
  std::uint32_t address = 0;
  std::uint32_t info = 0;  ///< symbol in the upper 24 bits, type in the others

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.address);
    io(self.info);
  }
};
static_assert(SizeInFile<Relocation>() == 8);

}  // namespace elf2pe::elf
