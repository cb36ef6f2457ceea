// The server's idea of time.
#pragma once

#include <chrono>

namespace server {

/// A moment: milliseconds since an epoch of the caller's choice, never running backwards. The
/// engine reads no clock; whoever drives it says what time it is.
using Time = std::chrono::milliseconds;

}  // namespace server
