#include "tools/elf2pe/elf_reader.h"

#include <algorithm>
#include <optional>
#include <string>

namespace elf2pe {
namespace {

constexpr std::size_t kMaxFile = 256U << 20;
constexpr std::size_t kMaxSections = 1024;
constexpr std::size_t kMaxSymbols = 1U << 20;
constexpr std::size_t kMaxRelocations = 1U << 20;

/// A text of a string table; nothing when it does not end within the table.
std::optional<std::string_view> TextAt(std::string_view table, std::uint32_t at) {
  if (at >= table.size()) return std::nullopt;
  const std::size_t end = table.find('\0', at);
  if (end == std::string_view::npos) return std::nullopt;
  return table.substr(at, end - at);
}

class ElfReader {
 public:
  explicit ElfReader(std::string_view bytes) : bytes_(bytes) {}

  ElfImage Read() {
    ReadFileHeader();
    ReadSections();
    NameSections();
    CheckPlaces();
    ReadSymbols();
    for (const ElfSection& section : image_.sections) ReadRelocations(section);
    return std::move(image_);
  }

 private:
  void ReadFileHeader() {
    if (bytes_.size() > kMaxFile) throw Refusal("the ELF file is too large");
    const auto header = Decode<elf::FileHeader>(bytes_, 0);
    if (!header || bytes_.substr(0, elf::kMagic.size()) != elf::kMagic) {
      throw Refusal("this is no ELF file");
    }
    header_ = *header;
    constexpr elf::FileHeader kKnown;
    if (header_.identity != kKnown.identity) {
      throw Refusal("the ELF file is not a 32-bit little-endian one of version 1 and no system");
    }
    if (header_.machine != elf::kMachineArm) {
      throw Refusal("the ELF file is for machine " + std::to_string(header_.machine) +
                    ", not for ARM (40)");
    }
    if (header_.type != elf::kExecutable) {
      throw Refusal("the ELF file is of type " + std::to_string(header_.type) +
                    ", not a linked image (2)");
    }
    if (header_.version != elf::kVersion || header_.header_size != kKnown.header_size ||
        header_.section_size != kKnown.section_size) {
      throw Refusal("the ELF file has headers of an unknown size or version");
    }
    if ((header_.flags & ~elf::kFlagSoftFloat) != elf::kFlagsEabi5) {
      throw Refusal("the ELF file has flags " + Hex(header_.flags) +
                    ", not those of software floating point in version 5 of the EABI");
    }
    image_.entry = header_.entry;
  }

  void ReadSections() {
    if (header_.section_count == 0 || header_.section_count > kMaxSections) {
      throw Refusal("the ELF file has " + std::to_string(header_.section_count) + " sections");
    }
    for (std::size_t i = 0; i < header_.section_count; ++i) {
      const std::size_t at = header_.sections_offset + i * header_.section_size;
      const auto header = Decode<elf::SectionHeader>(bytes_, at);
      if (!header) throw Refusal("the section headers lie behind the end of the ELF file");
      image_.sections.push_back({{}, *header, ContentOf(*header, i)});
    }
    if (image_.sections.front().header.type != elf::kNull) {
      throw Refusal("the first section of the ELF file is not the empty one");
    }
  }

  std::string_view ContentOf(const elf::SectionHeader& header, std::size_t index) const {
    if (header.type == elf::kNull || header.type == elf::kNoBits) return {};
    if (header.offset > bytes_.size() || header.size > bytes_.size() - header.offset) {
      throw Refusal("section " + std::to_string(index) + " lies behind the end of the ELF file");
    }
    return bytes_.substr(header.offset, header.size);
  }

  const ElfSection& Table(std::uint32_t index, elf::SectionType type, const char* what) const {
    if (index >= image_.sections.size() || image_.sections[index].header.type != type) {
      throw Refusal(std::string("the ELF file has no ") + what);
    }
    return image_.sections[index];
  }

  void NameSections() {
    const ElfSection& names =
        Table(header_.names_section, elf::kStringTable, "table of section names");
    for (ElfSection& section : image_.sections) {
      if (section.header.type == elf::kNull) continue;
      const auto name = TextAt(names.bytes, section.header.name);
      if (!name) throw Refusal("the name of a section lies outside the table of names");
      section.name = *name;
    }
  }

