// The host's socket errors as Winsock numbers.
#pragma once

namespace sim {

/// @param error  an errno value of a socket call
/// @return the Winsock error that a device's program sees for it, never 0
[[nodiscard]] int ToWinsockError(int error);

}  // namespace sim
