#include "tools/elf2pe/pe_tables.h"

#include <cstddef>

namespace elf2pe {
namespace {

void AppendWord(std::string& out, std::uint32_t word) {
  FieldWriter{out}(word);
}

void AppendHalf(std::string& out, std::size_t half) {
  FieldWriter{out}(static_cast<std::uint16_t>(half));
}

void AppendText(std::string& out, std::string_view text) {
  out.append(text).push_back('\0');
}

std::uint32_t SizeOf(std::size_t bytes) {
  return static_cast<std::uint32_t>(bytes);
}

}  // namespace

std::string ExportSection(std::uint32_t rva, std::string_view dll_name,
                          const std::vector<PeExport>& exports) {
  const std::uint32_t count = SizeOf(exports.size());
  pe::ExportTable table;
  table.function_count = count;
  table.name_count = count;
  table.functions = rva + SizeOf(SizeInFile<pe::ExportTable>());
  table.names = table.functions + 4 * count;
  table.ordinals = table.names + 4 * count;
  table.dll_name = table.ordinals + 2 * count;

  std::string texts;
  AppendText(texts, dll_name);
  std::string bytes;
  Append(bytes, table);
  for (const PeExport& one : exports) AppendWord(bytes, one.rva);
  for (const PeExport& one : exports) {
    AppendWord(bytes, table.dll_name + SizeOf(texts.size()));
    AppendText(texts, one.name);
  }
  for (std::size_t i = 0; i < exports.size(); ++i) AppendHalf(bytes, i);
  return bytes + texts;
}

// Descriptors, lookup tables, address tables, hints and names of functions, names of DLLs.
ImportSection MakeImportSection(std::uint32_t rva, std::vector<PeImportedDll>& imports) {
  std::uint32_t tables_size = 0;  // of all lookup tables, and of all address tables
  for (const PeImportedDll& dll : imports) tables_size += 4 * (SizeOf(dll.functions.size()) + 1);
  const std::uint32_t descriptors_size =
      SizeOf(SizeInFile<pe::ImportDescriptor>() * (imports.size() + 1));
  const std::uint32_t lookup_tables = rva + descriptors_size;
  const std::uint32_t address_tables = lookup_tables + tables_size;
  const std::uint32_t texts_at = address_tables + tables_size;

  std::string tables;
  std::string texts;
  for (PeImportedDll& dll : imports) {
    for (PeImport& function : dll.functions) {
      function.slot = address_tables + SizeOf(tables.size());
      AppendWord(tables, texts_at + SizeOf(texts.size()));
      AppendHalf(texts, 0);  // the hint: nobody knows the place of the name in that DLL
      AppendText(texts, function.name);
      if (texts.size() % 2 != 0) texts.push_back('\0');
    }
    AppendWord(tables, 0);
  }

  ImportSection section;
  std::uint32_t table = 0;
  for (const PeImportedDll& dll : imports) {
    Append(section.bytes,
           pe::ImportDescriptor{lookup_tables + table, 0, 0, texts_at + SizeOf(texts.size()),
                                address_tables + table});
    AppendText(texts, dll.name);
    table += 4 * (SizeOf(dll.functions.size()) + 1);
  }
  Append(section.bytes, pe::ImportDescriptor{});
  section.bytes += tables + tables + texts;
  section.descriptors = {rva, descriptors_size};
  section.address_tables = {address_tables, tables_size};
  return section;
}

std::string RelocationSection(const std::vector<std::uint32_t>& words) {
  std::string bytes;
  for (std::size_t i = 0; i < words.size();) {
    const std::uint32_t page = words[i] / pe::kSectionAlignment;
    std::string fixups;
    for (; i < words.size() && words[i] / pe::kSectionAlignment == page; ++i) {
      AppendHalf(fixups, unsigned{pe::kFixupHighLow} << pe::kFixupKindShift |
                             (words[i] & pe::kFixupOffsetMask));
    }
    if (fixups.size() % 4 != 0)
      AppendHalf(fixups, pe::kFixupAbsolute);  // the next block is aligned
    Append(bytes, pe::FixupBlock{page * pe::kSectionAlignment,
                                 SizeOf(SizeInFile<pe::FixupBlock>() + fixups.size())});
    bytes += fixups;
  }
  return bytes;
}

}  // namespace elf2pe
