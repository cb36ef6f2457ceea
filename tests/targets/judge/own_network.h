// A network of this process's own, in which no other program's addresses and ports are in the way.
#pragma once

#include <string>

namespace targets {

/// Gives the calling process, which must have no other threads, and all that it will start a
/// network with nothing but the loopback interface. Groups are reached through that, whichever
/// interface a program names; the machine is called "handheld" there.
/// @return why it is not to be had; empty when it is
[[nodiscard]] std::string EnterOwnNetwork();

}  // namespace targets
