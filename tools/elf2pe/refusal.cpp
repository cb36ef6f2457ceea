#include "tools/elf2pe/refusal.h"

#include <algorithm>
#include <cstddef>

namespace elf2pe {

std::string Hex(std::uint64_t value) {
  std::string digits;
  do {
    digits.push_back("0123456789abcdef"[value & 0xF]);
    value >>= 4;
  } while (value != 0);
  return "0x" + std::string(digits.rbegin(), digits.rend());
}

std::string Shown(std::string_view name) {
  constexpr std::size_t kLongest = 80;
  std::string shown(name.substr(0, kLongest));
  std::replace_if(
      shown.begin(), shown.end(), [](char c) { return c < ' ' || c > '~'; }, '?');
  if (name.size() > kLongest) shown += "...";
  return "'" + shown + "'";
}

}  // namespace elf2pe
