#include "tools/elf2pe/pe_directories.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace elf2pe {
namespace {

constexpr std::size_t kMaxName = 1024;
constexpr std::size_t kMaxDlls = 16;
constexpr std::size_t kMaxExports = 0xFFFF;

class DirectoryReader {
 public:
  DirectoryReader(const pe::OptionalHeader& header, PeImage& image)
      : header_(header), image_(image) {}

  void Read() {
    CheckDirectories();
    ReadExports();
    ReadImports();
    CheckResource();
    ReadRelocations();
  }

 private:
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
              : directory.size == 0 || !HasBytes(*section, directory.rva, directory.size) ||
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
    if (!HasBytes(section, rva, 1)) throw Refusal("a name lies outside section " + section.name);
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
    if (!HasBytes(section, rva, 2))
      throw Refusal("section " + section.name + " ends within a table");
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

  /// A version and nothing else: three directories of one entry each lead to it.
  void CheckResource() const {
    const PeSection* section = Section(".rsrc");
    if (section == nullptr) return;
    constexpr std::uint32_t kOneEntry = 0x00010000;
    constexpr std::uint32_t kFurtherDown = 0x80000000;
    constexpr std::uint32_t kVersionType = 16;
    constexpr std::uint32_t kEnglish = 0x0409;
    constexpr std::uint32_t kTree = 88;
    const std::uint32_t known[] = {0,
                                   0,
                                   0,
                                   kOneEntry,
                                   kVersionType,
                                   kFurtherDown + 24,
                                   0,
                                   0,
                                   0,
                                   kOneEntry,
                                   1,
                                   kFurtherDown + 48,
                                   0,
                                   0,
                                   0,
                                   kOneEntry,
                                   kEnglish,
                                   72,
                                   section->rva + kTree,
                                   section->virtual_size - kTree,
                                   0,
                                   0};
    static_assert(sizeof known == kTree);
    std::uint32_t at = section->rva;
    for (const std::uint32_t word : known) {
      if (Word(*section, at) != word) throw Refusal("the image has resources besides a version");
      at += 4;
    }
    if (header_.directories[pe::kResourceDirectory].size != section->virtual_size) {
      throw Refusal("the resources do not have the size that they say");
    }
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
      if (rva % 4 != 0 || !HasBytes(section, rva, 4)) continue;
      const std::uint32_t value = Word(section, rva);
      if (value < image_.image_base || value - image_.image_base > image_.image_size) {
        throw Refusal("the word at " + Hex(rva) + " points out of the image");
      }
      image_.relocations.push_back(rva);
      return;
    }
    throw Refusal("there is no word to relocate at " + Hex(rva));
  }

  const pe::OptionalHeader& header_;
  PeImage& image_;
};

}  // namespace

bool HasBytes(const PeSection& section, std::uint32_t rva, std::uint32_t size) {
  return rva >= section.rva && size <= section.bytes.size() &&
         rva - section.rva <= section.bytes.size() - size;
}

void ReadDirectories(const pe::OptionalHeader& header, PeImage& image) {
  DirectoryReader(header, image).Read();
}

}  // namespace elf2pe