  /// No byte of the file may be two things.
  void CheckPlaces() const {
    struct Place {
      std::size_t begin;
      std::size_t end;
      std::string_view name;
    };
    std::vector<Place> places = {
        {0, SizeInFile<elf::FileHeader>(), "the file's header"},
        {header_.sections_offset,
         header_.sections_offset + image_.sections.size() * header_.section_size,
         "the section headers"}};
    for (const ElfSection& section : image_.sections) {
      if (section.bytes.empty()) continue;
      places.push_back(
          {section.header.offset, section.header.offset + section.bytes.size(), section.name});
    }
    std::sort(places.begin(), places.end(),
              [](const Place& a, const Place& b) { return a.begin < b.begin; });
    for (std::size_t i = 1; i < places.size(); ++i) {
      if (places[i].begin < places[i - 1].end) {
        throw Refusal(Shown(places[i - 1].name) + " and " + Shown(places[i].name) +
                      " overlap in the ELF file");
      }
    }
  }

  void ReadSymbols() {
    for (const ElfSection& section : image_.sections) {
      if (section.header.type != elf::kSymbolTable) continue;
      if (symbols_ != nullptr) throw Refusal("the ELF file has two symbol tables");
      symbols_ = &section;
    }
    if (symbols_ == nullptr) throw Refusal("the ELF file has no symbols; it must not be stripped");
    const ElfSection& names =
        Table(symbols_->header.link, elf::kStringTable, "table of symbol names");
    const std::size_t count = CountOf<elf::Symbol>(*symbols_, kMaxSymbols);
    for (std::size_t i = 0; i < count; ++i) {
      const elf::Symbol symbol =
          *Decode<elf::Symbol>(symbols_->bytes, i * SizeInFile<elf::Symbol>());
      const auto name = TextAt(names.bytes, symbol.name);
      if (!name) throw Refusal("the name of a symbol lies outside the table of names");
      Add(symbol, *name);
    }
  }

  void Add(const elf::Symbol& symbol, std::string_view name) {
    const auto binding = static_cast<std::uint8_t>(symbol.info >> 4);
    const auto type = static_cast<std::uint8_t>(symbol.info & 0xF);
    if (binding > elf::kWeak || type > elf::kFile) {
      throw Refusal("symbol " + Shown(name) + " is of an unknown kind (" + Hex(symbol.info) + ")");
    }
    if (symbol.section >= image_.sections.size() && symbol.section != elf::kSectionAbsolute) {
      throw Refusal("symbol " + Shown(name) + " is in section " + std::to_string(symbol.section) +
                    ", which there is not");
    }
    image_.symbols.push_back({name, symbol.value, binding, type, symbol.section});
  }

  template <typename Record>
  static std::size_t CountOf(const ElfSection& table, std::size_t most) {
    constexpr std::size_t kSize = SizeInFile<Record>();
    if (table.header.entry_size != kSize || table.bytes.size() % kSize != 0) {
      throw Refusal("section " + Shown(table.name) + " has records of an unknown size");
    }
    if (table.bytes.size() / kSize > most) {
      throw Refusal("section " + Shown(table.name) + " has too many records");
    }
    return table.bytes.size() / kSize;
  }

  void ReadRelocations(const ElfSection& table) {
    const bool with_addend = table.header.type == elf::kRelocationsWithAddend;
    if (table.header.type != elf::kRelocations && !with_addend) return;
    if (table.header.info == 0 || table.header.info >= image_.sections.size()) {
      throw Refusal("section " + Shown(table.name) + " relocates no section");
    }
    if (!image_.sections[table.header.info].allocated()) return;
    if (with_addend) {
      throw Refusal("section " + Shown(table.name) + " has relocations with addends");
    }
    if (&Table(table.header.link, elf::kSymbolTable, "symbols of relocations") != symbols_) {
      throw Refusal("section " + Shown(table.name) + " is of other symbols");
    }
    const std::size_t count = CountOf<elf::Relocation>(table, kMaxRelocations);
    ElfRelocations& found = image_.relocations.emplace_back();
    found.section = table.header.info;
    found.entries.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
      const auto record = *Decode<elf::Relocation>(table.bytes, i * SizeInFile<elf::Relocation>());
      found.entries.push_back(
          {record.address, static_cast<std::uint8_t>(record.info & 0xFF), record.info >> 8});
      if (found.entries.back().symbol >= image_.symbols.size()) {
        throw Refusal("the relocation at " + Hex(record.address) +
                      " is of a symbol that is not there");
      }
    }
  }

  std::string_view bytes_;
  elf::FileHeader header_;
  ElfImage image_;
  const ElfSection* symbols_ = nullptr;
};

}  // namespace

ElfImage ReadElf(std::string_view bytes) {
  return ElfReader(bytes).Read();
}

}  // namespace elf2pe
