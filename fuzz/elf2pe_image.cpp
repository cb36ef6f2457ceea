// Input: a linked ELF image, any bytes. Whatever the converter makes of it, the reader of DLLs
// takes.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "tools/elf2pe/convert.h"
#include "tools/elf2pe/import_library.h"
#include "tools/elf2pe/linked_image.h"
#include "tools/elf2pe/pe_reader.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckImage(const elf2pe::LinkedImage& image) {
  Require(!image.sections.empty() && image.end() > image.base);
  Require(image.Find(image.entry, 4) != nullptr);
  std::uint32_t last = 0;
  for (const elf2pe::MovingWord& word : image.words) {
    const elf2pe::LinkedSection* const section = image.Find(word.address, 4);
    Require(section != nullptr && word.address % 4 == 0 && word.address > last);
    last = word.address;
  }
}

void CheckDll(const elf2pe::LinkedImage& image, const elf2pe::DllOptions& options) {
  const std::string dll = elf2pe::Convert(image, options);
  elf2pe::PeImage read;
  try {
    read = elf2pe::ReadPe(dll);
  } catch (const elf2pe::Refusal&) {
    std::abort();
  }
  Require(read.exports.size() == options.exports.size());
  Require(read.relocations.size() == image.words.size());
  Require(read.imports.size() == image.dlls.size());
  Require(read.entry + read.image_base == image.entry);
  Require(elf2pe::MemoryImage(read, 0x01F00000).size() == read.image_size);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  elf2pe::DllOptions options;
  options.name = "fuzzed.dll";
  options.version = "3.44";
  try {
    const elf2pe::LinkedImage image = elf2pe::ReadLinkedImage(bytes);
    CheckImage(image);
    // Of each name, what can be exported, is.
    for (const auto& [name, address] : image.symbols) {
      elf2pe::DllOptions one = options;
      one.exports = {name};
      try {
        static_cast<void>(elf2pe::Convert(image, one));
        options.exports.push_back(name);
      } catch (const elf2pe::Refusal&) {
      }
    }
    if (!options.exports.empty()) {
      CheckDll(image, options);
      Require(!elf2pe::MakeImportLibrary(options).empty());
    }
    elf2pe::ConfirmBySecondLink(image, elf2pe::ReadLinkedImage(bytes));
    std::abort();  // it has the same base
  } catch (const elf2pe::Refusal& refusal) {
    Require(std::string_view(refusal.what()).find('\n') == std::string_view::npos);
  }
  return 0;
}
