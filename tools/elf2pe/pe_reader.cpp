#include "tools/elf2pe/pe_reader.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <optional>
#include <utility>

#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_writer.h"

namespace elf2pe {
namespace {

constexpr std::size_t kMaxName = 1024;
constexpr std::size_t kMaxDlls = 16;
constexpr std::size_t kMaxExports = 0xFFFF;

/// A header field that has one value in every file.
struct FixedField {
  const char* name;
  std::uint64_t value;
  std::uint64_t known;
};

void RequireKnown(const FixedField& field) {
  if (field.value == field.known) return;
  throw Refusal("the header's " + std::string(field.name) + " is " + Hex(field.value) + ", not " +
                Hex(field.known));
}

class PeReader {
 public:
  explicit PeReader(std::string_view bytes) : bytes_(bytes) {}

  PeImage Read() {
    ReadHeaders();
    ReadSections();
    CheckLayout();
    CheckEntry();
    CheckDirectories();
    ReadExports();
    ReadImports();
    ReadRelocations();
    return std::move(image_);
  }

 private:
  template <typename Record>
  Record Next(const char* what) {
    const auto record = Decode<Record>(bytes_, at_);
    if (!record) throw Refusal(std::string("the file ends within ") + what);
    at_ += SizeInFile<Record>();
    return *record;
  }

  void ReadHeaders() {
    const std::string dos = DosPart();
    if (bytes_.substr(0, dos.size()) != dos) {
      throw Refusal("the file does not begin as a DLL of this system");
    }
    if (WordAt(bytes_, dos.size()) != pe::kSignature) throw Refusal("the file is no PE image");
    at_ = dos.size() + 4;
    file_header_ = Next<pe::FileHeader>("its header");
    checksum_at_ = at_ + pe::kChecksumOffset;
    header_ = Next<pe::OptionalHeader>("its optional header");
    image_.machine = file_header_.machine;
    image_.image_base = header_.image_base;
    image_.image_size = header_.image_size;
    image_.entry = header_.entry;
    CheckFileHeader();
    CheckOptionalHeader();
  }

  void CheckFileHeader() const {
    if (file_header_.machine != pe::kMachineArm && file_header_.machine != pe::kMachineThumb) {
      throw Refusal("the image is for machine " + Hex(file_header_.machine) +
                    ", neither 0x1c0 nor 0x1c2");
    }
    const FixedField fields[] = {
        {"time stamp", file_header_.time_stamp, 0},
        {"symbol table", file_header_.symbol_table, 0},
        {"number of symbols", file_header_.symbol_count, 0},
        {"size of the optional header", file_header_.optional_header_size,
         SizeInFile<pe::OptionalHeader>()},
        {"characteristics", file_header_.characteristics, pe::kCharacteristics},
    };
    for (const FixedField& field : fields) RequireKnown(field);
  }

  void CheckOptionalHeader() const {
    const pe::OptionalHeader known;
    const FixedField fields[] = {
        {"magic number", header_.magic, known.magic},
        {"linker version", header_.linker_version, known.linker_version},
        {"uninitialized size", header_.uninitialized_size, known.uninitialized_size},
        {"section alignment", header_.section_alignment, known.section_alignment},
        {"file alignment", header_.file_alignment, known.file_alignment},
        {"system version", header_.system_major, known.system_major},
        {"system version behind the point", header_.system_minor, known.system_minor},
        {"image version", header_.image_major, known.image_major},
        {"image version behind the point", header_.image_minor, known.image_minor},
        {"subsystem version", header_.subsystem_major, known.subsystem_major},
        {"subsystem version behind the point", header_.subsystem_minor, known.subsystem_minor},
        {"reserved field", header_.reserved, known.reserved},
        {"subsystem", header_.subsystem, known.subsystem},
        {"DLL characteristics", header_.dll_characteristics, known.dll_characteristics},
        {"stack reserve", header_.stack_reserve, known.stack_reserve},
        {"stack commit", header_.stack_commit, known.stack_commit},
        {"heap reserve", header_.heap_reserve, known.heap_reserve},
        {"heap commit", header_.heap_commit, known.heap_commit},
        {"loader flags", header_.loader_flags, known.loader_flags},
        {"number of directories", header_.directory_count, known.directory_count},
        {"checksum", header_.checksum, PeChecksum(bytes_, checksum_at_)},
    };
    for (const FixedField& field : fields) RequireKnown(field);
    if (header_.image_base == 0 || header_.image_base % pe::kImageBaseStep != 0 ||
        header_.image_base > UINT32_MAX - pe::kMaxImageSize) {
      throw Refusal("no image can be at its image base " + Hex(header_.image_base));
    }
  }

