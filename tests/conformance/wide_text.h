// Texts of the platform's characters, which each platform has under a name of its own.
#pragma once

#include <string>

#include "coredll.h"

namespace conformance {

using WideText = std::basic_string<WCHAR>;

/// For messages: what is not ASCII becomes '#'.
inline std::string Shown(const WideText& text) {
  std::string shown;
  for (const WCHAR c : text) shown += c < 0x80 ? static_cast<char>(c) : '#';
  return shown;
}

}  // namespace conformance
