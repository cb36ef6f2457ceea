// Puts sections together to a PE file.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/pe_format.h"

namespace elf2pe {

struct PePart {
  std::string name;  ///< one of pe::kSectionKinds
  std::uint32_t rva = 0;
  std::uint32_t virtual_size = 0;
  std::string bytes;  ///< at most `virtual_size`
};

struct PeContent {
  std::uint16_t machine = pe::kMachineArm;
  std::uint32_t image_base = pe::kImageBase;
  std::uint32_t entry = 0;    ///< RVA
  std::vector<PePart> parts;  ///< in the order of pe::kSectionKinds, on successive pages
  std::array<pe::DirectoryEntry, pe::kDirectories> directories{};
};

/// The whole file, its checksum included. The same content always gives the same bytes.
[[nodiscard]] std::string WritePe(const PeContent& content);

/// What precedes the signature in every file: the DOS header, and a DOS program that ends itself.
[[nodiscard]] std::string DosPart();

/// The checksum of a whole file, whatever stands in the field for it.
/// @param field  offset of that field, a multiple of 2
[[nodiscard]] std::uint32_t PeChecksum(std::string_view file, std::size_t field);

}  // namespace elf2pe
