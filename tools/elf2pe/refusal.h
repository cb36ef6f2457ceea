// Why a file is not taken.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>

namespace elf2pe {

/// One line for people: what is wrong, and where.
class Refusal : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// "0x10001000"
[[nodiscard]] std::string Hex(std::uint64_t value);

/// A name out of a file, fit for a line on a terminal: cut where it is long, and with a "?" for
/// whatever is no printable ASCII.
[[nodiscard]] std::string Shown(std::string_view name);

}  // namespace elf2pe
