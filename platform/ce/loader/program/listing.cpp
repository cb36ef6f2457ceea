#include "loader/program/listing.h"

#include <ostream>
#include <string>

#include "loader/import_table.h"
#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/refusal.h"

namespace loader {
namespace {

using elf2pe::Hex;

std::string RightsOf(std::uint32_t characteristics) {
  std::string rights = "r--";
  if ((characteristics & elf2pe::pe::kWrite) != 0) rights[1] = 'w';
  if ((characteristics & elf2pe::pe::kExecute) != 0) rights[2] = 'x';
  return rights;
}

}  // namespace

void List(const elf2pe::PeImage& image, std::ostream& out) {
  out << image.dll_name << ": machine " << Hex(image.machine) << ", base " << Hex(image.image_base)
      << ", " << image.image_size << " bytes in memory, " << image.relocations.size()
      << " relocations, entry " << Hex(image.entry) << "\n\nsections\n";
  for (const elf2pe::PeSection& section : image.sections) {
    out << "  " << Hex(section.rva) << " " << RightsOf(section.characteristics) << " "
        << section.name << ", " << section.virtual_size << " bytes\n";
  }
  out << "\nexports\n";
  for (const elf2pe::PeExport& each : image.exports) {
    out << "  " << Hex(each.rva) << " " << each.name << "\n";
  }
  for (const elf2pe::PeImportedDll& dll : image.imports) {
    out << "\nimports from " << dll.name << "\n";
    for (const elf2pe::PeImport& import : dll.functions) {
      const bool known = FindHostFunction(dll.name, import.name) != nullptr;
      out << "  " << Hex(import.slot) << " " << import.name
          << (known ? "\n" : " (not on this device)\n");
    }
  }
}

}  // namespace loader
