#include "mcftp/rules/command_line.h"

#include <cstddef>

namespace mcftp {
namespace {

// KEPT ODDITY: "-" and "/" separate options wherever they stand, so an MCT cannot hold either. What
// follows counts as an option: "-HV=MR41-A" sets MR41 and "-HV=TQ52-BE" spoils the whole line.
constexpr std::string_view kSeparators = " /-";

/// First letters of the options there are.
constexpr std::string_view kFirstLetters = "apudh";

void SetAddress(base::FixedText<16>& address, std::string_view value) noexcept {
  if (value.empty()) return;
  if (!address.Assign(value)) address.Assign("too long");
}

/// Decimal digits up to the first other character; too large a number counts as none.
void SetPort(std::uint16_t& port, std::string_view value) noexcept {
  std::uint32_t number = 0;
  for (const char digit : value) {
    if (digit < '0' || digit > '9') break;
    number = number * 10 + static_cast<std::uint32_t>(digit - '0');
    if (number > UINT16_MAX) return;
  }
  if (number != 0) port = static_cast<std::uint16_t>(number);
}

struct OptionRow {
  std::string_view name;
  void (*apply)(CommandLine& options, std::string_view value);
};

constexpr OptionRow kOptions[] = {
    {"A", [](CommandLine& to, std::string_view value) { SetAddress(to.public_group, value); }},
    {"P", [](CommandLine& to, std::string_view value) { SetPort(to.public_port, value); }},
    {"UA", [](CommandLine& to, std::string_view value) { SetAddress(to.local_ui, value); }},
    {"UP", [](CommandLine& to, std::string_view value) { SetPort(to.local_ui_port, value); }},
    {"DA", [](CommandLine& to, std::string_view value) { SetAddress(to.debug, value); }},
    {"DP", [](CommandLine& to, std::string_view value) { SetPort(to.debug_port, value); }},
    {"HV",
     [](CommandLine& to, std::string_view value) {
       if (!value.empty()) to.mct.Assign(value);
     }},
};

void Apply(CommandLine& options, std::string_view token) noexcept {
  const std::size_t equals = token.find('=');
  if (equals == std::string_view::npos) return;
  const std::string_view name = base::Part(token, 0, equals);
  for (const OptionRow& row : kOptions) {
    if (base::EqualIgnoringCase(row.name, name)) row.apply(options, base::Part(token, equals + 1));
  }
}

}  // namespace

bool ParseCommandLine(std::string_view line, CommandLine& options) noexcept {
  if (line.empty()) return false;
  while (true) {
    line = base::Part(line, line.find_first_not_of(kSeparators));
    if (line.empty()) return true;
    const std::string_view token = base::Part(line, 0, line.find_first_of(kSeparators));
    if (kFirstLetters.find(base::LowerAscii(token[0])) == std::string_view::npos) return false;
    Apply(options, token);
    line = base::Part(line, token.size());
  }
}

}  // namespace mcftp
