#include "tools/elf2pe/pe_writer.h"

#include <algorithm>
#include <cstddef>
#include <stdexcept>
#include <string_view>

namespace elf2pe {
namespace {

std::uint32_t CharacteristicsOf(std::string_view name) {
  for (const pe::SectionKind& kind : pe::kSectionKinds) {
    if (kind.name == name) return kind.characteristics;
  }
  throw std::logic_error("no section of a DLL is called " + std::string(name));
}

std::uint32_t InFile(std::size_t size) {
  return RoundUp(static_cast<std::uint32_t>(size), pe::kFileAlignment);
}

pe::SectionHeader HeaderOf(const PePart& part, std::uint32_t offset) {
  pe::SectionHeader header;
  std::copy(part.name.begin(), part.name.end(), header.name.begin());
  header.virtual_size = part.virtual_size;
  header.rva = part.rva;
  header.raw_size = InFile(part.bytes.size());
  header.raw_offset = header.raw_size == 0 ? 0 : offset;
  header.characteristics = CharacteristicsOf(part.name);
  return header;
}

void CountSections(const std::vector<PePart>& parts, pe::OptionalHeader& header) {
  for (const PePart& part : parts) {
    const bool code = (CharacteristicsOf(part.name) & pe::kCode) != 0;
    (code ? header.code_size : header.initialized_size) += InFile(part.bytes.size());
    std::uint32_t& base = code ? header.code_base : header.data_base;
    if (base == 0) base = part.rva;
  }
}

}  // namespace

std::string DosPart() {
  pe::DosHeader header;
  header.program = {0x90, 3, 0, 4, 0, 0xFFFF, 0, 0xB8, 0, 0, 0, 0x40};
  std::string program =
      "\xB8\x01\x4C\xCD\x21";  // mov ax, 4C01h; int 21h: it ends, with exit code 1
  program.resize(RoundUp(static_cast<std::uint32_t>(program.size()), 64));
  header.pe_offset = static_cast<std::uint32_t>(SizeInFile<pe::DosHeader>() + program.size());
  std::string bytes;
  Append(bytes, header);
  return bytes + program;
}

std::uint32_t PeChecksum(std::string_view file, std::size_t field) {
  std::uint32_t sum = 0;
  for (std::size_t at = 0; at < file.size(); at += 2) {
    if (at == field || at == field + 2) continue;
    const auto low = static_cast<unsigned char>(file[at]);
    const auto high = at + 1 < file.size() ? static_cast<unsigned char>(file[at + 1]) : 0U;
    sum += low | high << 8;
    sum = (sum & 0xFFFF) + (sum >> 16);
  }
  return sum + static_cast<std::uint32_t>(file.size());
}

std::string WritePe(const PeContent& content) {
  pe::FileHeader file_header;
  file_header.machine = content.machine;
  file_header.section_count = static_cast<std::uint16_t>(content.parts.size());
  file_header.optional_header_size = static_cast<std::uint16_t>(SizeInFile<pe::OptionalHeader>());

  std::string out = DosPart();
  FieldWriter{out}(pe::kSignature);
  Append(out, file_header);
  const std::size_t optional_at = out.size();

  pe::OptionalHeader header;
  header.entry = content.entry;
  header.image_base = content.image_base;
  header.directories = content.directories;
  const PePart& last = content.parts.back();
  header.image_size = RoundUp(last.rva + last.virtual_size, pe::kSectionAlignment);
  header.headers_size = InFile(optional_at + SizeInFile<pe::OptionalHeader>() +
                               content.parts.size() * SizeInFile<pe::SectionHeader>());
  CountSections(content.parts, header);
  Append(out, header);

  std::uint32_t offset = header.headers_size;
  for (const PePart& part : content.parts) {
    const pe::SectionHeader section = HeaderOf(part, offset);
    Append(out, section);
    offset += section.raw_size;
  }
  out.resize(header.headers_size);
  for (const PePart& part : content.parts) {
    out += part.bytes;
    out.resize(InFile(out.size()));
  }
  const std::size_t checksum_at = optional_at + pe::kChecksumOffset;
  SetWord(out, checksum_at, PeChecksum(out, checksum_at));
  return out;
}

}  // namespace elf2pe
