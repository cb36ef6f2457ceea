// The ways between the host's code and a DLL's.
//
// The host's compiler expects a stack pointer that is a multiple of 8 at every call; the device
// promises a multiple of 4. A gate out of the DLL makes it one of 8, and copies the words of the
// stack that may be arguments. A gate into it does the opposite where a test wants that: the DLL
// then runs with a stack pointer of 4 modulo 8 throughout.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "loader/import_table.h"

namespace loader {

/// What a gate leads to.
struct Gate {
  enum class Kind : std::uint8_t {
    kOut,         ///< from a DLL to `function` of the host
    kMisaligned,  ///< from the host to `function` of a DLL, with a misaligned stack
    kMissing,     ///< from a DLL to nothing: `name` is printed and the program ends with code 1
  };
  Kind kind = Kind::kOut;
  Function function = nullptr;
  const char* name = nullptr;  ///< outlives the gate
};

/// Words of the stack that a gate copies: arguments from the fifth on. No function here has more.
inline constexpr std::size_t kCopiedWords = 12;

/// Code that was written for these gates, which nobody can change any more.
class Gates {
 public:
  Gates() = default;
  /// @throws std::system_error when the host has no memory for them
  explicit Gates(const std::vector<Gate>& gates);
  ~Gates();
  Gates(Gates&& other) noexcept;
  Gates& operator=(Gates&& other) noexcept;

  [[nodiscard]] Function At(std::size_t index) const;

 private:
  std::uint32_t* code_ = nullptr;
  std::size_t size_ = 0;
};

/// A gate that stays until the program ends, the same for the same function: for functions whose
/// last call nobody knows.
[[nodiscard]] Function LastingGate(Gate::Kind kind, Function function);

}  // namespace loader