  void ReadSections() {
    if (file_header_.section_count == 0 || file_header_.section_count > pe::kMaxSections) {
      throw Refusal("the image has " + std::to_string(file_header_.section_count) + " sections");
    }
    for (int i = 0; i < file_header_.section_count; ++i) {
      AddSection(Next<pe::SectionHeader>("its section headers"));
    }
    image_.headers = bytes_.substr(0, header_.headers_size);
    if (header_.headers_size != RoundUp(static_cast<std::uint32_t>(at_), pe::kFileAlignment) ||
        image_.headers.size() != header_.headers_size ||
        image_.headers.find_first_not_of('\0', at_) != std::string_view::npos) {
      throw Refusal("the headers do not have the size that they say");
    }
  }

  /// Sections are of known kinds, each at most once and in one order.
  const pe::SectionKind& KindOf(std::string_view name) {
    for (; next_kind_ < std::size(pe::kSectionKinds); ++next_kind_) {
      if (pe::kSectionKinds[next_kind_].name == name) return pe::kSectionKinds[next_kind_++];
    }
    throw Refusal("section " + Shown(name) + " is unknown or not in its place");
  }

  void AddSection(const pe::SectionHeader& header) {
    PeSection section;
    section.name.assign(header.name.data(), header.name.size());
    section.name.resize(section.name.find_last_not_of('\0') + 1);
    const pe::SectionKind& kind = KindOf(section.name);
    if (header.characteristics != kind.characteristics || header.relocations_offset != 0 ||
        header.lines_offset != 0 || header.relocation_count != 0 || header.line_count != 0) {
      throw Refusal("section " + section.name + " has characteristics of another kind");
    }
    section.rva = header.rva;
    section.virtual_size = header.virtual_size;
    section.characteristics = header.characteristics;
    CheckPlace(header, section.name);
    if (header.raw_size > 0) {
      const std::string_view raw = bytes_.substr(header.raw_offset, header.raw_size);
      section.bytes = raw.substr(0, header.virtual_size);
      if (raw.find_first_not_of('\0', section.bytes.size()) != std::string_view::npos) {
        throw Refusal("section " + section.name + " is larger in the file than in memory");
      }
    }
    image_.sections.push_back(std::move(section));
  }

  /// In memory and in the file each section begins right behind the one before.
  void CheckPlace(const pe::SectionHeader& header, const std::string& name) {
    if (header.rva != next_rva_ || header.virtual_size == 0 ||
        header.virtual_size > pe::kMaxImageSize - next_rva_) {
      throw Refusal("section " + name + " is at a wrong place in memory");
    }
    const std::uint32_t room = RoundUp(header.virtual_size, pe::kFileAlignment);
    const bool has_tail = name == ".data";
    if (header.raw_size % pe::kFileAlignment != 0 || header.raw_size > room ||
        (header.raw_size < room && !has_tail)) {
      throw Refusal("section " + name + " has a wrong size in the file");
    }
    next_rva_ = RoundUp(header.rva + header.virtual_size, pe::kSectionAlignment);
    if (header.raw_size == 0) {
      if (header.raw_offset != 0) throw Refusal("section " + name + " is nowhere in the file");
      return;
    }
    if (next_offset_ == 0) next_offset_ = header_.headers_size;
    if (header.raw_offset != next_offset_ || header.raw_offset > bytes_.size() ||
        header.raw_size > bytes_.size() - header.raw_offset) {
      throw Refusal("section " + name + " is at a wrong place in the file");
    }
    next_offset_ += header.raw_size;
  }

