// The device's binary in place of the product's own sources: tests of the product are linked with
// thunks that lead to the DLL's exports, and run unchanged.
//
// The DLL is loaded before the first test, and with ORVENIX_CE_MISALIGNED set it is entered with a
// misaligned stack. What the tests look at inside it is found by the symbols of the image that the
// linker left beside it.
#pragma once

#include <cstdint>
#include <string_view>

namespace binary {

/// Where a variable of the loaded DLL lies, by its name as the linker spells it. Ends the program
/// when the linker knows none, or several, of that name.
[[nodiscard]] void* Variable(std::string_view name);

/// The same for a function, to be called with the host's stack.
template <typename Function>
[[nodiscard]] Function* FunctionAt(std::string_view name) {
  return reinterpret_cast<Function*>(Variable(name));
}

}  // namespace binary
