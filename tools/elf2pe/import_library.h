// The import library: what a program's linker reads to call a DLL that it does not have.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tools/elf2pe/convert.h"

namespace elf2pe {

/// An archive with one short import member a function, and the three objects that close the tables
/// of imports. The same options always give the same bytes. Throws Refusal.
[[nodiscard]] std::string MakeImportLibrary(const DllOptions& options);

}  // namespace elf2pe
