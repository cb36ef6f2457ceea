#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "tools/elf2pe/fields.h"
#include "tools/elf2pe/linked_image.h"

namespace elf2pe {
namespace {

void RequireSame(bool same, const char* what) {
  if (!same) throw Refusal(std::string("the second link has other ") + what);
}

void CompareShape(const LinkedImage& image, const LinkedImage& other) {
  const std::uint32_t moved = other.base - image.base;
  if (moved == 0) throw Refusal("the second link has the same base");
  RequireSame(other.entry - image.entry == moved, "code at its entry point");
  RequireSame(image.sections.size() == other.sections.size(), "sections");
  for (std::size_t i = 0; i < image.sections.size(); ++i) {
    const LinkedSection& a = image.sections[i];
    const LinkedSection& b = other.sections[i];
    RequireSame(a.name == b.name && a.size == b.size && b.address - a.address == moved &&
                    a.bytes.size() == b.bytes.size(),
                "sections");
  }
  RequireSame(image.dlls.size() == other.dlls.size(), "imports");
  for (std::size_t i = 0; i < image.dlls.size(); ++i) {
    RequireSame(image.dlls[i].name == other.dlls[i].name &&
                    image.dlls[i].slots.size() == other.dlls[i].slots.size(),
                "imports");
    for (std::size_t k = 0; k < image.dlls[i].slots.size(); ++k) {
      RequireSame(image.dlls[i].slots[k].function == other.dlls[i].slots[k].function, "imports");
    }
  }
  RequireSame(image.symbols.size() == other.symbols.size(), "symbols");
  for (const auto& [name, address] : image.symbols) {
    const auto found = other.symbols.find(name);
    RequireSame(found != other.symbols.end() && found->second - address == moved, "symbols");
  }
}

/// Addresses of the words of a section that are not the same in both.
void FindMoved(const LinkedSection& section, const LinkedSection& other,
               std::vector<std::uint32_t>& found) {
  const std::uint32_t moved = other.address - section.address;
  const std::size_t whole = section.bytes.size() / 4 * 4;
  for (std::size_t at = 0; at < whole; at += 4) {
    const std::uint32_t here = *WordAt(section.bytes, at);
    const std::uint32_t there = *WordAt(other.bytes, at);
    if (here == there) continue;
    const std::uint32_t address = section.address + static_cast<std::uint32_t>(at);
    if (there - here != moved) {
      throw Refusal("the second link has another word at " + Hex(address) +
                    ", and it does not differ by what the bases do");
    }
    found.push_back(address);
  }
  RequireSame(
      section.bytes.compare(whole, std::string::npos, other.bytes, whole, std::string::npos) == 0,
      "bytes at the end of a section");
}

}  // namespace

void ConfirmBySecondLink(const LinkedImage& image, const LinkedImage& other) {
  CompareShape(image, other);
  std::vector<std::uint32_t> found;
  for (std::size_t i = 0; i < image.sections.size(); ++i) {
    FindMoved(image.sections[i], other.sections[i], found);
  }
  for (std::size_t i = 0; i < found.size() || i < image.words.size(); ++i) {
    const bool listed = i < image.words.size();
    const bool moved = i < found.size();
    if (moved && (!listed || found[i] < image.words[i].address)) {
      throw Refusal("the word at " + Hex(found[i]) +
                    " moves with the base, and no relocation says so");
    }
    if (listed && (!moved || image.words[i].address < found[i])) {
      throw Refusal("the word at " + Hex(image.words[i].address) +
                    " is relocated, and does not move with the base");
    }
  }
  RequireSame(image.words.size() == other.words.size(), "relocations");
}

}  // namespace elf2pe
