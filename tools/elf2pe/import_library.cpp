#include "tools/elf2pe/import_library.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <string_view>
#include <utility>

#include "tools/elf2pe/coff_format.h"

namespace elf2pe {
namespace {

std::uint32_t SizeOf(std::size_t bytes) {
  return static_cast<std::uint32_t>(bytes);
}

// ---- objects ----

/// A section of an object file.
struct ObjectPart {
  std::string_view name;
  std::uint32_t alignment = coff::kAlign4;
  std::string bytes;
  std::vector<coff::Relocation> relocations;
};

struct ObjectSymbol {
  std::string name;
  std::uint16_t section = 0;  ///< counts from 1; 0: defined elsewhere
  coff::StorageClass storage_class = coff::kExternal;
};

std::string MakeObject(std::uint16_t machine, const std::vector<ObjectPart>& parts,
                       const std::vector<ObjectSymbol>& symbols) {
  std::string content;
  std::vector<pe::SectionHeader> headers;
  const std::size_t content_at =
      SizeInFile<pe::FileHeader>() + parts.size() * SizeInFile<pe::SectionHeader>();
  for (const ObjectPart& part : parts) {
    pe::SectionHeader& header = headers.emplace_back();
    part.name.copy(header.name.data(), header.name.size());
    header.raw_size = SizeOf(part.bytes.size());
    header.raw_offset = SizeOf(content_at + content.size());
    header.characteristics = pe::kInitializedData | pe::kRead | pe::kWrite | part.alignment;
    content += part.bytes;
    header.relocation_count = static_cast<std::uint16_t>(part.relocations.size());
    if (header.relocation_count > 0) {
      header.relocations_offset = SizeOf(content_at + content.size());
    }
    for (const coff::Relocation& relocation : part.relocations) Append(content, relocation);
  }

  pe::FileHeader header;
  header.machine = machine;
  header.section_count = static_cast<std::uint16_t>(parts.size());
  header.symbol_table = SizeOf(content_at + content.size());
  header.symbol_count = SizeOf(symbols.size());
  header.characteristics = coff::kMachine32Bits;
  std::string out;
  Append(out, header);
  for (const pe::SectionHeader& section : headers) Append(out, section);
  out += content;
  std::string texts;
  for (const ObjectSymbol& symbol : symbols) {
    coff::Symbol record;
    record.name = SizeOf(4 + texts.size());
    record.section = symbol.section;
    record.storage_class = symbol.storage_class;
    Append(out, record);
    texts.append(symbol.name).push_back('\0');
  }
  FieldWriter{out}(SizeOf(4 + texts.size()));
  return out + texts;
}

/// Names of symbols that any import library has; `stem` is the DLL's name without its ending.
constexpr const char* kNullDescriptor = "__NULL_IMPORT_DESCRIPTOR";
std::string DescriptorName(const std::string& stem) {
  return "__IMPORT_DESCRIPTOR_" + stem;
}
std::string NullThunkName(const std::string& stem) {
  return '\x7f' + stem + "_NULL_THUNK_DATA";
}

/// The DLL's entry in the list of imports; it needs the two objects that close list and tables.
std::string DescriptorObject(const DllOptions& options, const std::string& stem) {
  std::string dll_name = options.name + '\0';
  if (dll_name.size() % 2 != 0) dll_name.push_back('\0');
  const std::vector<ObjectPart> parts = {
      // The lookup table, the DLL's name and the address table, by their places in the record.
      {".idata$2",
       coff::kAlign4,
       std::string(SizeInFile<pe::ImportDescriptor>(), '\0'),
       {{12, 2}, {0, 3}, {16, 4}}},
      {".idata$6", coff::kAlign2, dll_name, {}}};
  return MakeObject(options.machine, parts,
                    {{DescriptorName(stem), 1, coff::kExternal},
                     {".idata$2", 1, coff::kSection},
                     {".idata$6", 2, coff::kStatic},
                     {".idata$4", 0, coff::kSection},
                     {".idata$5", 0, coff::kSection},
                     {kNullDescriptor, 0, coff::kExternal},
                     {NullThunkName(stem), 0, coff::kExternal}});
}

std::string NullDescriptorObject(const DllOptions& options) {
  const std::string zeros(SizeInFile<pe::ImportDescriptor>(), '\0');
  return MakeObject(options.machine, {{".idata$3", coff::kAlign4, zeros, {}}},
                    {{kNullDescriptor, 1, coff::kExternal}});
}

std::string NullThunkObject(const DllOptions& options, const std::string& stem) {
  const std::string zeros(4, '\0');
  return MakeObject(
      options.machine,
      {{".idata$5", coff::kAlign4, zeros, {}}, {".idata$4", coff::kAlign4, zeros, {}}},
      {{NullThunkName(stem), 1, coff::kExternal}});
}

std::string ShortImport(const DllOptions& options, const std::string& name, std::size_t hint) {
  const std::string texts = name + '\0' + options.name + '\0';
  coff::ImportHeader header;
  header.machine = options.machine;
  header.size = SizeOf(texts.size());
  header.hint = static_cast<std::uint16_t>(hint);
  header.kind = coff::kImportCodeByName;
  std::string out;
  Append(out, header);
  return out + texts;
}

// ---- the archive ----

struct Member {
  std::string bytes;
  std::vector<std::string> symbols;  ///< that it defines
};

void AppendBigEndian(std::string& out, std::uint32_t word) {
  for (int shift = 24; shift >= 0; shift -= 8) out.push_back(static_cast<char>(word >> shift));
}

std::string Padded(std::string text, std::size_t width) {
  text.resize(width, ' ');
  return text;
}

void AppendMember(std::string& out, const std::string& name, const std::string& bytes) {
  out += Padded(name, 16) + Padded("0", 12) + Padded("", 12) + Padded("0", 8) +
         Padded(std::to_string(bytes.size()), 10) + "`\n" + bytes;
  if (out.size() % 2 != 0) out.push_back('\n');
}

std::size_t SizeInArchive(std::size_t bytes) {
  return 60 + bytes + bytes % 2;
}

/// Symbols by their name, each with the index of its member.
using SymbolIndex = std::vector<std::pair<std::string, std::size_t>>;

/// The first table of symbols: in the order of the members, numbers with the high byte first.
std::string FirstTable(const SymbolIndex& symbols, const std::vector<std::uint32_t>& offsets) {
  std::string out;
  AppendBigEndian(out, SizeOf(symbols.size()));
  for (const auto& [name, member] : symbols) AppendBigEndian(out, offsets[member]);
  for (const auto& [name, member] : symbols) out.append(name).push_back('\0');
  return out;
}

/// The second: sorted by name, with members by their number.
std::string SecondTable(SymbolIndex symbols, const std::vector<std::uint32_t>& offsets) {
  std::sort(symbols.begin(), symbols.end());
  std::string out;
  FieldWriter write(out);
  write(SizeOf(offsets.size()));
  for (const std::uint32_t offset : offsets) write(offset);
  write(SizeOf(symbols.size()));
  for (const auto& [name, member] : symbols) write(static_cast<std::uint16_t>(member + 1));
  for (const auto& [name, member] : symbols) out.append(name).push_back('\0');
  return out;
}

std::string MakeArchive(const std::string& member_name, const std::vector<Member>& members) {
  SymbolIndex symbols;
  for (std::size_t i = 0; i < members.size(); ++i) {
    for (const std::string& name : members[i].symbols) symbols.emplace_back(name, i);
  }
  const bool long_name = member_name.size() > 15;
  const std::string names = long_name ? member_name + '\0' : "";
  std::vector<std::uint32_t> offsets(members.size());
  std::size_t at = coff::kArchiveMagic.size() + SizeInArchive(FirstTable(symbols, offsets).size()) +
                   SizeInArchive(SecondTable(symbols, offsets).size()) +
                   (long_name ? SizeInArchive(names.size()) : 0);
  for (std::size_t i = 0; i < members.size(); ++i) {
    offsets[i] = SizeOf(at);
    at += SizeInArchive(members[i].bytes.size());
  }
  std::string out(coff::kArchiveMagic);
  AppendMember(out, "/", FirstTable(symbols, offsets));
  AppendMember(out, "/", SecondTable(symbols, offsets));
  if (long_name) AppendMember(out, "//", names);
  for (const Member& member : members) {
    AppendMember(out, long_name ? "/0" : member_name + "/", member.bytes);
  }
  return out;
}

}  // namespace

std::string MakeImportLibrary(const DllOptions& options) {
  RequireDllOptions(options);
  const std::string stem = options.name.substr(0, options.name.rfind('.'));
  std::vector<std::string> names = options.exports;
  std::sort(names.begin(), names.end());
  std::vector<Member> members = {
      {DescriptorObject(options, stem), {DescriptorName(stem)}},
      {NullDescriptorObject(options), {kNullDescriptor}},
      {NullThunkObject(options, stem), {NullThunkName(stem)}},
  };
  for (std::size_t i = 0; i < names.size(); ++i) {
    members.push_back({ShortImport(options, names[i], i), {"__imp_" + names[i], names[i]}});
  }
  return MakeArchive(options.name, members);
}

}  // namespace elf2pe