  void CheckLayout() const {
    if (image_.sections.front().name != ".text") throw Refusal("the image has no code");
    if (next_offset_ != bytes_.size()) throw Refusal("the file does not end with its last section");
    std::uint32_t code = 0;
    std::uint32_t data = 0;
    for (const PeSection& section : image_.sections) {
      const auto size = static_cast<std::uint32_t>(section.bytes.size());
      (section.name == ".text" ? code : data) += RoundUp(size, pe::kFileAlignment);
    }
    const std::uint32_t data_base = image_.sections.size() > 1 ? image_.sections[1].rva : 0;
    const FixedField fields[] = {
        {"image size", header_.image_size, next_rva_},
        {"size of code", header_.code_size, code},
        {"size of data", header_.initialized_size, data},
        {"base of code", header_.code_base, image_.sections.front().rva},
        {"base of data", header_.data_base, data_base},
    };
    for (const FixedField& field : fields) RequireKnown(field);
  }

  void CheckEntry() const {
    const PeSection& text = image_.sections.front();
    if (image_.entry % 4 != 0 || !Holds(text, image_.entry, 4)) {
      throw Refusal("the entry point " + Hex(image_.entry) + " is no instruction in .text");
    }
  }

  static bool Holds(const PeSection& section, std::uint32_t rva, std::uint32_t size) {
    return rva >= section.rva && size <= section.bytes.size() &&
           rva - section.rva <= section.bytes.size() - size;
  }

  const PeSection* Section(std::string_view name) const {
    for (const PeSection& section : image_.sections) {
      if (section.name == name) return &section;
    }
    return nullptr;
  }

  /// Each directory is there when its section is, and begins with it.
  void CheckDirectories() const {
    constexpr std::pair<pe::Directory, std::string_view> kHomes[] = {
        {pe::kExportDirectory, ".edata"},  {pe::kImportDirectory, ".idata"},
        {pe::kResourceDirectory, ".rsrc"}, {pe::kRelocationDirectory, ".reloc"},
        {pe::kIatDirectory, ".idata"},
    };
    for (std::size_t i = 0; i < pe::kDirectories; ++i) {
      const auto home = std::find_if(std::begin(kHomes), std::end(kHomes),
                                     [i](const auto& one) { return one.first == i; });
      const PeSection* section = home != std::end(kHomes) ? Section(home->second) : nullptr;
      const pe::DirectoryEntry& directory = header_.directories[i];
      const bool none = directory.rva == 0 && directory.size == 0;
      const bool first = i != pe::kIatDirectory;
      if (section == nullptr
              ? !none
              : directory.size == 0 || !Holds(*section, directory.rva, directory.size) ||
                    (first && directory.rva != section->rva)) {
        throw Refusal("directory " + std::to_string(i) + " is not where it belongs");
      }
    }
  }

  std::uint32_t Word(const PeSection& section, std::uint32_t rva) const {
    const auto word = rva < section.rva ? std::nullopt : WordAt(section.bytes, rva - section.rva);
    if (!word) throw Refusal("section " + section.name + " ends within a table");
    return *word;
  }

  template <typename Record>
  Record RecordAt(const PeSection& section, std::uint32_t rva) const {
    const auto record =
        rva < section.rva ? std::nullopt : Decode<Record>(section.bytes, rva - section.rva);
    if (!record) throw Refusal("section " + section.name + " ends within a table");
    return *record;
  }

  std::string Name(const PeSection& section, std::uint32_t rva) const {
    if (!Holds(section, rva, 1)) throw Refusal("a name lies outside section " + section.name);
    const std::string_view rest = section.bytes.substr(rva - section.rva, kMaxName + 1);
    const std::string_view name = rest.substr(0, rest.find('\0'));
    if (name.size() == rest.size()) {
      throw Refusal("a name in section " + section.name + " has no end");
    }
    if (name.empty() ||
        std::any_of(name.begin(), name.end(), [](char c) { return c <= ' ' || c > '~'; })) {
      throw Refusal("section " + section.name + " has a bad name: " + Shown(name));
    }
    return std::string(name);
  }

