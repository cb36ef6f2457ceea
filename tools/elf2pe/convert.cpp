#include "tools/elf2pe/convert.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <set>
#include <utility>

#include "tools/elf2pe/pe_tables.h"
#include "tools/elf2pe/pe_writer.h"
#include "tools/elf2pe/version_resource.h"

namespace elf2pe {
namespace {

constexpr std::size_t kMaxExports = 0xFFFF;
constexpr std::size_t kMaxName = 1024;

class Converter {
 public:
  Converter(const LinkedImage& image, const DllOptions& options)
      : image_(image), options_(options) {}

  std::string Make() {
    RequireDllOptions(options_);
    content_.machine = options_.machine;
    content_.image_base = image_.base;
    content_.entry = image_.entry - image_.base;
    for (const LinkedSection& section : image_.sections) {
      content_.parts.push_back(
          {section.name, section.address - image_.base, section.size, section.bytes});
    }
    AddExports();
    AddImports();
    AddVersion();
    AddRelocations();
    return WritePe(content_);
  }

 private:
  std::uint32_t NextRva() const {
    const PePart& last = content_.parts.back();
    return RoundUp(last.rva + last.virtual_size, pe::kSectionAlignment);
  }

  void AddPart(const char* name, std::string bytes) {
    const auto size = static_cast<std::uint32_t>(bytes.size());
    content_.parts.push_back({name, NextRva(), size, std::move(bytes)});
  }

  void AddExports() {
    std::vector<PeExport> exports;
    for (const std::string& name : options_.exports) exports.push_back({name, RvaOf(name)});
    std::sort(exports.begin(), exports.end(),
              [](const PeExport& a, const PeExport& b) { return a.name < b.name; });
    const std::uint32_t rva = NextRva();
    AddPart(".edata", ExportSection(rva, options_.name, exports));
    content_.directories[pe::kExportDirectory] = {rva, content_.parts.back().virtual_size};
  }

  std::uint32_t RvaOf(const std::string& name) const {
    const auto symbol = image_.symbols.find(name);
    if (symbol == image_.symbols.end()) {
      throw Refusal("the image does not define the export " + Shown(name));
    }
    const LinkedSection* section = image_.Find(symbol->second, 1);
    if (section == nullptr || (section->name == ".text" && symbol->second % 4 != 0)) {
      throw Refusal("the export " + Shown(name) + " is at " + Hex(symbol->second) +
                    ", where no function or variable can be");
    }
    return symbol->second - image_.base;
  }

  void AddImports() {
    if (image_.dlls.empty()) return;
    std::vector<PeImportedDll> imports;
    for (const LinkedDll& dll : image_.dlls) {
      PeImportedDll& imported = imports.emplace_back();
      imported.name = dll.name;
      for (const LinkedSlot& slot : dll.slots) imported.functions.push_back({slot.function, 0});
    }
    const std::uint32_t rva = NextRva();
    ImportSection section = MakeImportSection(rva, imports);
    AddPart(".idata", std::move(section.bytes));
    content_.directories[pe::kImportDirectory] = section.descriptors;
    content_.directories[pe::kIatDirectory] = section.address_tables;
    PointToSlots(imports);
  }

  /// Words that address the placeholders of slots now address the slots.
  void PointToSlots(const std::vector<PeImportedDll>& imports) {
    std::map<const LinkedSlot*, std::uint32_t> slots;
    for (std::size_t dll = 0; dll < imports.size(); ++dll) {
      for (std::size_t i = 0; i < imports[dll].functions.size(); ++i) {
        slots.emplace(&image_.dlls[dll].slots[i], imports[dll].functions[i].slot);
      }
    }
    for (const MovingWord& word : image_.words) {
      if (word.slot == nullptr) continue;
      const std::uint32_t rva = word.address - image_.base;
      for (PePart& part : content_.parts) {
        if (rva < part.rva || rva - part.rva >= part.bytes.size()) continue;
        SetWord(part.bytes, rva - part.rva, image_.base + slots.at(word.slot));
      }
    }
  }

  void AddVersion() {
    if (options_.version.empty()) return;
    const std::uint32_t rva = NextRva();
    AddPart(".rsrc", VersionSection(rva, {options_.version, options_.description, options_.name}));
    content_.directories[pe::kResourceDirectory] = {rva, content_.parts.back().virtual_size};
  }

  void AddRelocations() {
    if (image_.words.empty()) return;
    std::vector<std::uint32_t> words;
    for (const MovingWord& word : image_.words) words.push_back(word.address - image_.base);
    const std::uint32_t rva = NextRva();
    AddPart(".reloc", RelocationSection(words));
    content_.directories[pe::kRelocationDirectory] = {rva, content_.parts.back().virtual_size};
  }

  const LinkedImage& image_;
  const DllOptions& options_;
  PeContent content_;
};

bool IsName(std::string_view name) {
  return !name.empty() && name.size() <= kMaxName &&
         std::all_of(name.begin(), name.end(), [](char c) { return c > ' ' && c <= '~'; });
}

}  // namespace

void RequireDllOptions(const DllOptions& options) {
  if (options.machine != pe::kMachineArm && options.machine != pe::kMachineThumb) {
    throw Refusal("machine " + Hex(options.machine) + " is neither 0x1c0 nor 0x1c2");
  }
  if (!IsName(options.name)) throw Refusal("no DLL can be called " + Shown(options.name));
  if (options.exports.empty()) throw Refusal("the list of exports is empty");
  if (options.exports.size() > kMaxExports) throw Refusal("there are too many exports");
  std::set<std::string_view> seen;
  for (const std::string& name : options.exports) {
    if (!IsName(name)) throw Refusal("nothing can be exported as " + Shown(name));
    if (!seen.insert(name).second) throw Refusal("the exports name " + Shown(name) + " twice");
  }
}

std::string Convert(const LinkedImage& image, const DllOptions& options) {
  return Converter(image, options).Make();
}

std::vector<std::string> ReadExportList(std::string_view text) {
  std::vector<std::string> names;
  while (!text.empty()) {
    std::string_view name = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(text.size(), name.size() + 1));
    name = name.substr(0, name.find('#'));
    while (!name.empty() && std::string_view(" \t\r").find(name.back()) != std::string_view::npos) {
      name.remove_suffix(1);
    }
    if (!name.empty()) names.emplace_back(name);
  }
  return names;
}

}  // namespace elf2pe
