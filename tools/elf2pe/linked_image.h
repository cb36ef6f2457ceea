// What the linker made of the library, in the converter's terms. platform/ce/README.md says what it
// is agreed to look like; anything else is refused.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/refusal.h"

namespace elf2pe {

/// A section of the image. All begin at whole pages, one right behind the other.
struct LinkedSection {
  std::string name;
  std::uint32_t address = 0;
  std::uint32_t size = 0;  ///< in memory
  std::string bytes;       ///< at most `size`; zeros follow
};

struct LinkedSlot {
  std::string function;
  std::uint32_t address = 0;  ///< of the placeholder; it does not get into the DLL
};

struct LinkedDll {
  std::string name;
  std::vector<LinkedSlot> slots;  ///< by address
};

/// A word that holds an address.
struct MovingWord {
  std::uint32_t address = 0;
  const LinkedSlot* slot = nullptr;  ///< that it holds the address of, or null
};

struct LinkedImage {
  std::uint32_t base = 0;
  std::uint32_t entry = 0;              ///< address, within .text
  std::vector<LinkedSection> sections;  ///< .text, .rdata, .data, in this order
  std::vector<LinkedDll> dlls;
  std::vector<MovingWord> words;                 ///< by address
  std::map<std::string, std::uint32_t> symbols;  ///< addresses of what other files may name

  LinkedImage() = default;
  LinkedImage(LinkedImage&&) = default;  // keeps the slots, and so the pointers to them, in place
  LinkedImage& operator=(LinkedImage&&) = default;
  LinkedImage(const LinkedImage&) = delete;
  LinkedImage& operator=(const LinkedImage&) = delete;

  /// The section that holds all of the `size` bytes at `address` in memory, or null.
  [[nodiscard]] const LinkedSection* Find(std::uint32_t address, std::uint32_t size) const;
  /// Behind the last page.
  [[nodiscard]] std::uint32_t end() const;
};

/// Reads a linked ELF file. Throws Refusal.
[[nodiscard]] LinkedImage ReadLinkedImage(std::string_view elf);

/// Compares the image with the same objects linked at another base: the words that differ must be
/// those that the relocations name, and differ by what the bases do. Throws Refusal.
void ConfirmBySecondLink(const LinkedImage& image, const LinkedImage& other);

}  // namespace elf2pe
