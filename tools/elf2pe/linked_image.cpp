#include "tools/elf2pe/linked_image.h"

#include <algorithm>
#include <cstddef>
#include <optional>

#include "tools/elf2pe/elf_reader.h"
#include "tools/elf2pe/pe_format.h"

namespace elf2pe {
namespace {

constexpr std::string_view kSlotSection = ".idata$";
constexpr std::string_view kSlotSymbol = "__imp_";
constexpr std::size_t kMaxDlls = 16;
constexpr std::uint32_t kMaxSlots = 4096;  // of a DLL
constexpr std::size_t kMaxName = 1024;

bool StartsWith(std::string_view text, std::string_view start) {
  return text.substr(0, start.size()) == start;
}

bool EndsWith(std::string_view text, std::string_view end) {
  return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

/// The linker's own code between functions too far apart, or of two instruction sets. It holds
/// addresses that no relocation names.
bool IsVeneer(std::string_view name) {
  return EndsWith(name, "_veneer") ||
         (StartsWith(name, "__") && name.find("_from_") != std::string_view::npos);
}

bool IsThumbMark(std::string_view name) {
  return name == "$t" || StartsWith(name, "$t.");
}

void RequireName(std::string_view name, const char* what) {
  const bool printable =
      std::all_of(name.begin(), name.end(), [](char c) { return c > ' ' && c <= '~'; });
  if (name.empty() || name.size() > kMaxName || !printable) {
    throw Refusal(std::string(what) + " " + Shown(name) + " has no name that a DLL can hold");
  }
}

/// Where the sections of an image may stand, in this order.
enum class Role : std::uint8_t { kText, kConstants, kData, kZeros, kSlots };

struct RoleRow {
  std::string_view name;
  Role role;
  std::uint32_t needed;     ///< flags
  std::uint32_t forbidden;  ///< flags
};

constexpr RoleRow kRoles[] = {
    {".text", Role::kText, elf::kExecute, elf::kWrite},
    // Tables of constructors are writable to the compiler.
    {".rdata", Role::kConstants, 0, elf::kExecute},
    {".data", Role::kData, elf::kWrite, elf::kExecute},
    {".bss", Role::kZeros, elf::kWrite, elf::kExecute},
};
constexpr RoleRow kSlotsRole = {kSlotSection, Role::kSlots, 0, elf::kExecute};

constexpr std::uint32_t kKnownFlags = elf::kWrite | elf::kAllocate | elf::kExecute | elf::kMerge |
                                      elf::kStrings | elf::kInfoLink | elf::kLinkOrder;

const RoleRow& RoleOf(std::string_view name) {
  for (const RoleRow& row : kRoles) {
    if (row.name == name) return row;
  }
  if (StartsWith(name, kSlotSection)) return kSlotsRole;
  throw Refusal("section " + Shown(name) + " is not one that a DLL has");
}

class ImageReader {
 public:
  explicit ImageReader(std::string_view elf) : elf_(ReadElf(elf)) {}

  LinkedImage Read() {
    roles_.resize(elf_.sections.size());
    for (std::size_t i = 0; i < elf_.sections.size(); ++i) {
      if (elf_.sections[i].allocated() && elf_.sections[i].header.size > 0) Place(i);
    }
    if (image_.sections.empty()) throw Refusal("the ELF file has no section .text");
    for (const ElfSymbol& symbol : elf_.symbols) CheckSymbol(symbol);
    for (const LinkedDll& dll : image_.dlls) CheckSlots(dll);
    if (elf_.relocations.empty()) {
      throw Refusal("the ELF file has no relocations; it must be linked with --emit-relocs");
    }
    for (const ElfRelocations& table : elf_.relocations) Relocate(table);
    SortWords();
    CheckEntry();
    return std::move(image_);
  }

 private:
  void Place(std::size_t index) {
    const ElfSection& section = elf_.sections[index];
    const RoleRow& row = RoleOf(section.name);
    const bool slots = row.role == Role::kSlots;
    if (last_role_ && !(slots ? *last_role_ <= row.role : *last_role_ < row.role)) {
      throw Refusal("section " + Shown(section.name) + " is not in its place");
    }
    last_role_ = row.role;
    roles_[index] = row.role;
    CheckKind(section, row);
    CheckAddress(section);
    if (slots) {
      AddDll(section);
    } else if (row.role == Role::kZeros) {
      AddZeros(section);
    } else {
      image_.sections.push_back({std::string(section.name), section.header.address,
                                 section.header.size, std::string(section.bytes)});
    }
  }

  static void CheckKind(const ElfSection& section, const RoleRow& row) {
    const bool no_bits = section.header.type == elf::kNoBits;
    const bool may_lack_bits = row.role == Role::kZeros || row.role == Role::kSlots;
    const bool may_have_bits = row.role != Role::kZeros;
    if (!(no_bits ? may_lack_bits : may_have_bits && section.header.type == elf::kProgramBits) ||
        (section.header.flags & ~kKnownFlags) != 0 ||
        (section.header.flags & row.needed) != row.needed ||
        (section.header.flags & row.forbidden) != 0) {
      throw Refusal("section " + Shown(section.name) + " is of a wrong kind (type " +
                    std::to_string(section.header.type) + ", flags " + Hex(section.header.flags) +
                    ")");
    }
  }

  /// Each section begins on the page behind the one before; in front of the first, headers take
  /// one.
  void CheckAddress(const ElfSection& section) {
    const std::uint32_t address = section.header.address;
    if (!placed_any_) {
      if (section.name != ".text") throw Refusal("the ELF file has no section .text");
      if (address < pe::kSectionAlignment ||
          (address - pe::kSectionAlignment) % pe::kImageBaseStep != 0) {
        throw Refusal("section .text is at " + Hex(address) +
                      ", not one page behind a multiple of 64 KiB");
      }
      image_.base = address - pe::kSectionAlignment;
      next_address_ = address;
      placed_any_ = true;
    }
    if (address != next_address_) {
      throw Refusal("section " + Shown(section.name) + " is at " + Hex(address) + ", not at " +
                    Hex(next_address_) + ", on the page behind the one before");
    }
    const std::uint32_t used = address - image_.base;
    if (section.header.size > pe::kMaxImageSize - used ||
        image_.base > UINT32_MAX - pe::kMaxImageSize) {
      throw Refusal("section " + Shown(section.name) + " makes the image too large");
    }
    next_address_ = RoundUp(address + section.header.size, pe::kSectionAlignment);
  }

  void AddZeros(const ElfSection& section) {
    if (image_.sections.back().name != ".data") {
      image_.sections.push_back({".data", section.header.address, 0, {}});
    }
    LinkedSection& data = image_.sections.back();
    data.size = section.header.address + section.header.size - data.address;
  }

  void AddDll(const ElfSection& section) {
    const std::string_view name = section.name.substr(kSlotSection.size());
    RequireName(name, "DLL");
    if (image_.dlls.size() == kMaxDlls) throw Refusal("the image needs too many DLLs");
    for (const LinkedDll& dll : image_.dlls) {
      if (dll.name == name) throw Refusal("there are two sections " + Shown(section.name));
    }
    if (section.header.size % 4 != 0 ||
        section.bytes.find_first_not_of('\0') != std::string_view::npos) {
      throw Refusal("section " + Shown(section.name) + " holds more than empty slots");
    }
    if (section.header.size / 4 > kMaxSlots) {
      throw Refusal("section " + Shown(section.name) + " has too many import slots");
    }
    LinkedDll& dll = image_.dlls.emplace_back();
    dll.name = name;
    for (std::uint32_t at = 0; at < section.header.size; at += 4) {
      dll.slots.push_back({{}, section.header.address + at});
    }
  }

  void CheckSymbol(const ElfSymbol& symbol) {
    if (&symbol == &elf_.symbols.front()) return;
    if (symbol.section == elf::kSectionUndefined) {
      throw Refusal("symbol " + Shown(symbol.name) + " is undefined");
    }
    if (symbol.section == elf::kSectionAbsolute || !elf_.sections[symbol.section].allocated()) {
      return;
    }
    if (IsVeneer(symbol.name)) {
      throw Refusal("symbol " + Shown(symbol.name) + " is a veneer of the linker's");
    }
    if (IsThumbMark(symbol.name)) {
      throw Refusal("there is Thumb code at " + Hex(symbol.value));
    }
    if (!elf_.sections[symbol.section].Reaches(symbol.value)) {
      throw Refusal("symbol " + Shown(symbol.name) + " lies outside its section");
    }
    if (!roles_[symbol.section]) return;  // of an empty section
    if (*roles_[symbol.section] == Role::kSlots) {
      NameSlot(symbol);
    } else if (symbol.binding != elf::kLocal &&
               !image_.symbols.emplace(symbol.name, symbol.value).second) {
      throw Refusal("symbol " + Shown(symbol.name) + " is defined twice");
    }
  }

  LinkedSlot* FindSlot(std::uint32_t address) {
    for (LinkedDll& dll : image_.dlls) {
      const std::uint32_t first = dll.slots.front().address;
      const std::uint32_t inside = address - first;
      if (address >= first && inside / 4 < dll.slots.size() && inside % 4 == 0) {
        return &dll.slots[inside / 4];
      }
    }
    return nullptr;
  }

  void NameSlot(const ElfSymbol& symbol) {
    if (symbol.binding == elf::kLocal) return;  // of the section, or a mark of data
    LinkedSlot* slot = FindSlot(symbol.value);
    if (slot == nullptr || !StartsWith(symbol.name, kSlotSymbol)) {
      throw Refusal("symbol " + Shown(symbol.name) + " names no import slot");
    }
    if (!slot->function.empty()) {
      throw Refusal("an import slot is both " + Shown(slot->function) + " and " +
                    Shown(symbol.name));
    }
    slot->function = symbol.name.substr(kSlotSymbol.size());
    RequireName(slot->function, "import");
  }

  static void CheckSlots(const LinkedDll& dll) {
    for (const LinkedSlot& slot : dll.slots) {
      if (slot.function.empty()) {
        throw Refusal("the import slot at " + Hex(slot.address) + " has no symbol");
      }
    }
  }

  void Relocate(const ElfRelocations& table) {
    const ElfSection& section = elf_.sections[table.section];
    for (const ElfRelocation& entry : table.entries) {
      if (entry.type == elf::kArmNone) continue;
      const std::uint32_t inside = entry.address - section.header.address;
      if (entry.address < section.header.address || section.bytes.size() < 4 ||
          inside > section.bytes.size() - 4) {
        throw Refusal("the relocation at " + Hex(entry.address) + " lies outside section " +
                      Shown(section.name));
      }
      if (entry.address % 4 != 0) {
        throw Refusal("the relocation at " + Hex(entry.address) + " is not at a multiple of 4");
      }
      if (roles_[table.section] == Role::kSlots) {
        throw Refusal("an import slot is relocated at " + Hex(entry.address));
      }
      RelocateWord(entry, *WordAt(section.bytes, inside));
    }
  }

  void RelocateWord(const ElfRelocation& entry, std::uint32_t value) {
    switch (entry.type) {
      case elf::kArmAbs32:
      case elf::kArmTarget1: AddWord(entry, value); return;
      case elf::kArmPc24:
      case elf::kArmRel32:
      case elf::kArmCall:
      case elf::kArmJump24:
      case elf::kArmTarget2:
      case elf::kArmPrel31:
        if (RoleOfSymbol(entry) == Role::kSlots) {
          throw Refusal("the relocation at " + Hex(entry.address) +
                        " reaches an import slot by its distance");
        }
        return;
      case elf::kArmV4Bx: return;
      default:
        throw Refusal("the relocation at " + Hex(entry.address) + " is of unknown type " +
                      std::to_string(entry.type));
    }
  }

  /// Of the section that the relocation's symbol lies in.
  Role RoleOfSymbol(const ElfRelocation& entry) const {
    const ElfSymbol& symbol = elf_.symbols[entry.symbol];
    if (entry.symbol == 0 || symbol.section == elf::kSectionAbsolute || !roles_[symbol.section]) {
      throw Refusal("the relocation at " + Hex(entry.address) + " is of symbol " +
                    Shown(symbol.name) + ", which does not move with the image");
    }
    return *roles_[symbol.section];
  }

  void AddWord(const ElfRelocation& entry, std::uint32_t value) {
    MovingWord word{entry.address, nullptr};
    if (RoleOfSymbol(entry) == Role::kSlots) {
      word.slot = FindSlot(value);
      if (word.slot == nullptr) {
        throw Refusal("the word at " + Hex(entry.address) + " points beside an import slot");
      }
    } else if (value < image_.base || value > image_.end()) {
      throw Refusal("the word at " + Hex(entry.address) + " points out of the image, to " +
                    Hex(value));
    }
    image_.words.push_back(word);
  }

  void SortWords() {
    std::sort(image_.words.begin(), image_.words.end(),
              [](const MovingWord& a, const MovingWord& b) { return a.address < b.address; });
    const auto twice = std::adjacent_find(
        image_.words.begin(), image_.words.end(),
        [](const MovingWord& a, const MovingWord& b) { return a.address == b.address; });
    if (twice != image_.words.end()) {
      throw Refusal("the word at " + Hex(twice->address) + " is relocated twice");
    }
  }

  void CheckEntry() {
    const LinkedSection& text = image_.sections.front();
    if (elf_.entry < text.address || elf_.entry - text.address >= text.size ||
        elf_.entry % 4 != 0) {
      throw Refusal("the entry point " + Hex(elf_.entry) + " is no instruction in .text");
    }
    image_.entry = elf_.entry;
  }

  ElfImage elf_;
  LinkedImage image_;
  std::vector<std::optional<Role>> roles_;  ///< by section; none for one that does not get into it
  std::optional<Role> last_role_;
  bool placed_any_ = false;
  std::uint32_t next_address_ = 0;
};

}  // namespace

const LinkedSection* LinkedImage::Find(std::uint32_t address, std::uint32_t size) const {
  for (const LinkedSection& section : sections) {
    if (address >= section.address && size <= section.size &&
        address - section.address <= section.size - size) {
      return &section;
    }
  }
  return nullptr;
}

std::uint32_t LinkedImage::end() const {
  const LinkedSection& last = sections.back();
  return RoundUp(last.address + last.size, pe::kSectionAlignment);
}

LinkedImage ReadLinkedImage(std::string_view elf) {
  return ImageReader(elf).Read();
}

}  // namespace elf2pe
