// What differs between two runs although nothing does.
#pragma once

#include <string>

namespace targets {

/// The text with every time of day in it, in each of the forms in which the product writes one,
/// replaced by one that stands for all, with line ends of one carriage return, and with one line
/// for what Windows Sockets leaves open: how a wait ends when its socket is closed.
[[nodiscard]] std::string Comparable(const std::string& text);

}  // namespace targets
