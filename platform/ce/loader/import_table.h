// The functions that a DLL can import: all that the device's own libraries offer here.
#pragma once

#include <cstddef>
#include <string_view>

namespace loader {

/// Any function; who calls it knows its kind.
using Function = void (*)();

struct HostFunction {
  std::string_view library;
  std::string_view name;
  Function function;
  Function misaligned;  ///< for DLLs that are entered with a misaligned stack
};

extern const HostFunction kHostFunctions[];
extern const std::size_t kHostFunctionCount;

/// @param library  in any letter case
/// @return null when there is no such function
[[nodiscard]] const HostFunction* FindHostFunction(std::string_view library, std::string_view name);

}  // namespace loader
