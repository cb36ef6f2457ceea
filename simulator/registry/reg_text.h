// The registry as a text: the .reg format.
//
//   Windows Registry Editor Version 5.00
//
//   [HKEY_LOCAL_MACHINE\Software\Orvenix]
//   @="the default value"
//   "Path"="\\Program Files"
//   "Port"=dword:00000202
//   "Bytes"=hex:01,02,03
//   "Names"=hex(7):41,00,00,00,00,00
#pragma once

#include <string>
#include <string_view>

#include "registry/key_tree.h"

namespace sim {

/// Puts what `text` says into `tree`. Both header lines ("REGEDIT4" is the other) and both line
/// ends are understood, comments begin with ";", "[-key]" and "name"=- delete, and a line of
/// bytes that ends in a backslash goes on in the next. The text is UTF-8,
/// or UTF-16 behind its byte order mark. Data in hex are the device's bytes, whatever the header.
/// @return false with `error` "line 12: ..." at the first line that is not understood; `tree` then
///   holds what stands before it.
[[nodiscard]] bool ParseRegText(std::string_view text, KeyTree& tree, std::string& error);

/// The whole tree as UTF-8, every key with its values, in the order of their names. Reading it
/// gives the same tree.
[[nodiscard]] std::string FormatRegText(const KeyTree& tree);

}  // namespace sim
