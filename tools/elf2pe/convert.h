// From a linked ELF image to a DLL for Windows CE 5.0. Bytes in, bytes out; no files.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/linked_image.h"
#include "tools/elf2pe/pe_format.h"

namespace elf2pe {

struct DllOptions {
  std::string name;                  ///< that the DLL gives itself, such as "orvenix.dll"
  std::vector<std::string> exports;  ///< names, in any order
  std::uint16_t machine = pe::kMachineArm;
  std::string version;      ///< such as "3.44", for a version resource; empty: there is none
  std::string description;  ///< of the file, in that resource
};

/// Throws Refusal for a machine, a name or a number of exports that no DLL can have.
void RequireDllOptions(const DllOptions& options);

/// Makes the DLL. The same input always gives the same bytes. Throws Refusal.
[[nodiscard]] std::string Convert(const LinkedImage& image, const DllOptions& options);

/// Names of a list of exports, one a line; "#" begins a comment.
[[nodiscard]] std::vector<std::string> ReadExportList(std::string_view text);

}  // namespace elf2pe
