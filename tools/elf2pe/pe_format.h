// What a Windows CE 5.0 DLL for 32-bit ARM is made of: the records of a PE file and the one set of
// header values that the converter writes and the reader takes.
//
// Words used here: an *RVA* counts from the start of the image in memory, an *offset* from the
// start of the file, an *address* from 0.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "tools/elf2pe/fields.h"

namespace elf2pe::pe {

// ---- values ----

inline constexpr std::uint16_t kDosMagic = 0x5A4D;       // "MZ"
inline constexpr std::uint32_t kSignature = 0x00004550;  // "PE" and two zeros
inline constexpr std::uint16_t kMachineArm = 0x01C0;
inline constexpr std::uint16_t kMachineThumb = 0x01C2;  // ARM code that Thumb code may call
inline constexpr std::uint16_t kOptionalMagic = 0x010B;
inline constexpr std::uint16_t kSubsystemWindowsCe = 9;
inline constexpr std::uint16_t kSystemMajor = 5;
inline constexpr std::uint16_t kSystemMinor = 0;

// DLL, 32 bits, executable, no line numbers or local symbols; with relocations.
inline constexpr std::uint16_t kCharacteristics = 0x210E;

inline constexpr std::uint32_t kImageBase = 0x10000000;
inline constexpr std::uint32_t kImageBaseStep = 0x10000;
inline constexpr std::uint32_t kSectionAlignment = 0x1000;
inline constexpr std::uint32_t kFileAlignment = 0x200;

/// No image of this kind comes near it, and all its branches reach.
inline constexpr std::uint32_t kMaxImageSize = 16U << 20;
inline constexpr std::size_t kMaxSections = 16;

enum Directory : std::size_t {
  kExportDirectory = 0,
  kImportDirectory = 1,
  kResourceDirectory = 2,
  kRelocationDirectory = 5,
  kIatDirectory = 12,  ///< import address table
  kDirectories = 16,
};

// Characteristics of sections
inline constexpr std::uint32_t kCode = 0x00000020;
inline constexpr std::uint32_t kInitializedData = 0x00000040;
inline constexpr std::uint32_t kDiscardable = 0x02000000;
inline constexpr std::uint32_t kExecute = 0x20000000;
inline constexpr std::uint32_t kRead = 0x40000000;
inline constexpr std::uint32_t kWrite = 0x80000000;

struct SectionKind {
  const char* name;
  std::uint32_t characteristics;
};

/// Every section that there may be, in the order of the file.
inline constexpr SectionKind kSectionKinds[] = {
    {".text", kCode | kExecute | kRead},
    {".rdata", kInitializedData | kRead},
    {".data", kInitializedData | kRead | kWrite},
    {".edata", kInitializedData | kRead},
    {".idata", kInitializedData | kRead | kWrite},
    {".rsrc", kInitializedData | kRead},
    {".reloc", kInitializedData | kRead | kDiscardable},
};

// A fixup: kind in the upper four bits, offset within the page in the others.
inline constexpr std::uint16_t kFixupAbsolute = 0;  ///< fills a block up
inline constexpr std::uint16_t kFixupHighLow = 3;   ///< a whole 32-bit word
inline constexpr unsigned kFixupKindShift = 12;
inline constexpr std::uint16_t kFixupOffsetMask = 0x0FFF;

inline constexpr std::uint32_t kImportByOrdinal = 0x80000000;

// ---- records ----

struct DosHeader {
  std::uint16_t magic = kDosMagic;
  std::array<std::uint16_t, 29> program{};  ///< what the DOS program in front of the image needs
  std::uint32_t pe_offset = 0;              ///< of the signature

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.magic);
    for (auto& word : self.program) io(word);
    io(self.pe_offset);
  }
};
static_assert(SizeInFile<DosHeader>() == 64);

struct FileHeader {
  std::uint16_t machine = kMachineArm;
  std::uint16_t section_count = 0;
  std::uint32_t time_stamp = 0;
  std::uint32_t symbol_table = 0;
  std::uint32_t symbol_count = 0;
  std::uint16_t optional_header_size = 0;
  std::uint16_t characteristics = kCharacteristics;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.machine);
    io(self.section_count);
    io(self.time_stamp);
    io(self.symbol_table);
    io(self.symbol_count);
    io(self.optional_header_size);
    io(self.characteristics);
  }
};
static_assert(SizeInFile<FileHeader>() == 20);

struct DirectoryEntry {
  std::uint32_t rva = 0;
  std::uint32_t size = 0;
};

