// Input: a DLL, any bytes. Checks what the loader and the checks of the binary rely on.
#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>
#include <string_view>

#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_reader.h"
#include "tools/elf2pe/pe_writer.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckPlaces(const elf2pe::PeImage& image) {
  std::uint32_t end = static_cast<std::uint32_t>(image.headers.size());
  for (const elf2pe::PeSection& section : image.sections) {
    Require(section.rva >= end && section.bytes.size() <= section.virtual_size);
    end = section.rva + section.virtual_size;
  }
  Require(end <= image.image_size && image.image_size <= elf2pe::pe::kMaxImageSize);
  Require(image.entry <= image.image_size - 4);
  for (const elf2pe::PeExport& one : image.exports) Require(one.rva < image.image_size);
  std::set<std::uint32_t> slots;
  for (const elf2pe::PeImportedDll& dll : image.imports) {
    for (const elf2pe::PeImport& function : dll.functions) {
      Require(function.slot % 4 == 0 && function.slot <= image.image_size - 4);
      Require(slots.insert(function.slot).second);
    }
  }
  for (const std::uint32_t rva : image.relocations) {
    Require(rva % 4 == 0 && rva <= image.image_size - 4 && slots.count(rva) == 0);
  }
}

void Check(std::string_view bytes) {
  try {
    const elf2pe::PeImage image = elf2pe::ReadPe(bytes);
    CheckPlaces(image);
    const std::string here = elf2pe::MemoryImage(image, image.image_base);
    Require(here.size() == image.image_size);
    const std::string moved = elf2pe::MemoryImage(image, image.image_base + 0x01230000);
    for (const std::uint32_t rva : image.relocations) {
      Require(*elf2pe::WordAt(moved, rva) - *elf2pe::WordAt(here, rva) == 0x01230000);
    }
  } catch (const elf2pe::Refusal& refusal) {
    Require(std::string_view(refusal.what()).find('\n') == std::string_view::npos);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string dll(reinterpret_cast<const char*>(data), size);
  Check(dll);
  // Past the checksum, which no invented input has right.
  constexpr std::size_t kChecksum = 0x80 + 4 + 20 + elf2pe::pe::kChecksumOffset;
  if (dll.size() < kChecksum + 4) return 0;
  elf2pe::SetWord(dll, kChecksum, elf2pe::PeChecksum(dll, kChecksum));
  Check(dll);
  return 0;
}
