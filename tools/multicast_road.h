// Whether a group can be reached from this machine, and through which of its addresses.
#pragma once

#include <cstdint>
#include <string>

namespace tools {

struct NetworkInterface {
  std::string name;     ///< "eth0"; "lo" for every address of the loop-back network
  std::string address;  ///< dotted, one of this machine
};

/// @param wished  an address of this machine, or the name of an interface
/// Throws Failure kCannotListen with the interfaces that there are.
[[nodiscard]] NetworkInterface FindInterface(const std::string& wished);

/// Tries the way to a group without sending anything. Throws Failure kCannotListen, with the
/// remedy, for a group that cannot be joined or has no route.
void CheckMulticastRoad(const NetworkInterface& from, const std::string& group, std::uint16_t port);

/// What the system's error of a network call means, and what to do: "no route ...; add one ...".
[[nodiscard]] std::string RoadRemedy(int error, const NetworkInterface& from,
                                     const std::string& group);

}  // namespace tools
