#include "elf2pe/elf_file.h"

#include <algorithm>
#include <map>
#include <utility>

namespace elf2pe {
namespace {

/// Texts one behind the other, the first of them empty.
class StringTable {
 public:
  std::uint32_t Add(const std::string& text) {
    const auto [found, is_new] = places_.emplace(text, static_cast<std::uint32_t>(bytes_.size()));
    if (is_new && !text.empty()) bytes_ += text + '\0';
    return text.empty() ? 0 : found->second;
  }
  [[nodiscard]] const std::string& bytes() const { return bytes_; }

 private:
  std::string bytes_ = std::string(1, '\0');
  std::map<std::string, std::uint32_t> places_;
};

}  // namespace

std::string Words(const std::vector<std::uint32_t>& words) {
  std::string bytes;
  for (const std::uint32_t word : words) FieldWriter{bytes}(word);
  return bytes;
}

std::uint32_t ElfFile::AddSection(std::string name, std::uint32_t flags, std::uint32_t address,
                                  std::string bytes) {
  Section section;
  section.name = std::move(name);
  section.header.type = elf::kProgramBits;
  section.header.flags = flags;
  section.header.address = address;
  section.header.alignment = 4;
  section.bytes = std::move(bytes);
  sections.push_back(std::move(section));
  return static_cast<std::uint32_t>(sections.size() - 1);
}

std::uint32_t ElfFile::AddZeros(std::string name, std::uint32_t address, std::uint32_t size) {
  const std::uint32_t index =
      AddSection(std::move(name), elf::kAllocate | elf::kWrite, address, {});
  sections.back().header.type = elf::kNoBits;
  sections.back().header.size = size;
  sections.back().keep_size = true;
  return index;
}

std::uint32_t ElfFile::AddSymbol(std::string name, std::uint32_t section, std::uint32_t value,
                                 std::uint8_t binding, std::uint8_t type) {
  elf::Symbol record;
  record.value = value;
  record.info = static_cast<std::uint8_t>(binding << 4 | type);
  record.section = static_cast<std::uint16_t>(section);
  symbols.push_back({std::move(name), record});
  return static_cast<std::uint32_t>(symbols.size() - 1);
}

void ElfFile::Relocate(std::uint32_t section, std::uint32_t address, std::uint32_t type,
                       std::uint32_t symbol) {
  auto table = std::find_if(relocations.begin(), relocations.end(),
                            [section](const RelocationTable& t) { return t.section == section; });
  if (table == relocations.end()) table = relocations.insert(table, {section, {}});
  table->entries.push_back({address, type, symbol});
}

ElfFile::Section& ElfFile::Named(std::string_view name) {
  return *std::find_if(sections.begin(), sections.end(),
                       [name](const Section& section) { return section.name == name; });
}

ElfFile::Symbol& ElfFile::SymbolNamed(std::string_view name) {
  return *std::find_if(symbols.begin(), symbols.end(),
                       [name](const Symbol& symbol) { return symbol.name == name; });
}

std::string ElfFile::Bytes() const {
  std::vector<Section> all = sections;
  const auto add = [&all](const char* name, std::uint32_t type, std::uint32_t entry_size) {
    Section& section = all.emplace_back();
    section.name = name;
    section.header.type = type;
    section.header.entry_size = entry_size;
    return all.size() - 1;
  };
  const std::size_t first_table = all.size();
  const auto symbol_table = static_cast<std::uint32_t>(first_table + relocations.size());
  for (const RelocationTable& table : relocations) {
    const std::size_t index = add(".rel", table.type, SizeInFile<elf::Relocation>());
    all[index].header.link = symbol_table;
    all[index].header.info = table.section;
    for (const Relocation& entry : table.entries) {
      Append(all[index].bytes, elf::Relocation{entry.address, entry.symbol << 8 | entry.type});
    }
  }
  add(".symtab", elf::kSymbolTable, SizeInFile<elf::Symbol>());
  add(".strtab", elf::kStringTable, 0);
  add(".shstrtab", elf::kStringTable, 0);
  StringTable texts;
  all[symbol_table].header.link = symbol_table + 1;
  for (const Symbol& symbol : symbols) {
    elf::Symbol record = symbol.record;
    record.name = texts.Add(symbol.name);
    Append(all[symbol_table].bytes, record);
  }
  all[symbol_table + 1].bytes = texts.bytes();
  StringTable names;
  for (Section& section : all) section.header.name = names.Add(section.name);
  all.back().bytes = names.bytes();

  std::string content(SizeInFile<elf::FileHeader>(), '\0');
  for (Section& section : all) {
    if (!section.keep_offset) section.header.offset = static_cast<std::uint32_t>(content.size());
    if (!section.keep_size) section.header.size = static_cast<std::uint32_t>(section.bytes.size());
    content += section.bytes;
    content.resize(RoundUp(static_cast<std::uint32_t>(content.size()), 4));
  }
  elf::FileHeader filled = header;
  filled.sections_offset = static_cast<std::uint32_t>(content.size());
  filled.section_count = static_cast<std::uint16_t>(all.size());
  filled.names_section = static_cast<std::uint16_t>(all.size() - 1);
  for (const Section& section : all) Append(content, section.header);
  std::string start;
  Append(start, filled);
  return content.replace(0, start.size(), start);
}

ElfFile ToyImage(std::uint32_t base) {
  constexpr std::uint32_t kBranchBack = 0xEB000000;
  constexpr std::uint32_t kReturn = 0xE12FFF1E;
  ElfFile file;
  file.header.entry = base + 0x1000;
  const std::uint32_t text =
      file.AddSection(".text", elf::kAllocate | elf::kExecute, base + 0x1000,
                      Words({kBranchBack, kReturn, kBranchBack, kReturn, kReturn, kReturn, kReturn,
                             kReturn, base + 0x2004, base + 0x6004, base + 0x7000, base + 0x6004}));
  const std::uint32_t constants = file.AddSection(".rdata", elf::kAllocate, base + 0x2000,
                                                  Words({base + 0x1008}) + "constant!");
  const std::uint32_t data = file.AddSection(".data", elf::kAllocate | elf::kWrite, base + 0x3000,
                                             Words({base + 0x5800, 17}));
  const std::uint32_t zeros = file.AddZeros(".bss", base + 0x4000, 0x1800);
  const std::uint32_t core = file.AddSection(".idata$COREDLL.dll", elf::kAllocate | elf::kWrite,
                                             base + 0x6000, Words({0, 0}));
  const std::uint32_t sockets =
      file.AddSection(".idata$WS2.dll", elf::kAllocate | elf::kWrite, base + 0x7000, Words({0}));
  file.AddSection(".comment", 0, 0, "made by hand");

  const std::uint32_t of_constants =
      file.AddSymbol("", constants, base + 0x2000, elf::kLocal, elf::kSection);
  file.AddSymbol("$a", text, base + 0x1000, elf::kLocal, elf::kNoType);
  file.AddSymbol("_DllMainCRTStartup", text, base + 0x1000);
  const std::uint32_t alpha = file.AddSymbol("Alpha", text, base + 0x1008);
  file.AddSymbol("Beta", text, base + 0x1010);
  file.AddSymbol("Local", text, base + 0x1014, elf::kLocal);
  const std::uint32_t counter =
      file.AddSymbol("Counter", zeros, base + 0x4000, elf::kGlobal, elf::kObject);
  file.AddSymbol("__imp_GetTickCount", core, base + 0x6000, elf::kGlobal, elf::kObject);
  const std::uint32_t sleep =
      file.AddSymbol("__imp_Sleep", core, base + 0x6004, elf::kGlobal, elf::kObject);
  const std::uint32_t of_sockets =
      file.AddSymbol("", sockets, base + 0x7000, elf::kLocal, elf::kSection);
  file.AddSymbol("__imp_send", sockets, base + 0x7000, elf::kGlobal, elf::kObject);

  file.Relocate(text, base + 0x1000, elf::kArmCall, alpha);
  file.Relocate(text, base + 0x1004, elf::kArmV4Bx, 0);
  file.Relocate(text, base + 0x1008, elf::kArmJump24, alpha);
  file.Relocate(text, base + 0x1020, elf::kArmAbs32, of_constants);
  file.Relocate(text, base + 0x1024, elf::kArmAbs32, sleep);
  file.Relocate(text, base + 0x1028, elf::kArmAbs32, of_sockets);
  file.Relocate(text, base + 0x102C, elf::kArmAbs32, sleep);
  file.Relocate(constants, base + 0x2000, elf::kArmTarget1, alpha);
  file.Relocate(data, base + 0x3000, elf::kArmAbs32, counter);
  return file;
}

}  // namespace elf2pe