  void ReadExports() {
    const PeSection* section = Section(".edata");
    if (section == nullptr) return;
    const auto table = RecordAt<pe::ExportTable>(*section, section->rva);
    const std::uint32_t count = table.function_count;
    if (table.characteristics != 0 || table.time_stamp != 0 || table.version != 0 ||
        table.ordinal_base != 1 || table.name_count != count || count > kMaxExports ||
        header_.directories[pe::kExportDirectory].size != section->virtual_size) {
      throw Refusal("the table of exports is of an unknown kind");
    }
    image_.dll_name = Name(*section, table.dll_name);
    std::vector<bool> used(count);
    for (std::uint32_t i = 0; i < count; ++i) {
      // The upper half of this word belongs to the next one, or to what follows the table.
      const std::uint32_t index = HalfWord(*section, table.ordinals + 2 * i);
      if (index >= count || used[index]) throw Refusal("the ordinals of the exports are wrong");
      used[index] = true;
      AddExport(Name(*section, Word(*section, table.names + 4 * i)),
                Word(*section, table.functions + 4 * index));
    }
  }

  std::uint32_t HalfWord(const PeSection& section, std::uint32_t rva) const {
    if (!Holds(section, rva, 2)) throw Refusal("section " + section.name + " ends within a table");
    std::uint16_t half = 0;
    FieldReader reader(section.bytes.substr(rva - section.rva));
    reader(half);
    return half;
  }

  void AddExport(std::string name, std::uint32_t rva) {
    if (!image_.exports.empty() && image_.exports.back().name >= name) {
      throw Refusal("export " + Shown(name) + " is not in the order of the names");
    }
    const PeSection* home = nullptr;
    for (const PeSection& section : image_.sections) {
      if (rva >= section.rva && rva - section.rva < section.virtual_size) home = &section;
    }
    const bool code = home != nullptr && home->name == ".text";
    const bool data = home != nullptr && (home->name == ".rdata" || home->name == ".data");
    if (!(data || (code && rva % 4 == 0))) {
      throw Refusal("export " + Shown(name) + " is at " + Hex(rva) +
                    ", where no function or variable can be");
    }
    image_.exports.push_back({std::move(name), rva});
  }

  void ReadImports() {
    const PeSection* section = Section(".idata");
    if (section == nullptr) return;
    const pe::DirectoryEntry& list = header_.directories[pe::kImportDirectory];
    const pe::DirectoryEntry& slots = header_.directories[pe::kIatDirectory];
    constexpr auto kSize = static_cast<std::uint32_t>(SizeInFile<pe::ImportDescriptor>());
    std::uint32_t next_slot = slots.rva;
    std::uint32_t at = list.rva;
    for (;; at += kSize) {
      const auto descriptor = RecordAt<pe::ImportDescriptor>(*section, at);
      if (descriptor.lookup_table == 0) {
        RequireLast(descriptor);
        break;
      }
      if (image_.imports.size() == kMaxDlls) throw Refusal("the image imports from too many DLLs");
      AddDll(*section, descriptor, next_slot);
    }
    if (at + kSize - list.rva != list.size || next_slot - slots.rva != slots.size ||
        image_.imports.empty()) {
      throw Refusal("the tables of imports do not have the size that they say");
    }
  }

  static void RequireLast(const pe::ImportDescriptor& descriptor) {
    if (descriptor.time_stamp != 0 || descriptor.forwarder_chain != 0 || descriptor.dll_name != 0 ||
        descriptor.address_table != 0) {
      throw Refusal("an import descriptor lacks its lookup table");
    }
  }

