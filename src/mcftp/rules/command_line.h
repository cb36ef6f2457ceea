// The options with which a multicast client is started.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/text.h"

namespace mcftp {

/// Addresses are kept as they were written; whether they read as addresses is for the network to
/// say. A text too long for a dotted address is kept as one that never does.
struct CommandLine {
  base::FixedText<16> public_group;  ///< A: where files are announced
  std::uint16_t public_port = 0;     ///< P
  base::FixedText<16> local_ui;      ///< UA: the user interface on this device
  std::uint16_t local_ui_port = 0;   ///< UP
  base::FixedText<16> debug;         ///< DA: the syslog server for log lines
  std::uint16_t debug_port = 0;      ///< DP
  base::FixedText<64> mct;           ///< HV: the device's MCT; a longer one is cut
};

/// Reads a command line. Values of 0, ports above 65535 and empty texts leave a setting as it is;
/// options that are not known in full, and those without "=", are ignored.
///
/// @param options  receives what the line says; unspecified when the result is false
/// @return false for an empty line, and for one with an option whose first letter is none of A, P,
///   U, D and H.
[[nodiscard]] bool ParseCommandLine(std::string_view line, CommandLine& options) noexcept;

}  // namespace mcftp
