#include "tools/elf2pe/pe_reader.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <utility>

#include "tools/elf2pe/pe_directories.h"
#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_writer.h"

namespace elf2pe {
namespace {

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
    ReadDirectories(header_, image_);
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
    if (image_.entry % 4 != 0 || !HasBytes(text, image_.entry, 4)) {
      throw Refusal("the entry point " + Hex(image_.entry) + " is no instruction in .text");
    }
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