struct OptionalHeader {
  std::uint16_t magic = kOptionalMagic;
  std::uint16_t linker_version = 0;
  std::uint32_t code_size = 0;
  std::uint32_t initialized_size = 0;
  std::uint32_t uninitialized_size = 0;
  std::uint32_t entry = 0;  ///< RVA
  std::uint32_t code_base = 0;
  std::uint32_t data_base = 0;
  std::uint32_t image_base = kImageBase;
  std::uint32_t section_alignment = kSectionAlignment;
  std::uint32_t file_alignment = kFileAlignment;
  std::uint16_t system_major = kSystemMajor;
  std::uint16_t system_minor = kSystemMinor;
  std::uint16_t image_major = 0;
  std::uint16_t image_minor = 0;
  std::uint16_t subsystem_major = kSystemMajor;
  std::uint16_t subsystem_minor = kSystemMinor;
  std::uint32_t reserved = 0;
  std::uint32_t image_size = 0;    ///< in memory, whole pages
  std::uint32_t headers_size = 0;  ///< in the file, aligned
  std::uint32_t checksum = 0;
  std::uint16_t subsystem = kSubsystemWindowsCe;
  std::uint16_t dll_characteristics = 0;
  std::uint32_t stack_reserve = 0x10000;
  std::uint32_t stack_commit = 0x1000;
  std::uint32_t heap_reserve = 0x100000;
  std::uint32_t heap_commit = 0x1000;
  std::uint32_t loader_flags = 0;
  std::uint32_t directory_count = kDirectories;
  std::array<DirectoryEntry, kDirectories> directories{};

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.magic);
    io(self.linker_version);
    io(self.code_size);
    io(self.initialized_size);
    io(self.uninitialized_size);
    io(self.entry);
    io(self.code_base);
    io(self.data_base);
    io(self.image_base);
    io(self.section_alignment);
    io(self.file_alignment);
    io(self.system_major);
    io(self.system_minor);
    io(self.image_major);
    io(self.image_minor);
    io(self.subsystem_major);
    io(self.subsystem_minor);
    io(self.reserved);
    io(self.image_size);
    io(self.headers_size);
    io(self.checksum);
    io(self.subsystem);
    io(self.dll_characteristics);
    io(self.stack_reserve);
    io(self.stack_commit);
    io(self.heap_reserve);
    io(self.heap_commit);
    io(self.loader_flags);
    io(self.directory_count);
    for (auto& directory : self.directories) {
      io(directory.rva);
      io(directory.size);
    }
  }
};
static_assert(SizeInFile<OptionalHeader>() == 224);

/// From the start of the optional header to its checksum.
inline constexpr std::size_t kChecksumOffset = 64;

struct SectionHeader {
  std::array<char, 8> name{};      ///< filled up with zeros
  std::uint32_t virtual_size = 0;  ///< in memory; what is not in the file is zero
  std::uint32_t rva = 0;
  std::uint32_t raw_size = 0;  ///< in the file, aligned
  std::uint32_t raw_offset = 0;
  std::uint32_t relocations_offset = 0;
  std::uint32_t lines_offset = 0;
  std::uint16_t relocation_count = 0;
  std::uint16_t line_count = 0;
  std::uint32_t characteristics = 0;

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.name);
    io(self.virtual_size);
    io(self.rva);
    io(self.raw_size);
    io(self.raw_offset);
    io(self.relocations_offset);
    io(self.lines_offset);
    io(self.relocation_count);
    io(self.line_count);
    io(self.characteristics);
  }
};
static_assert(SizeInFile<SectionHeader>() == 40);

struct ExportTable {
  std::uint32_t characteristics = 0;
  std::uint32_t time_stamp = 0;
  std::uint32_t version = 0;
  std::uint32_t dll_name = 0;  ///< RVA
  std::uint32_t ordinal_base = 1;
  std::uint32_t function_count = 0;
  std::uint32_t name_count = 0;
  std::uint32_t functions = 0;  ///< RVA of 32-bit RVAs, one a function
  std::uint32_t names = 0;      ///< RVA of 32-bit RVAs of texts, sorted by their bytes
  std::uint32_t ordinals = 0;   ///< RVA of 16-bit indices into `functions`, one a name

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.characteristics);
    io(self.time_stamp);
    io(self.version);
    io(self.dll_name);
    io(self.ordinal_base);
    io(self.function_count);
    io(self.name_count);
    io(self.functions);
    io(self.names);
    io(self.ordinals);
  }
};
static_assert(SizeInFile<ExportTable>() == 40);

/// One DLL that is imported from; a record of zeros closes the list.
struct ImportDescriptor {
  std::uint32_t lookup_table = 0;  ///< RVA of 32-bit RVAs of hint and name, closed by a zero
  std::uint32_t time_stamp = 0;    ///< 0: not bound
  std::uint32_t forwarder_chain = 0;
  std::uint32_t dll_name = 0;       ///< RVA
  std::uint32_t address_table = 0;  ///< RVA; as `lookup_table` until the loader fills it

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.lookup_table);
    io(self.time_stamp);
    io(self.forwarder_chain);
    io(self.dll_name);
    io(self.address_table);
  }
};
static_assert(SizeInFile<ImportDescriptor>() == 20);

/// The fixups of one page; 16-bit words follow, one a fixup.
struct FixupBlock {
  std::uint32_t page = 0;  ///< RVA
  std::uint32_t size = 0;  ///< bytes, this record included

  template <typename Self, typename Io>
  static constexpr void Fields(Self& self, Io& io) {
    io(self.page);
    io(self.size);
  }
};
static_assert(SizeInFile<FixupBlock>() == 8);

}  // namespace elf2pe::pe