  void AddDll(const PeSection& section, const pe::ImportDescriptor& descriptor,
              std::uint32_t& next_slot) {
    PeImportedDll dll;
    dll.name = Name(section, descriptor.dll_name);
    if (descriptor.time_stamp != 0 || descriptor.forwarder_chain != 0 ||
        descriptor.address_table != next_slot || next_slot % 4 != 0) {
      throw Refusal("the imports from " + Shown(dll.name) + " are of an unknown kind");
    }
    for (std::uint32_t i = 0;; i += 4) {
      const std::uint32_t entry = Word(section, descriptor.lookup_table + i);
      if (Word(section, descriptor.address_table + i) != entry) {
        throw Refusal("the two tables of imports from " + Shown(dll.name) + " differ");
      }
      next_slot += 4;
      if (entry == 0) break;
      if ((entry & pe::kImportByOrdinal) != 0) {
        throw Refusal("an import from " + Shown(dll.name) + " is by number");
      }
      if (HalfWord(section, entry) != 0) {
        throw Refusal("an import from " + Shown(dll.name) + " has a hint");
      }
      dll.functions.push_back({Name(section, entry + 2), descriptor.address_table + i});
    }
    if (dll.functions.empty()) throw Refusal("nothing is imported from " + Shown(dll.name));
    image_.imports.push_back(std::move(dll));
  }

  void ReadRelocations() {
    const PeSection* section = Section(".reloc");
    if (section == nullptr) return;
    if (header_.directories[pe::kRelocationDirectory].size != section->virtual_size) {
      throw Refusal("the relocations do not have the size that they say");
    }
    const std::uint32_t end = section->rva + section->virtual_size;
    std::optional<std::uint32_t> last_page;
    for (std::uint32_t at = section->rva; at < end;) {
      const auto block = RecordAt<pe::FixupBlock>(*section, at);
      constexpr auto kHead = static_cast<std::uint32_t>(SizeInFile<pe::FixupBlock>());
      if (block.size <= kHead || block.size % 4 != 0 || block.size > end - at ||
          block.page % pe::kSectionAlignment != 0 || (last_page && block.page <= *last_page)) {
        throw Refusal("the relocations of page " + Hex(block.page) + " are damaged");
      }
      last_page = block.page;
      ReadPage(*section, at + kHead, at + block.size, block.page);
      at += block.size;
    }
  }

  void ReadPage(const PeSection& section, std::uint32_t at, std::uint32_t end, std::uint32_t page) {
    for (; at < end; at += 2) {
      const std::uint32_t fixup = HalfWord(section, at);
      if (fixup == pe::kFixupAbsolute && at + 2 == end && end % 4 == 0) continue;
      if (fixup >> pe::kFixupKindShift != pe::kFixupHighLow) {
        throw Refusal("a relocation of page " + Hex(page) + " is of an unknown kind");
      }
      AddRelocation(page + (fixup & pe::kFixupOffsetMask));
    }
  }

  void AddRelocation(std::uint32_t rva) {
    if (!image_.relocations.empty() && rva <= image_.relocations.back()) {
      throw Refusal("the relocations are not in order at " + Hex(rva));
    }
    for (const PeSection& section : image_.sections) {
      if (section.name == ".edata") break;  // it and what follows hold no addresses
      if (rva % 4 != 0 || !Holds(section, rva, 4)) continue;
      const std::uint32_t value = Word(section, rva);
      if (value < image_.image_base || value - image_.image_base > image_.image_size) {
        throw Refusal("the word at " + Hex(rva) + " points out of the image");
      }
      image_.relocations.push_back(rva);
      return;
    }
    throw Refusal("there is no word to relocate at " + Hex(rva));
  }

  std::string_view bytes_;
  std::size_t at_ = 0;
  std::size_t checksum_at_ = 0;
  std::size_t next_kind_ = 0;
  std::uint32_t next_rva_ = pe::kSectionAlignment;
  std::uint32_t next_offset_ = 0;
  pe::FileHeader file_header_;
  pe::OptionalHeader header_;
  PeImage image_;
};

}  // namespace

PeImage ReadPe(std::string_view bytes) {
  return PeReader(bytes).Read();
}

std::string MemoryImage(const PeImage& image, std::uint32_t base) {
  std::string memory(image.headers);
  for (const PeSection& section : image.sections) {
    memory.resize(section.rva);
    memory += section.bytes;
  }
  memory.resize(image.image_size);
  for (const std::uint32_t rva : image.relocations) {
    SetWord(memory, rva, *WordAt(memory, rva) - image.image_base + base);
  }
  return memory;
}

}  // namespace elf2pe
