// The version resource of a DLL: what GetFileVersionInfo and file browsers tell of it.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace elf2pe {

/// The numbers of "3.44": up to four, each of 16 bits, the others 0. Throws Refusal.
[[nodiscard]] std::array<std::uint16_t, 4> VersionNumbers(std::string_view version);

struct VersionTexts {
  std::string version;      ///< as VersionNumbers() reads it
  std::string description;  ///< of the file, in ASCII
  std::string dll_name;
};

/// The content of .rsrc, beginning at `rva`: one version resource, in English. Throws Refusal.
[[nodiscard]] std::string VersionSection(std::uint32_t rva, const VersionTexts& texts);

}  // namespace elf2pe
